"""A provider that does what a script tells it: what a certified provider refuses to show.

Without a script it behaves: a login form, codes that serve once, RS256 with a published key for
the Azure client, HS256 under the client's secret for the WebSphere client. A script changes
one thing at a time, see Script. Everything that it was asked is kept in `seen`.
"""

import base64
import contextlib
import dataclasses
import hashlib
import hmac
import html
import http.server
import json
import secrets
import socket
import ssl
import subprocess
import sys
import threading
import time
import urllib.parse

from browser import BrowserError
from stage import run, write

LOGIN_PAGE = """<!DOCTYPE html>
<html lang="en"><head><meta charset="utf-8"><title>Provider</title></head><body><main>
<h1>Sign in</h1><p>{hint}</p><form id="login" method="post" action="{action}">
<label>Name <input id="username" name="username" autocomplete="username" autofocus></label>
<label>Password <input id="password" name="password" type="password"
autocomplete="current-password"></label>
<button>Sign in</button></form></main></body></html>"""


def _base64url(data):
    return base64.urlsafe_b64encode(data).rstrip(b"=").decode()


@dataclasses.dataclass
class Script:
    """What to do otherwise. Each function gets what the provider would send, and returns what to
    send instead."""
    refuse: dict = None        # parameters of an error answer to the authorization request
    claims: object = None      # changes the claims of the ID token
    header: object = None      # changes the header of the ID token
    signature: object = None   # changes the bytes of the signature
    sign: object = None        # signs instead of the provider's key: bytes to signature
    token_answer: object = None  # changes (status, type, body) of the token endpoint
    document: object = None    # changes (path, status, type, body) of "wellknown" and "keys"
    silent: tuple = ()         # paths ("token", "keys"...) that take the request and do not answer
    cut: tuple = ()            # paths whose answer ends in its middle
    leave: bool = False        # nobody listens any more once a code is handed out


@dataclasses.dataclass
class Realm:
    client: object
    sign: object
    header: dict
    claims: dict
    keys: list


class Scripted:
    title = "scripted provider"
    fields = "#username", "#password"  # of the login page
    comes_back = True  # after a logout

    def __init__(self, stage, person):
        self.url = f"https://{stage.provider_name}:{stage.provider_port}"
        self.script = Script()
        self.seen = []
        self.sent = []  # where the browsers were sent back to
        self._stage = stage
        self._person = person
        self._realms = {}
        self._codes = {}
        self._servers = []
        self._keys = 0
        self._released = threading.Event()

    # -- set-up ----------------------------------------------------------------------------

    def start(self):
        self.listen(self._stage.provider_port,
                    self._stage.certificate(self._stage.provider_name))

    def listen(self, port, certificate):
        """Opens one more door to the same provider, with a certificate of its own."""
        context = ssl.create_default_context(ssl.Purpose.CLIENT_AUTH)
        context.load_cert_chain(*certificate)
        handler = type("Handler", (_Handler,), {"provider": self})
        server = _Server(("127.0.0.1", port), handler)
        # The handshake belongs to the connection's own thread.
        server.socket = context.wrap_socket(server.socket, server_side=True,
                                            do_handshake_on_connect=False)
        threading.Thread(target=server.serve_forever, args=(0.05,), daemon=True).start()
        self._servers.append(server)

    def stop(self, but=None):
        """Nobody listens any more, and connections are cut; `but` is one that is left."""
        self.release()
        while self._servers:
            server = self._servers.pop()
            server.shutdown()
            server.server_close()
            server.hang_up(but)

    def release(self):
        """Lets the requests go that a silent token endpoint holds; they get no answer."""
        self._released.set()
        self._released = threading.Event()

    def hold(self):
        self._released.wait(60)

    def add_azure(self, client):
        key, public = self._key("key-1")
        return self._add("azure", Realm(client, key, {"alg": "RS256", "kid": "key-1"},
                                        dict(self._person.claims), [public]))

    def _key(self, identity):
        """A new RSA key: what signs with it, and its public half for the key set."""
        self._keys += 1
        path = f"{self._stage.folder}/scripted-{self._keys}.key"
        write(path, run("openssl", "genpkey", "-algorithm", "RSA"), 0o600)
        modulus = run("openssl", "rsa", "-in", path, "-noout", "-modulus").split("=")[1].strip()

        def sign(data):
            return subprocess.run(["openssl", "dgst", "-sha256", "-sign", path], input=data,
                                  stdout=subprocess.PIPE, check=True, timeout=30).stdout

        return sign, {"kty": "RSA", "kid": identity, "n": _base64url(bytes.fromhex(modulus)),
                      "e": "AQAB"}

    def signer(self, name):
        """What signs now; for a script to use later."""
        return self._realms[name].sign

    def rotate(self, identity):
        """Signs with a new key from now on, and publishes that one alone."""
        realm = self._realms["azure"]
        realm.sign, public = self._key(identity)
        realm.header = {**realm.header, "kid": identity}
        realm.keys = [public]

    def add_websphere(self, client):
        def sign(data):
            return hmac.new(client.secret.encode(), data, hashlib.sha256).digest()
        return self._add("websphere", Realm(
            client, sign, {"alg": "HS256"}, {"sub": self._person.account}, []))

    def _add(self, name, realm):
        self._realms[name] = realm
        return {part: f"{self.url}/{name}/{part}"
                for part in ("wellknown", "authorization", "token", "logout")}

    # -- a person in front of the login page -----------------------------------------------

    def sign_in(self, browser, page):
        """Fills in the login form; returns the page that follows."""
        form = page.form("login")
        return browser.post(urllib.parse.urljoin(page.url, form["action"]), {
            "username": self._person.account, "password": self._person.password})

    def agree(self, tab):
        """Asks nothing after name and password."""

    def agree_to_leave(self, tab):
        """Nor at the logout."""

    # -- the endpoints ---------------------------------------------------------------------

    def authorization(self, name, query, form):
        client = self._realms[name].client
        if query.get("redirect_uri") != client.redirect_uri or \
                query.get("client_id") != client.identity:
            return 400, {}, "unknown client"
        if self.script.refuse is not None:
            return self._back(query, self.script.refuse)
        action = html.escape(f"/{name}/authorization?{urllib.parse.urlencode(query)}")
        if form is None:
            return 200, {}, LOGIN_PAGE.format(action=action, hint="")
        if (form.get("username"), form.get("password")) != \
                (self._person.account, self._person.password):
            return 403, {}, LOGIN_PAGE.format(action=action, hint="Wrong name or password.")
        code = secrets.token_urlsafe(16)
        self._codes[code] = (name, query.get("nonce"))
        return self._back(query, {"code": code})

    def _back(self, query, values):
        values = {**values, "state": query.get("state", "")}
        self.sent.append(query["redirect_uri"] + "?" +
                         urllib.parse.urlencode(values, quote_via=urllib.parse.quote))
        return 302, {"Location": self.sent[-1]}, ""

    def token(self, name, form):
        """The answer of the token endpoint: status, type, body."""
        client = self._realms[name].client
        realm, nonce = self._codes.pop(form.get("code"), (None, None))
        if form.get("client_secret") != client.secret:
            answer = 401, "application/json", json.dumps({"error": "invalid_client"})
        elif realm != name or form.get("redirect_uri") != client.redirect_uri:
            answer = 400, "application/json", json.dumps({"error": "invalid_grant"})
        else:
            answer = 200, "application/json", json.dumps({
                "token_type": "Bearer", "access_token": secrets.token_urlsafe(24),
                "expires_in": 3600, "id_token": self.id_token(name, nonce)})
        change = self.script.token_answer
        return answer if change is None else change(*answer)

    def id_token(self, name, nonce):
        realm = self._realms[name]
        now = int(time.time())
        claims = {"iss": f"{self.url}/{name}", "aud": realm.client.identity, "iat": now,
                  "exp": now + 3600, "nonce": nonce, **realm.claims}
        header = {"typ": "JWT", **realm.header}
        if self.script.claims is not None:
            claims = self.script.claims(claims)
        if self.script.header is not None:
            header = self.script.header(header)
        signed = ".".join(_base64url(json.dumps(part).encode()) for part in (header, claims))
        signature = (self.script.sign or realm.sign)(signed.encode())
        if self.script.signature is not None:
            signature = self.script.signature(signature)
        return signed + "." + _base64url(signature)

    def document(self, name, path):
        """The discovery document or the key set: status, type, body."""
        if path == "wellknown":
            value = {"issuer": f"{self.url}/{name}", "jwks_uri": f"{self.url}/{name}/keys"}
        else:
            value = {"keys": self._realms[name].keys}
        answer = 200, "application/json", json.dumps(value)
        change = self.script.document
        return answer if change is None else change(path, *answer)

    def known(self, name):
        return name in self._realms

    def last_code(self):
        """A code that nobody has used yet."""
        if not self._codes:
            raise BrowserError("no code is waiting")
        return next(reversed(self._codes))


