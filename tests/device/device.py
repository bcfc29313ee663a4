"""The device under test: its programs, one web server, and the scripted provider."""

import os
import secrets
import subprocess
import sys
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


class Device:
    """Made once per process: a namespace is prepared only once."""

    def __init__(self):
        self.stage = Stage(DEVICE, PROVIDER, 8443, 8444)
        self.stage.build()
        build = os.environ["SSOCLIENT_BUILD"]
        self.stage.install(build + "/prefix", build + "/device", HERE + "/../../device/www")
        self.person = Person("alice", secrets.token_urlsafe(9), "alice@plant7.example.net", {
            "tid": "tenant-7", "unique_name": "alice@plant7.example.net"})
        self.provider = Scripted(self.stage, self.person)
        self.provider.start()
        self.home = self.provider
        self.clients = {}
        self.server = None
        self.use(Lighttpd)

    def use(self, server, **environment):
        """Runs the device under a web server, with that environment for the login program."""
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


def values_of(url):
    parts = urllib.parse.urlsplit(url)
    return dict(urllib.parse.parse_qsl(parts.query or parts.fragment))


class DeviceTest(unittest.TestCase):
    """A test with a fresh browser and a provider that behaves."""

    longMessage = True

    def setUp(self):
        self.device = device()
        self.device.home.script = Script()
        self.device.home.seen.clear()
        self.device.choose("websphere")
        self.browser = self.new_browser()
        self.addCleanup(self.device.home.release)
        self.log_start = len(self.device.stage.log.lines)

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
        """The whole road; returns the page with the redirect to the relay page."""
        return self.browser.get(self.callback_url(**options))

    def run_program(self, query, cookie="", path=LOGIN, user=33):
        """Runs the program as a web server does, without one; returns what it wrote.

        For what web servers refuse to pass on, and for programs that they do not start."""
        done = subprocess.run(
            [path], stdout=subprocess.PIPE, timeout=20, check=True, user=user, group=user,
            extra_groups=[], env={"REQUEST_METHOD": "GET", "QUERY_STRING": query,
                                  "HTTP_COOKIE": cookie})
        return done.stdout.decode()

    # -- outcomes --------------------------------------------------------------------------

    def relay(self, page):
        """The values in the fragment of a redirect to the relay page."""
        self.assertEqual(page.status, 302, page.body[:200])
        prefix = self.device.stage.device + "/webman/ssoclient/relay.html#"
        self.assertTrue(page.location.startswith(prefix), page.location)
        self.assertEqual(page.headers["Cache-Control"], "no-store")
        return values_of(page.location)

    def log(self):
        """What was logged since the test began, as soon as it is there."""
        time.sleep(0.05)
        return self.device.stage.log.lines[self.log_start:]

    def user(self, browser=None):
        """Who the device says is signed in, None if nobody is."""
        page = (browser or self.browser).get(self.device.front_url)
        self.assertEqual(page.status, 200)
        if "Nobody is signed in" in page.text:
            return None
        return page.text.split("Signed in as ")[1].split(". Sign out")[0]

    def assert_signed_in(self, page, profile):
        self.assertEqual(self.relay(page), {"origin": "/index.cgi", "success": "true"})
        self.assertEqual(self.user(), EXPECTED[profile])

    def assert_refused(self, page, reason, logged=None, browser=None):
        """The relay page gets the reason, the log the exact text, and nobody is signed in."""
        self.assertEqual(self.relay(page), {"reason": reason, "success": "false"})
        self.assertIsNone(self.user(browser))
        line = "sign-in failed: " + (reason if logged is None else logged)
        self.assertTrue(any(entry.endswith(line) for entry in self.log()),
                        f"not in the log: {line}\n" + "\n".join(self.log()))
