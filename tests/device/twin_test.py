"""What the tests of the twins share: requests over HTTPS, tokens read and checked, sign-ins."""

import base64
import hashlib
import json
import re
import unittest
import urllib.parse

from device import DeviceTest, device, values_of
from browser import Browser
from scene import PROVIDER

CALLBACK, RELAY = "https://device.example.net/login.cgi", "https://device.example.net/relay.html"


def decoded(part):
    return base64.urlsafe_b64decode(part + "=" * (-len(part) % 4))


def parts_of(token):
    """Header and claims of a token."""
    return [json.loads(decoded(part)) for part in token.split(".")[:2]]


def signed_by(token, key):
    """Whether an RS256 token is signed with the key of a key set."""
    signed, _, signature = token.rpartition(".")
    n, e = (int.from_bytes(decoded(key[name]), "big") for name in "ne")
    plain = pow(int.from_bytes(decoded(signature), "big"), e, n)
    return plain & ((1 << 256) - 1) == int(hashlib.sha256(signed.encode()).hexdigest(), 16)


class TwinTest(unittest.TestCase):
    twin_class = None
    defaults = {}
    longMessage = True

    @classmethod
    def setUpClass(cls):
        cls.twin = cls.twin_class()
        port = cls.twin.listen(0, device().stage.certificate(PROVIDER))
        cls.twin.url = f"https://{PROVIDER}:{port}"

    @classmethod
    def tearDownClass(cls):
        cls.twin.stop()

    def setUp(self):
        self.twin.settings = self.twin.settings_class()
        self.twin.set(**self.defaults)
        self.twin.codes.clear()
        self.twin.log.clear()
        self.browser = Browser(device().stage.authority)

    def get(self, path, **query):
        return self.browser.get(
            self.twin.url + path + ("?" + urllib.parse.urlencode(query) if query else ""))

    def post(self, path, form, **headers):
        form = {name: value for name, value in form.items() if value is not None}
        return self.browser.post(self.twin.url + path, form, headers)

    def followed(self, page):
        """The page at the end of the redirects within the twin."""
        while page.location is not None and page.location.startswith(self.twin.url):
            page = self.browser.get(page.location)
        return page

    def sign_in(self, page):
        """From a page of the twin to the redirect that leads back to the client."""
        page = self.followed(page)
        if page.location is None:
            page = self.followed(self.twin.sign_in(self.browser, page))
        return page

    def sent_back(self, page, base=CALLBACK):
        self.assertEqual(page.status, 302, page.body)
        self.assertEqual(re.split("[?#]", page.location)[0], base)
        return values_of(page.location)


class SignIns(DeviceTest):
    """The login program and the library, with each twin."""
    twin_class = None

    @classmethod
    def setUpClass(cls):
        device().visit(cls.twin_class)

    @classmethod
    def tearDownClass(cls):
        device().come_home()

    def setUp(self):
        super().setUp()
        self.twin = self.device.provider
        self.saved = self.twin.settings

    def tearDown(self):
        self.twin.settings = self.saved

    def callback_url(self, browser=None, **options):
        browser = browser or self.browser
        page = browser.get(self.start(browser, **options).location)
        for _ in range(4):
            if page.location is None:
                page = self.twin.sign_in(browser, page)
            elif page.location.startswith(self.twin.url):
                page = browser.get(page.location)
        self.assertTrue(page.location.startswith(self.device.login_url + "?"), page.location)
        return page.location

    def refused(self, *texts):
        values = self.relay(self.sign_in())
        self.assertEqual(values["success"], "false")
        log = "\n".join(self.log())
        for text in texts:
            self.assertIn(text, log)
        self.assertIsNone(self.user())