class _Server(http.server.ThreadingHTTPServer):
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
        """Who does not like the certificate hangs up: no mistake of the provider."""
        if not isinstance(sys.exc_info()[1], OSError):
            super().handle_error(request, client_address)


class _Handler(http.server.BaseHTTPRequestHandler):
    provider = None
    timeout = 30
    _cut = False

    def log_message(self, *_):
        pass

    def do_GET(self):  # noqa: N802 (the base class's name)
        self._serve(None)

    def do_POST(self):  # noqa: N802
        size = int(self.headers.get("Content-Length", 0))
        body = self.rfile.read(size).decode()
        self._serve(dict(urllib.parse.parse_qsl(body, keep_blank_values=True)))

    def _serve(self, form):
        parts = urllib.parse.urlsplit(self.path)
        query = dict(urllib.parse.parse_qsl(parts.query, keep_blank_values=True))
        name, _, path = parts.path.lstrip("/").partition("/")
        self.provider.seen.append((self.command, parts.path, query, form))
        self._cut = path in self.provider.script.cut
        if path in self.provider.script.silent:
            self.provider.hold()
            self.close_connection = True
        elif not self.provider.known(name):
            self._send(404, {}, "")
        elif path == "authorization":
            answer = self.provider.authorization(name, query, form)
            if form is not None and self.provider.script.leave:
                self.provider.stop(self.connection)
            self._send(*answer)
        elif path == "token" and form is not None:
            self._send_document(*self.provider.token(name, form))
        elif path in ("wellknown", "keys"):
            self._send_document(*self.provider.document(name, path))
        elif path == "logout" and "post_logout_redirect_uri" in query:
            self._send(302, {"Location": query["post_logout_redirect_uri"]}, "")
        else:
            self._send(200, {}, "signed out")

    def _send_document(self, status, kind, body):
        self._send(status, {"Content-Type": kind}, body)

    def _send(self, status, headers, body):
        data = body.encode()
        try:
            self.send_response(status)
            headers = {"Content-Type": "text/html; charset=utf-8", **headers}
            for field, value in {**headers, "Content-Length": str(len(data))}.items():
                self.send_header(field, value)
            self.end_headers()
            self.wfile.write(data[:len(data) // 2] if self._cut else data)
        except OSError:  # whoever asked is gone
            self.close_connection = True
