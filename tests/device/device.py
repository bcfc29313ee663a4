"""The device under test: its programs, one web server, and the scripted provider."""

import contextlib
import json
import os
import secrets
import subprocess
import sys
import threading
import time
import unittest
import urllib.parse

HERE = os.path.dirname(os.path.abspath(__file__))
sys.path.insert(0, os.path.join(HERE, "..", "..", "demo"))

from browser import Browser  # noqa: E402
from providers.scripted import Script, Scripted  # noqa: E402
from scene import DEVICE, PROVIDER, Client, Person, settings_of  # noqa: E402
from servers import Lighttpd  # noqa: E402
from stage import WWW, Stage  # noqa: E402

EXPECTED = {"azure": "PLANT7.EXAMPLE.NET\\alice", "websphere": "alice"}
STORE = "/run/ssoclient"
LOGIN = WWW + "/webman/login.cgi"
LIBEXEC = "/usr/qova/libexec/ssoclient-login"
BUILD = os.environ["SSOCLIENT_BUILD"]


class Device:
    """Made once per process: a namespace is prepared only once."""

    def __init__(self):
        self.stage = Stage(DEVICE, PROVIDER, 8443, 8444)
        self.stage.build()
        self.stage.install(BUILD + "/prefix", BUILD + "/device", HERE + "/../../device/www")
        self.person = Person("alice", secrets.token_urlsafe(9), "alice@plant7.example.net", {
            "tid": "tenant-7", "unique_name": "alice@plant7.example.net"})
        self.provider = Scripted(self.stage, self.person)
        self.provider.start()
        self.home = self.provider
        self.clients = {}
        self.server = None
        self.use(Lighttpd)

    def use(self, server, **environment):
        """Runs the device under a web server, which passes that environment on."""
        if self.server is not None:
            self.server.stop()
        self.server = server(self.stage)
        self.server.start(environment)
        self._register()

    def _register(self):
        for title in self.provider.setups:
            self.register(title)

    def register(self, title):
        """Sets the device's client up for one of the provider's sign-ins."""
        name, add = self.provider.setups[title]
        address = self.stage.device
        client = self.clients[name] = Client(
            "device-" + name, secrets.token_urlsafe(24) + "+/=&%'", address + self.server.login,
            address + "/webman/ssoclient/relay.html")
        endpoints = getattr(self.provider, add)(client)
        self.stage.configure(name, settings_of(name, client, endpoints, self.person))

    def visit(self, provider):
        """Another provider takes the scripted one's place."""
        self.home = self.provider
        self.home.stop()
        self.provider = provider(self.stage, self.person)
        self.provider.start()
        self._register()

    def come_home(self):
        self.provider.stop()
        self.provider = self.home
        self.provider.start()
        self._register()

    def choose(self, profile):
        self.stage.configure("profile", {"sso_enable": True, "sso_profile": profile}, 0o644)

    def options(self, **values):
        """The login program's settings from now on."""
        self.stage.set_options(**values)

    @property
    def login_url(self):
        return self.stage.device + self.server.login

    @property
    def front_url(self):
        return self.stage.device + self.server.front


_device = None


def device():
    global _device
    if _device is None:
        _device = Device()
    return _device


def programs(program="login.cgi"):
    """Process ids of the login programs that run, parents before children."""
    found = []
    for name in os.listdir("/proc"):
        if not name.isdigit():
            continue
        try:
            with open(f"/proc/{name}/stat", encoding="ascii") as file:
                stat = file.read()
        except OSError:
            continue
        if f"({program})" in stat and stat.split()[2] != "Z":
            found.append(int(name))
    return sorted(found)


def wait_until(condition, seconds=15):
    end = time.monotonic() + seconds
    while not condition():
        if time.monotonic() > end:
            raise AssertionError("waited in vain")
        time.sleep(0.05)


class SetId:
    """The login program is set-id itself."""

    program = "login.cgi"


class Launched:
    """The other way to the same identities: the launcher is set-id, the login program is not."""

    program = "ssoclient-login"

    @classmethod
    def setUpClass(cls):
        super().setUpClass()
        cls.stage = device().stage
        os.makedirs(os.path.dirname(LIBEXEC), exist_ok=True)
        cls.stage.install_login(BUILD + "/device/login.cgi", LIBEXEC, 0o750)
        cls.stage.install_login(BUILD + "/device/launcher.cgi", LOGIN, 0o4750)

    @classmethod
    def tearDownClass(cls):
        os.unlink(LIBEXEC)
        cls.stage.install_login(BUILD + "/device/login.cgi", LOGIN, 0o4750)
        super().tearDownClass()


def values_of(url):
    parts = urllib.parse.urlsplit(url)
    return dict(urllib.parse.parse_qsl(parts.query or parts.fragment))


