"""A scenario: a person in front of Chromium, the device, and a provider that does as it is told."""

import atexit
import json
import os

from chromium import Chromium
from device import EXPECTED, HERE, STORE, DeviceTest, device

with open(HERE + "/../../device/www/texts.js", encoding="utf-8") as _file:
    _text = _file.read()
    TEXTS = json.loads(_text[_text.index("{"):_text.rindex("}") + 1])
ENGLISH = TEXTS["en"]

_chromium = None


def chromium():
    """Started once; each scenario gets a tab without a past."""
    global _chromium
    if _chromium is None:
        _chromium = Chromium(device().stage)
        atexit.register(_chromium.close)
    return _chromium


class Scenario(DeviceTest):
    key_by_key = False  # whether name and password are typed so

    def setUp(self):
        super().setUp()
        for name in self.sessions():
            os.unlink(f"{STORE}/sessions/{name}")
        self.tab = chromium().person()
        self.addCleanup(self._no_complaints)
        self.relay_url = self.device.stage.device + "/webman/ssoclient/relay.html"

    def _no_complaints(self):
        """No script of the device failed, and none of its pages broke its own policy."""
        # A violation does not always say which page it was; a provider of flesh has some of its own.
        own = [text for text in self.tab.complaints()
               if not text.startswith((self.device.provider.url, self.device.stage.device +
                                       "/favicon.ico"))]
        self.assertEqual(own, [])

    # -- what the person does --------------------------------------------------------------

    def to_provider(self, profile):
        """From the device's front page to the provider's login page."""
        self.device.choose(profile)
        self.tab.open(self.device.front_url)
        self.tab.click("#sign-in")

    def enter(self, password=None):
        """Enters name and password at the provider's own page, and agrees to what it asks."""
        provider, person = self.device.provider, self.device.person
        name, secret = provider.fields
        write = self.tab.type if self.key_by_key else self.tab.paste
        write(name, provider.login_name)
        write(secret, person.password if password is None else password)
        self.tab.press("ENTER")
        provider.agree(self.tab)

    def sign_in(self, profile):
        self.to_provider(profile)
        self.enter()

    def sign_out(self):
        self.tab.click("#sign-out button")
        self.device.provider.agree_to_leave(self.tab)

    # -- what comes of it ------------------------------------------------------------------

    def on(self, path):
        """Waits until the person is on a page of the device."""
        url = self.device.stage.device + path
        self.tab.wait(lambda: self.tab.url == url, url)

    def user_shown(self):
        """Who the device says is signed in, on its front page; None if no user is."""
        self.tab.open(self.device.front_url)
        self.tab.find("main")
        return None if self.tab.all("#sign-in") else self.tab.find("#user").text

    def assert_in(self, profile, origin="/index.cgi"):
        """The relay page said so, and went on to the origin, where the person is known."""
        self.on(origin)
        self.assertEqual(self.tab.relay()[-1]["text"].split("\n"), [
            ENGLISH["device"], ENGLISH["signed-in"], "", ENGLISH["signed-in-text"], "",
            ENGLISH["onward"]])
        self.assertEqual(self.tab.find("#user").text, EXPECTED[profile])
        self.assert_logged("signed in: " + EXPECTED[profile])
        self.assertEqual(len(self.sessions()), 1)

    def assert_out(self):
        """The relay page says that the person is out, and the device knows nobody."""
        self.tab.wait(lambda: self.tab.title == "Signed out", "the relay page after the logout")
        self.assertEqual(self.tab.url, self.relay_url)
        self.assertEqual(self.tab.find("main").text.split("\n"), [
            ENGLISH["signed-out"], ENGLISH["signed-out-text"], ENGLISH["front"]])
        self.assert_nobody()

    def assert_refused_here(self, code, text, lines=()):
        """The relay page says no in the words of that code; the log has the exact text under the
        same reference number, and what led to it; no user is signed in."""
        self.assert_refusal_shown(code)
        reference = self.tab.find("#reference").text.split()[-1]
        failures = self.logged(f"sign-in failed [{reference}]: {code}, client 127.0.0.1, ")
        self.assertEqual(len(failures), 1, "\n".join(self.log()))
        self.assertTrue(failures[0].endswith(": " + text), failures[0])
        for line in lines:
            self.assert_logged(line)
        self.assertFalse([line for line in self.log() if ": signed in: " in line])
        self.assert_nobody()

    def assert_refusal_shown(self, code=None, words=ENGLISH):
        """The relay page shows the sentences of that code, or else the general ones."""
        self.tab.wait(lambda: self.tab.title == words["not-signed-in"], "the relay page's refusal")
        self.assertTrue(self.tab.url.startswith(self.relay_url + "#"), self.tab.url)
        self.assertEqual(self.tab.find("#outcome").text, words["not-signed-in"])
        reason, hint = words["failures"].get(code, words["general"])
        self.assertEqual(self.tab.find("#reason").text, reason)
        self.assertEqual(self.tab.find("#help").text, hint)
        self.assertEqual(self.tab.find("#again").text, words["again"])
        self.assertEqual(self.tab.find("#onward").text, words["front"])

    def assert_nobody(self):
        self.assertEqual(self.sessions(), [])
        self.assertIsNone(self.user_shown())
        names = [cookie["name"] for cookie in self.tab.driver.get_cookies()]
        self.assertNotIn("__Host-session", names)

    @staticmethod
    def sessions():
        folder = STORE + "/sessions"
        return os.listdir(folder) if os.path.isdir(folder) else []
