"""A scenario: a person in front of Chromium, the device, and a provider that does as it is told."""

import atexit
import json
import os
import time

from chromium import Chromium
from device import EXPECTED, STORE, DeviceTest, device

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

    def change_setting(self, profile, **values):
        path = f"/usr/qova/etc/ssoclient/{profile}.conf"
        with open(path, encoding="ascii") as file:
            before = json.load(file)
        self.addCleanup(self.device.stage.configure, profile, before)
        self.device.stage.configure(profile, {**before, **{
            f"{profile}_{name}": value for name, value in values.items()}})

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
        """Who the device says is signed in, on its front page; None if nobody is."""
        self.tab.open(self.device.front_url)
        text = self.tab.find("main").text
        if "Nobody is signed in." in text:
            return None
        return self.tab.find("#user").text

    def assert_in(self, profile, origin="/index.cgi"):
        """The relay page said so, and went on to the origin, where the person is known."""
        self.on(origin)
        self.assertEqual(self.tab.relay()[-1]["text"].split("\n\n"), ["Signed in", "Go on"])
        self.assertEqual(self.tab.find("#user").text, EXPECTED[profile])
        self.assert_logged("signed in: " + EXPECTED[profile])
        self.assertEqual(len(self.sessions()), 1)

    def assert_out(self):
        """The relay page says that the person is out, and the device knows nobody."""
        self.tab.wait(lambda: self.tab.title == "Signed out", "the relay page after the logout")
        self.assertEqual(self.tab.url, self.relay_url)
        self.assertEqual(self.tab.find("main").text.split("\n"),
                         ["Signed out", "Back to the device"])
        self.assert_nobody()

    def assert_refused_here(self, reason, logged=None, lines=()):
        """The relay page says no, with the reason as a person reads it; the log has the exact
        text and what led to it; nobody is signed in."""
        self.tab.wait(lambda: self.tab.title == "Not signed in", "the relay page's refusal")
        self.assertTrue(self.tab.url.startswith(self.relay_url + "#"), self.tab.url)
        self.assertEqual(self.tab.find("#outcome").text, "Not signed in")
        self.assertEqual(self.tab.find("#reason").text, reason)
        self.assertEqual(self.tab.find("#onward").text, "Back to the device")
        for line in (*lines, "sign-in failed: " + (reason if logged is None else logged)):
            self.assert_logged(line)
        self.assertFalse([line for line in self.log() if ": signed in: " in line])
        self.assert_nobody()

    def assert_nobody(self):
        self.assertEqual(self.sessions(), [])
        self.assertIsNone(self.user_shown())
        names = [cookie["name"] for cookie in self.tab.driver.get_cookies()]
        self.assertNotIn("__Host-session", names)

    def assert_logged(self, line):
        """A line of the system log is that text: after the program's name, or a place in it."""
        end = time.monotonic() + 5
        while not any(entry.endswith((": " + line, " " + line)) for entry in self.log()):
            if time.monotonic() > end:
                self.fail(f"not in the log: {line}\n" + "\n".join(self.log()))

    @staticmethod
    def sessions():
        folder = STORE + "/sessions"
        return os.listdir(folder) if os.path.isdir(folder) else []
