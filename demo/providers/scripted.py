"""A provider that follows a script: what a certified provider refuses to show.

Without a script it behaves: a login form, codes that serve once, RS256 with a published key for
the Azure client, HS256 under the client's secret for the WebSphere client. A script changes
one thing at a time, see Script. Everything that it was asked is kept in `seen`.
"""

import contextlib
import dataclasses
import html
import json
import secrets
import threading
import time
import urllib.parse

from browser import BrowserError
from providers import BOTH
from providers.jose import RsaKey, base64url, hmac_signer, signing_input
from providers.web import Answer, Handler, Site, login_page, with_query


@dataclasses.dataclass
class Script:
    """What to do otherwise. Each function gets what the provider would send, and returns what to
    send instead."""
    refuse: dict = None        # parameters of an error answer to the authorization request
    claims: object = None      # changes the claims of the ID token
    raw_claims: object = None  # changes their text, in bytes
    header: object = None      # changes the header of the ID token
    signature: object = None   # changes the bytes of the signature
    sign: object = None        # signs instead of the provider's key: bytes to signature
    token_answer: object = None  # changes (status, type, body) of the token endpoint
    document: object = None    # changes (path, status, type, body) of "wellknown" and "keys"
    silent: tuple = ()         # paths ("token", "keys"...) that take the request and do not answer
    cut: tuple = ()            # paths whose answer ends in its middle
    flood: dict = dataclasses.field(default_factory=dict)  # per path: writes to the connection
    leave: bool = False        # nobody listens any more once a code is handed out


@dataclasses.dataclass
class Realm:
    client: object
    sign: object
    header: dict
    claims: dict
    keys: list


class Scripted(Site):
    title = "scripted provider"
    fields = "#username", "#password"  # of the login page
    comes_back = True  # after a logout
    setups = BOTH

    def __init__(self, stage, person):
        super().__init__()
        self.url = f"https://{stage.provider_name}:{stage.provider_port}"
        self.script = Script()
        self.sent = []  # where the browsers were sent back to
        self._stage = stage
        self._person = person
        self._realms = {}
        self._codes = {}
        self._keys = 0
        self._released = threading.Event()

    # -- set-up ----------------------------------------------------------------------------

    def start(self):
        self.listen(self._stage.provider_listens,
                    self._stage.certificate(self._stage.provider_name))

    def stop(self, but=None):
        self.release()
        super().stop(but)

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
        key = RsaKey(f"{self._stage.folder}/scripted-{self._keys}")
        return key.sign, key.public(identity)

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
        return self._add("websphere", Realm(client, hmac_signer(client.secret), {"alg": "HS256"},
                                            {"sub": self._person.account}, []))

    def _add(self, name, realm):
        self._realms[name] = realm
        return {part: f"{self.url}/{name}/{part}"
                for part in ("wellknown", "authorization", "token", "logout")}

    # -- a person in front of the login page -----------------------------------------------

    @property
    def login_name(self):
        return self._person.account

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

    def answer_at(self, name, path, request):
        query, form = request.query, request.form
        if name not in self._realms:
            return Answer(404)
        if path == "authorization":
            return self.authorization(name, query, form)
        if path == "token" and form is not None:
            return _document(*self.token(name, form))
        if path in ("wellknown", "keys"):
            return _document(*self.document(name, path))
        if path == "logout" and "post_logout_redirect_uri" in query:
            return Answer(302, "", {"Location": query["post_logout_redirect_uri"]})
        return Answer(200, "signed out")

    def authorization(self, name, query, form):
        client = self._realms[name].client
        if query.get("redirect_uri") != client.redirect_uri or \
                query.get("client_id") != client.identity:
            return Answer(400, "unknown client")
        if self.script.refuse is not None:
            return self._back(query, self.script.refuse)
        action = html.escape(f"/{name}/authorization?{urllib.parse.urlencode(query)}")
        if form is None:
            return login_page(action)
        if (form.get("username"), form.get("password")) != \
                (self._person.account, self._person.password):
            refused = login_page(action, "Wrong name or password.")
            return dataclasses.replace(refused, status=403)
        code = secrets.token_urlsafe(16)
        self._codes[code] = (name, query.get("nonce"))
        return self._back(query, {"code": code})

    def _back(self, query, values):
        values = {**values, "state": query.get("state", "")}
        self.sent.append(with_query(query["redirect_uri"], values))
        return Answer(302, "", {"Location": self.sent[-1]})

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
        signed = signing_input(header, claims)
        if self.script.raw_claims is not None:
            parts = [self.script.raw_claims(json.dumps(claims).encode())]
            signed = signed.split(".")[0] + "." + base64url(parts[0])
        signature = (self.script.sign or realm.sign)(signed.encode())
        if self.script.signature is not None:
            signature = self.script.signature(signature)
        return signed + "." + base64url(signature)

    def document(self, name, path):
        """The discovery document or the key set: status, type, body."""
        if path == "wellknown":
            value = {"issuer": f"{self.url}/{name}", "jwks_uri": f"{self.url}/{name}/keys"}
        else:
            value = {"keys": self._realms[name].keys}
        answer = 200, "application/json", json.dumps(value)
        change = self.script.document
        return answer if change is None else change(path, *answer)

    def last_code(self):
        """A code that nobody has used yet."""
        if not self._codes:
            raise BrowserError("no code is waiting")
        return next(reversed(self._codes))


def _document(status, kind, body):
    return Answer(status, body, {"Content-Type": kind})


class _Handler(Handler):
    """Takes the answers of a Scripted, and does to the connection what its script demands."""

    def handle_request(self, request):
        provider = self.site
        name, _, path = request.path.lstrip("/").partition("/")
        provider.seen.append((request.method, request.path, request.query, request.form))
        if path in provider.script.silent:
            provider.hold()
            self.close_connection = True
            return
        if path in provider.script.flood:
            self.close_connection = True
            with contextlib.suppress(OSError):  # whoever asked has had enough
                provider.script.flood[path](self.wfile)
            return
        answer = provider.answer_at(name, path, request)
        if path == "authorization" and request.form is not None and provider.script.leave:
            provider.stop(self.connection)
        self.send(answer, cut=path in provider.script.cut)


Scripted.handler = _Handler