class DeviceTest(unittest.TestCase):
    """A test with a fresh browser and a provider that behaves."""

    longMessage = True
    program = SetId.program

    def setUp(self):
        self.device = device()
        self.device.home.script = Script()
        self.device.home.seen.clear()
        self.device.choose("websphere")
        self.device.options()
        self.browser = self.new_browser()
        self.addCleanup(self.device.home.release)
        self.forget_log()

    def new_browser(self):
        return Browser(self.device.stage.authority)

    def cookie_header(self):
        """The cookies of the browser, for another one to send."""
        return {"Cookie": "; ".join(f"{cookie.name}={cookie.value}"
                                    for cookie in self.browser.cookies)}

    # -- steps -----------------------------------------------------------------------------

    def start(self, browser=None, origin="/index.cgi"):
        """Asks for a login; returns the page with the redirect to the provider."""
        query = urllib.parse.urlencode({"action": "start", "origin": origin})
        return (browser or self.browser).get(f"{self.device.login_url}?{query}")

    def callback_url(self, browser=None, **options):
        """Goes to the provider and signs in there; returns the URL that leads back."""
        browser = browser or self.browser
        page = browser.get(self.start(browser, **options).location)
        if page.location is None:
            page = self.device.provider.sign_in(browser, page)
        self.assertTrue(page.location.startswith(self.device.login_url + "?"), page.location)
        return page.location

    def sign_in(self, **options):
        """The whole sign-in; returns the page with the redirect to the relay page."""
        return self.browser.get(self.callback_url(**options))

    def sign_out(self, browser=None, headers=None):
        """Sends the form of the device's front page."""
        browser = browser or self.browser
        form = browser.get(self.device.front_url).form("sign-out")
        return browser.post(self.device.login_url + "?action=logout", form["fields"], headers)

    def run_program(self, query, cookie="", path=LOGIN, user=33, **variables):
        """Runs the program as a web server does, without one; returns what it wrote.

        For what web servers refuse to pass on, and for programs that they do not start."""
        return self.run_raw(query, cookie, path, user, **variables).stdout.decode()

    def run_raw(self, query, cookie="", path=LOGIN, user=33, before=None, timeout=30, **variables):
        """The same, with the process's whole outcome. `before` runs in it, before the program."""
        return subprocess.run(
            [path], stdout=subprocess.PIPE, stderr=subprocess.PIPE, stdin=subprocess.DEVNULL,
            timeout=timeout, check=False, user=user, group=user, extra_groups=[], preexec_fn=before,
            env={"REQUEST_METHOD": "GET", "QUERY_STRING": query, "HTTP_COOKIE": cookie,
                 "SCRIPT_NAME": "/webman/login.cgi", **variables})

    @contextlib.contextmanager
    def exchanging(self, url):
        """A callback whose exchange waits for the provider; gives the ids of the two processes."""
        self.device.provider.script = Script(silent=("token",))
        before = len(self.device.provider.seen)
        waiting = threading.Thread(target=self.browser.get, args=(url,))
        waiting.start()
        try:
            wait_until(lambda: any(path.endswith("/token")
                                   for _, path, _, _ in self.device.provider.seen[before:]))
            running = programs(self.program)
            self.assertEqual(len(running), 2)
            yield running
        finally:
            self.device.provider.release()
            waiting.join(30)
        wait_until(lambda: not programs(self.program))

    # -- outcomes --------------------------------------------------------------------------

    def relay(self, page):
        """The values in the fragment of a redirect to the relay page."""
        self.assertEqual(page.status, 302, page.body[:200])
        prefix = self.device.stage.device + "/webman/ssoclient/relay.html#"
        self.assertTrue(page.location.startswith(prefix), page.location)
        self.assertEqual(page.headers["Cache-Control"], "no-store")
        return values_of(page.location)

    def log(self):
        """What was logged since the test began."""
        self.device.stage.log.catch_up()
        return self.device.stage.log.lines[self.log_start:]

    def forget_log(self):
        self.device.stage.log.catch_up()
        self.log_start = len(self.device.stage.log.lines)

    def logged(self, part, seconds=5):
        """The lines of the log that hold a text; waits until there is one."""
        end = time.monotonic() + seconds
        lines = []
        while not lines and time.monotonic() < end:
            lines = [line for line in self.log() if part in line]
            time.sleep(0 if lines else 0.05)
        return lines

    def assert_logged(self, text):
        self.assertTrue(any(line.endswith(text) for line in self.logged(text)),
                        f"not in the log: {text}\n" + "\n".join(self.log()))

    def change(self, profile, **values):
        """Changes a provider's settings until the test ends."""
        path = f"/usr/qova/etc/ssoclient/{profile}.conf"
        with open(path, encoding="ascii") as file:
            before = json.load(file)
        self.addCleanup(self.device.stage.configure, profile, before)
        self.device.stage.configure(profile, {**before, **{
            f"{profile}_{name}": value for name, value in values.items()}})

    def user(self, browser=None):
        """Who the device says is signed in, None if no user is."""
        page = (browser or self.browser).get(self.device.front_url)
        self.assertEqual(page.status, 200)
        if 'id="sign-in"' in page.body:
            return None
        return page.text.split("Signed in as ")[1].split(". Since ")[0]

    def assert_signed_in(self, page, profile):
        self.assertEqual(self.relay(page), {"origin": "/index.cgi", "success": "true"})
        self.assertEqual(self.user(), EXPECTED[profile])

    def reference(self, page, code, origin=None):
        """The reference number of a failure with that code."""
        values = self.relay(page)
        self.assertRegex(values.get("reason", ""), f"^{code}[.][2-9A-HJKMNP-TV-Z]{{8}}$")
        self.assertEqual(values["success"], "false")
        self.assertEqual(values.keys() - {"origin"}, {"reason", "success"})
        if origin is not None:
            self.assertEqual(values.get("origin", ""), origin)
        return values["reason"].split(".")[1]

    def assert_refused(self, page, code, text, *more, browser=None):
        """The relay page gets the code, the log the exact text with the same reference number, and
        no user is signed in."""
        reference = self.reference(page, code)
        self.assertIsNone(self.user(browser))
        lines = self.logged(f"sign-in failed [{reference}]")
        self.assertEqual(len(lines), 1, "\n".join(self.log()))
        self.assertIn(f"]: {code}, client 127.0.0.1, profile ", lines[0])
        self.assertTrue(lines[0].endswith(": " + text), lines[0])
        for part in more:
            self.assertIn(part, lines[0])
        return lines[0]
