"""What the twins of real providers share: settings, sessions, codes, a control interface, and
running alone.

A twin behaves as its provider's public documentation says. Its settings describe the registered
client, the user and what goes wrong. A test changes them in Python (`twin.set(...)`) or from
outside, on the twin's own port:

  POST /-/settings   a JSON object; only the settings that it names are changed
  GET  /-/requests   what the twin was asked so far
  GET  /-/log        what the provider would have written to its own log
  POST /-/rotate     signs with a new key from now on

    python3 -B entra.py --port N --certificate FILE --key FILE --settings JSON
"""

import argparse
import dataclasses
import html
import json
import secrets
import signal
import sys
import tempfile
import threading
import time
import urllib.parse

from providers.web import Site, as_json


class SettingsError(Exception):
    """A setting that the twin does not have, or of another type."""


@dataclasses.dataclass
class Common:
    """The settings of both twins."""
    client_id: str = "device"
    client_secret: str = ""
    redirect_uris: list = dataclasses.field(default_factory=list)
    logout_uris: list = dataclasses.field(default_factory=list)
    account: str = "alice"
    password: str = ""
    name: str = "Alice Example"
    email: str = "alice@ad.example.net"
    code_seconds: int = 600    # how long a code is good
    clock_skew: int = 0        # seconds that the provider's clock is ahead
    page_status: int = 200     # of error pages
    fail: dict = dataclasses.field(default_factory=dict)  # endpoint: code that it answers with


@dataclasses.dataclass
class Code:
    """An authorization code that was handed out."""
    query: dict     # of the authorization request
    edition: str    # which of the provider's endpoints handed it out
    time: float
    redeemed: bool = False


class Twin(Site):
    title = ""
    settings_class = Common
    session_cookie = ""

    def __init__(self, stage=None, person=None):
        super().__init__()
        self.url = ""
        self.settings = self.settings_class()
        self.log = []
        self.codes = {}
        self._sessions = {}
        self._lock = threading.Lock()
        self._stage = stage
        self._folder = tempfile.TemporaryDirectory(prefix="twin-")
        self.folder = self._folder.name
        if stage is not None:
            self.on_stage(stage, person)

    def set(self, **values):
        known = {field.name: field.type for field in dataclasses.fields(self.settings)}
        for name, value in values.items():
            if name not in known or not isinstance(value, known[name]):
                raise SettingsError(f"no setting '{name}' of that type")
        self.settings = dataclasses.replace(self.settings, **values)

    @property
    def clock_skew(self):
        return self.settings.clock_skew

    def now(self):
        return int(time.time()) + self.clock_skew

    # -- requests --------------------------------------------------------------------------

    def answer(self, request):
        with self._lock:  # one request at a time: nothing else here is ready for threads
            if request.path.startswith("/-/"):
                return self._control(request)
            self.seen.append((request.method, request.path, request.query, request.form))
            return self.serve(request)

    def serve(self, request):
        raise NotImplementedError

    def prepare(self):
        """Makes the keys now; later the first request would wait for them."""

    def rotate(self):
        """Signs with a new key from now on."""

    def _control(self, request):
        what = request.path.removeprefix("/-/")
        if what == "settings" and request.method == "POST":
            try:
                self.set(**json.loads(request.body))
            except (ValueError, TypeError, SettingsError) as error:
                return as_json({"error": str(error)}, 400)
            return as_json(dataclasses.asdict(self.settings))
        if what == "rotate" and request.method == "POST":
            self.rotate()
            return as_json({})
        if what in ("requests", "log"):
            return as_json(self.seen if what == "requests" else self.log)
        return as_json({"error": "no such control"}, 404)

    # -- sessions and codes ----------------------------------------------------------------

    def user(self, request):
        """Who is signed in at the provider in this browser, None if no user is."""
        return self._sessions.get(request.cookie(self.session_cookie))

    def open_session(self, account):
        """Opens a session; returns the header that carries its cookie."""
        key = secrets.token_urlsafe(24)
        self._sessions[key] = account
        return {"Set-Cookie": f"{self.session_cookie}={key}; Path=/; Secure; HttpOnly; "
                              "SameSite=None"}

    def close_session(self, request):
        self._sessions.pop(request.cookie(self.session_cookie), None)
        return {"Set-Cookie": f"{self.session_cookie}=; Path=/; Secure; HttpOnly; SameSite=None; "
                              "Max-Age=0"}

    def issue(self, code, query, edition=""):
        self.codes[code] = Code(query, edition, time.time())
        return code

    def expired(self, code):
        return time.time() - code.time >= self.settings.code_seconds

    # -- on the stage ----------------------------------------------------------------------

    def on_stage(self, stage, person):
        """Takes its address from the stage and the user from the scene."""
        self.url = f"https://{stage.provider_name}:{stage.provider_port}"
        self.set(account=person.account, password=person.password, email=person.email)

    def register(self, client):
        self.set(client_id=client.identity, client_secret=client.secret,
                 redirect_uris=[client.redirect_uri], logout_uris=[client.logout_uri])

    def start(self):
        self.prepare()
        self.listen(self._stage.provider_listens,
                    self._stage.certificate(self._stage.provider_name))

    def sign_in(self, browser, page):
        """Fills in the login form; returns the page that follows."""
        form = page.form("login")
        name, password = (field.split("=")[1].rstrip("]") for field in self.fields)
        return browser.post(urllib.parse.urljoin(page.url, html.unescape(form["action"])), {
            **form["fields"], name: self.login_name, password: self.settings.password})

    @property
    def login_name(self):
        """What the user types as the name."""
        return self.settings.account

    def agree(self, tab):
        """Asks nothing after name and password."""

    def agree_to_leave(self, tab):
        """Nor at the logout."""


def run_alone(twin_class):
    """Runs a twin alone, until a signal ends it."""
    parser = argparse.ArgumentParser(description=twin_class.title + ", for tests on this machine")
    parser.add_argument("--port", type=int, default=0, help="0: any free one, which is printed")
    parser.add_argument("--address", default="127.0.0.1", choices=("127.0.0.1", "::1"))
    parser.add_argument("--host", default="localhost", help="the name in its own URLs")
    parser.add_argument("--certificate", required=True)
    parser.add_argument("--key", required=True)
    parser.add_argument("--settings", default="{}", help="a JSON object, or a file with one")
    options = parser.parse_args()
    twin, text = twin_class(), options.settings
    try:
        if not text.lstrip().startswith("{"):
            with open(text, encoding="utf-8") as file:
                text = file.read()
        twin.set(**json.loads(text))
    except (OSError, ValueError, TypeError, SettingsError) as error:
        sys.exit(f"--settings: {error}")
    twin.prepare()
    signals = {signal.SIGINT, signal.SIGTERM}
    signal.pthread_sigmask(signal.SIG_BLOCK, signals)
    port = twin.listen(options.port, (options.certificate, options.key), options.address)
    twin.url = f"https://{options.host}:{port}"
    print(twin.url, flush=True)
    signal.sigwait(signals)
