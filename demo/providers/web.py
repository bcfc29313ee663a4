"""The HTTPS server of the providers that are written here.

A Site gets each request as a Request and returns an Answer. It remembers what it was asked.
"""

import contextlib
import dataclasses
import http.cookies
import http.server
import json
import socket
import ssl
import sys
import threading
import time
import urllib.parse

HTML = "text/html; charset=utf-8"
LOGIN_PAGE = """<!DOCTYPE html>
<html lang="en"><head><meta charset="utf-8"><title>{title}</title></head><body><main>
<h1>{heading}</h1><p>{hint}</p><form id="login" method="post" action="{action}">
<label>Name <input id="username" name="{name}" autocomplete="username" autofocus></label>
<label>Password <input id="password" name="{password}" type="password"
autocomplete="current-password"></label>
<button>Sign in</button></form></main></body></html>"""


@dataclasses.dataclass
class Request:
    method: str
    path: str
    query: dict
    form: dict  # None unless it is a POST
    body: bytes
    headers: object

    def cookie(self, name):
        jar = http.cookies.SimpleCookie(self.headers.get("Cookie", ""))
        return jar[name].value if name in jar else None


@dataclasses.dataclass
class Answer:
    status: int = 200
    body: str = ""
    headers: dict = dataclasses.field(default_factory=dict)


def page(body, status=200):
    return Answer(status, body, {"Content-Type": HTML})


def as_json(value, status=200, **headers):
    kind = "application/json; charset=utf-8"
    return Answer(status, json.dumps(value), {"Content-Type": kind, **headers})


def redirect(url, **headers):
    return Answer(302, "", {"Location": url, "Content-Type": HTML, **headers})


def login_page(action, hint="", name="username", password="password", title="Provider",
               heading="Sign in"):
    return page(LOGIN_PAGE.format(action=action, hint=hint, name=name, password=password,
                                  title=title, heading=heading))


def with_query(url, values):
    """The URL with parameters; one that has a query already keeps it."""
    query = urllib.parse.urlencode(values, quote_via=urllib.parse.quote)
    return f"{url}{'&' if '?' in url else '?'}{query}"


class Handler(http.server.BaseHTTPRequestHandler):
    site = None
    timeout = 30

    def log_message(self, *_):
        pass

    def do_GET(self):  # noqa: N802 (the base class's name)
        self._serve(None)

    def do_POST(self):  # noqa: N802
        self._serve(self.rfile.read(int(self.headers.get("Content-Length", 0))))

    def date_time_string(self, timestamp=None):
        """The header Date, by the site's clock."""
        return super().date_time_string((timestamp or time.time()) + self.site.clock_skew)

    def _serve(self, body):
        parts = urllib.parse.urlsplit(self.path)
        form = None if body is None else _values(body.decode("utf-8", "replace"))
        self.handle_request(Request(self.command, parts.path, _values(parts.query), form,
                                    body or b"", self.headers))

    def handle_request(self, request):
        self.send(self.site.answer(request))

    def send(self, answer, cut=False):
        """Sends an answer, or with `cut` the first half of its body."""
        data = answer.body.encode()
        try:
            self.send_response(answer.status)
            headers = {"Content-Type": HTML, **answer.headers, "Content-Length": str(len(data))}
            for field, value in headers.items():
                self.send_header(field, value)
            self.end_headers()
            self.wfile.write(data[:len(data) // 2] if cut else data)
        except OSError:  # the client is gone
            self.close_connection = True


def _values(text):
    return dict(urllib.parse.parse_qsl(text, keep_blank_values=True))


class Server(http.server.ThreadingHTTPServer):
    daemon_threads = True

    def __init__(self, *arguments):
        self._open = set()
        super().__init__(*arguments)

    def process_request(self, request, client_address):
        self._open.add(request)
        super().process_request(request, client_address)

    def shutdown_request(self, request):
        self._open.discard(request)
        super().shutdown_request(request)

    def hang_up(self, but):
        """A browser connects before it knows what to ask: that connection would be served."""
        for request in list(self._open):
            if request is not but:
                with contextlib.suppress(OSError):
                    request.shutdown(socket.SHUT_RDWR)

    def handle_error(self, request, client_address):
        """A client that does not accept the certificate hangs up: not an error of the site."""
        if not isinstance(sys.exc_info()[1], OSError):
            super().handle_error(request, client_address)


class Site:
    handler = Handler
    clock_skew = 0  # seconds that the site's clock is ahead

    def __init__(self):
        self.seen = []  # method, path, query and form of each request
        self._servers = []

    def listen(self, port, certificate, address="127.0.0.1"):
        """Opens a port with a certificate and key; returns the port's number."""
        context = ssl.create_default_context(ssl.Purpose.CLIENT_AUTH)
        context.load_cert_chain(*certificate)
        family = socket.AF_INET6 if ":" in address else socket.AF_INET
        server = type("SiteServer", (Server,), {"address_family": family})(
            (address, port), type("SiteHandler", (self.handler,), {"site": self}))
        # The handshake belongs to the connection's own thread.
        server.socket = context.wrap_socket(server.socket, server_side=True,
                                            do_handshake_on_connect=False)
        threading.Thread(target=server.serve_forever, args=(0.05,), daemon=True).start()
        self._servers.append(server)
        return server.server_address[1]

    def stop(self, but=None):
        """Closes all ports and connections; `but` is a connection that is left open."""
        while self._servers:
            server = self._servers.pop()
            server.shutdown()
            server.server_close()
            server.hang_up(but)

    def answer(self, request):
        raise NotImplementedError
