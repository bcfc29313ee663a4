"""Says what happens on the stage while it happens: what the browser, the login program, the library
and the provider do.

Relays are in front of the web server and the provider and see each request and answer; the system
log is read as well. Codes, tokens, secrets and cookies' values are never printed.
"""

import base64
import contextlib
import http.client
import http.server
import json
import re
import ssl
import threading
import urllib.parse

from scene import say, values_of

HOP_BY_HOP = {"connection", "keep-alive", "transfer-encoding", "upgrade", "accept-encoding",
              "content-length"}
# The library's own lines about each read of its settings; a failure among them is shown.
ROUTINE = re.compile(r"(ENTER|LEAVE)CriticalSection|setres[ug]id|res[ug]id")
PAGE_PARTS = (".css", ".js", ".svg", ".png", ".ico", ".ttf", ".woff", ".woff2")


class Exchange:
    """A request, and what was answered to it."""

    def __init__(self, method, target, headers, body):
        parts = urllib.parse.urlsplit(target)
        self.method, self.path, self.headers = method, parts.path, headers
        self.query = dict(urllib.parse.parse_qsl(parts.query, keep_blank_values=True))
        self.form = dict(urllib.parse.parse_qsl(body.decode("utf-8", "replace")))
        self.status, self.location, self.cookies, self.body = 0, "", [], b""

    def answered(self, answer, body):
        self.status, self.body = answer.status, body
        self.location = answer.headers.get("Location", "")
        self.cookies = answer.headers.get_all("Set-Cookie", [])

    def json(self):
        try:
            value = json.loads(self.body)
        except ValueError:
            return {}
        return value if isinstance(value, dict) else {}


class _Handler(http.server.BaseHTTPRequestHandler):
    protocol_version = "HTTP/1.1"
    timeout = 60
    relay = None

    def log_message(self, *_):
        pass

    def __getattr__(self, name):
        if name.startswith("do_"):
            return self._pass_on
        raise AttributeError(name)

    def _pass_on(self):
        body = self.rfile.read(int(self.headers.get("Content-Length") or 0))
        exchange = Exchange(self.command, self.path, self.headers, body)
        self.relay.before(exchange)
        try:
            answer, data = self._ask(body)
        except OSError:  # as if it were not there
            self.close_connection = True
            return
        exchange.answered(answer, data)
        self.relay.after(exchange)
        self.send_response_only(answer.status, answer.reason)
        for name, value in answer.getheaders():
            if name.lower() not in HOP_BY_HOP:
                self.send_header(name, value)
        self.send_header("Content-Length", str(len(data)))
        self.end_headers()
        if self.command != "HEAD":
            self.wfile.write(data)

    def _ask(self, body):
        relay = self.relay
        with contextlib.closing(http.client.HTTPSConnection(
                relay.name, relay.target, context=relay.trust, timeout=60)) as connection:
            connection.putrequest(self.command, self.path, skip_host=True,
                                  skip_accept_encoding=True)
            for name, value in self.headers.items():
                if name.lower() not in HOP_BY_HOP:
                    connection.putheader(name, value)
            if body or self.command == "POST":
                connection.putheader("Content-Length", str(len(body)))
            connection.endheaders(body or None)
            answer = connection.getresponse()
            return answer, answer.read()


class _Server(http.server.ThreadingHTTPServer):
    daemon_threads = True

    def handle_error(self, request, client_address):
        """A browser that does not accept the certificate hangs up; nothing is wrong here."""


class Relay:
    """Listens on `port` in front of the server that listens on `target`."""

    def __init__(self, stage, name, port, target, before, after):
        self.name, self.target, self.before, self.after = name, target, before, after
        self.trust = ssl.create_default_context(cafile=stage.authority)
        context = ssl.create_default_context(ssl.Purpose.CLIENT_AUTH)
        context.load_cert_chain(*stage.certificate(name))
        server = _Server(("127.0.0.1", port), type("Handler", (_Handler,), {"relay": self}))
        server.socket = context.wrap_socket(server.socket, server_side=True,
                                            do_handshake_on_connect=False)
        threading.Thread(target=server.serve_forever, args=(0.05,), daemon=True).start()
        self._server = server

    def close(self):
        self._server.shutdown()
        self._server.server_close()


def quoted(text, longest=120):
    """Words from outside, on one line."""
    text = "".join(c if c.isprintable() else " " for c in str(text))
    return f"\"{text[:longest]}{'...' if len(text) > longest else ''}\""


def token_parts(token):
    """Header and claims of an ID token; empty ones if it is not readable."""
    parts = []
    for part in str(token).split(".")[:2]:
        try:
            parts.append(json.loads(base64.urlsafe_b64decode(part + "=" * (-len(part) % 4))))
        except ValueError:
            break
    return parts if len(parts) == 2 and all(isinstance(x, dict) for x in parts) else ({}, {})


class Narrator:
    def __init__(self, stage):
        self._stage = stage
        self._urls = {}       # of the provider's endpoints: path to role
        self._asked = set()   # states that a browser brought to the provider
        self._token = ""      # what the last ID token was signed with, until it is judged
        self._pending = threading.Lock()
        self._relays = []

    def set_up(self):
        """Puts the relays in front of the servers; must be called before those start."""
        stage = self._stage
        stage.device_listens, stage.provider_listens = stage.device_port + 2, stage.provider_port + 2
        self._relays = [
            Relay(stage, stage.device_name, stage.device_port, stage.device_listens,
                  self._if_set(self._device_asked), self._if_set(self._device_answered)),
            Relay(stage, stage.provider_name, stage.provider_port, stage.provider_listens,
                  self._if_set(self._provider_asked), self._if_set(self._provider_answered))]

    def close(self):
        """Takes the relays away again."""
        stage = self._stage
        stage.device_listens, stage.provider_listens = stage.device_port, stage.provider_port
        stage.log.heard = lambda line: None
        for relay in self._relays:
            relay.close()

    def begin(self, settings):
        """Says what happens from now on, with a client of those settings."""
        for key, value in settings.items():
            role = key.split("_", 1)[1]
            if role.endswith("endpoint") or role == "wellknown":
                self._urls[urllib.parse.urlsplit(value).path] = role.replace("_endpoint", "")
        self._stage.log.heard = self._logged

    def _if_set(self, function):
        def call(exchange):
            if self._urls:
                with self._pending:
                    function(exchange)
        return call

    # -- the device ------------------------------------------------------------------------

    def _device_asked(self, exchange):
        query, path = exchange.query, exchange.path
        if "code" in query and "go" not in query:
            say(f"browser        comes back from the provider to {path} with a code"
                f"{' and the state' if 'state' in query else ', without a state'}")
        elif "error" in query:
            say(f"browser        comes back from the provider with the error "
                f"{quoted(query['error'])}, {quoted(query.get('error_description', ''))}")
        elif exchange.method == "POST":
            say(f"browser        sends a form to {path} {query.get('action', '')}".rstrip())

    def _device_answered(self, exchange):
        target = urllib.parse.urlsplit(exchange.location)
        role = self._urls.get(target.path)
        if role == "authorization":
            self._sent_to_provider(exchange)
        elif role == "logout":
            say("login program  ends the session here, and sends the browser to the provider's "
                "logout")
        elif target.path.endswith("/relay.html"):
            self._sent_to_relay(exchange, values_of(exchange.location))
        elif exchange.status >= 500:
            say(f"web server     answers {exchange.path} with status {exchange.status}: the login "
                "program failed")
        elif exchange.path.endswith((".cgi", "/")) and exchange.status == 200:
            say(f"browser        shows {exchange.path}"
                f"{': the device waits for the provider' if 'code' in exchange.query else ''}")

    def _sent_to_provider(self, exchange):
        values = values_of(exchange.location)
        sent = [name for name in ("state", "nonce") if values.get(name)]
        bound = "with a cookie that binds the sign-in to this browser" if exchange.cookies else \
            "WITHOUT a cookie: the sign-in is not bound to this browser"
        say(f"browser        starts a sign-in: {exchange.path}")
        say(f"login program  sends the browser to the provider with a new {' and '.join(sent)}, "
            f"{bound}")

    def _sent_to_relay(self, exchange, values):
        if values.get("success") == "true":
            if self._token:
                say(f"library        accepted the ID token ({self._token})")
            say("login program  sends the browser to the relay page: signed in"
                + (f", back to {quoted(values['origin'])}" if values.get("origin") else ""))
        elif "success" in values:
            say("login program  sends the browser to the relay page: NOT signed in, reason "
                + quoted(values.get("reason", "")))
        else:
            say("login program  ends the session and sends the browser to the relay page")
        self._token = ""

    # -- the provider ----------------------------------------------------------------------

    def _provider_asked(self, exchange):
        role = self._urls.get(exchange.path)
        if role == "authorization" and exchange.query.get("state") not in self._asked:
            self._asked.add(exchange.query.get("state"))
            say("browser        asks the provider to sign the user in")
        elif role == "token":
            say("library        redeems the code at the token endpoint, with client ID and secret")
        elif role == "wellknown":
            say("library        reads the discovery document")
        elif role == "keys":
            say("library        fetches the key set")
        elif role == "logout":
            say("browser        asks the provider to sign the user out")

    def _provider_answered(self, exchange):
        role = self._urls.get(exchange.path)
        if role == "token":
            self._token_answer(exchange)
        elif role == "wellknown" and exchange.json().get("jwks_uri"):
            keys = urllib.parse.urlsplit(str(exchange.json()["jwks_uri"])).path
            self._urls[keys] = "keys"
        elif role == "keys":
            keys = exchange.json().get("keys", [])
            say(f"provider       publishes {len(keys)} key{'' if len(keys) == 1 else 's'}")
        elif role in ("wellknown",) and exchange.status != 200:
            say(f"provider       answers with status {exchange.status}")
        if exchange.location.startswith(self._stage.device):
            self._sent_back(values_of(exchange.location))

    def _sent_back(self, values):
        if "code" in values:
            say("provider       knows the user, and sends the browser back to the device with a code")
        elif "error" in values:
            say(f"provider       refuses: {quoted(values['error'])}, "
                + quoted(values.get("error_description", "")))

    def _token_answer(self, exchange):
        answer = exchange.json()
        if "id_token" not in answer:
            say(f"provider       refuses the code: status {exchange.status}, "
                f"{quoted(answer.get('error', 'no error named'))}, "
                + quoted(answer.get("error_description", "")))
            return
        header, claims = token_parts(answer["id_token"])
        self._token = f"signature {header.get('alg')}" + (
            f" with key {quoted(header['kid'], 20)}" if "kid" in header else
            " under the client secret")
        user = next((claims[name] for name in ("unique_name", "email", "sub") if name in claims),
                    "no user")
        say(f"provider       hands out an ID token for {quoted(user)}: {self._token}")

    # -- the system log --------------------------------------------------------------------

    def _logged(self, line):
        text = re.sub(r"^<\d+>(\w+ +\d+ [\d:]+ )?", "", line)
        if not ROUTINE.search(text):
            say(f"system log     {quoted(text, 400)}")
