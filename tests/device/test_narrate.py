"""What the demo says while somebody signs in, or tries to."""

import json
import re
import time
import unittest

import narrate
from device import DeviceTest, device
from providers.scripted import Script
from servers import Lighttpd

CHECKED = {"azure": 'signature RS256 with key "key-1"',
           "websphere": "signature HS256 under the client secret"}


class Narration(DeviceTest):
    @classmethod
    def setUpClass(cls):
        one = device()
        one.server.stop()
        one.home.stop()
        cls.narrator = narrate.Narrator(one.stage)
        cls.narrator.set_up()
        one.home.start()
        one.server.start({})
        cls.lines = []
        narrate.say = lambda text: cls.lines.append(re.sub("  +", ": ", text))

    @classmethod
    def tearDownClass(cls):
        one = device()
        one.home.stop()
        cls.narrator.close()
        one.home.start()
        one.use(Lighttpd)

    def begin(self, profile):
        self.device.choose(profile)
        with open(f"/usr/qova/etc/ssoclient/{profile}.conf", encoding="ascii") as file:
            self.narrator.begin(json.load(file))
        self.lines.clear()

    def said(self, *parts):
        """Lines with these parts are said within five seconds. In any order: a thread each
        follows the browser, the login program and the provider."""
        self.device.stage.log.catch_up()
        end = time.monotonic() + 5
        while time.monotonic() < end and not all(map(self.has, parts)):
            time.sleep(0.05)
        for part in parts:
            self.assertTrue(self.has(part), f"not said: {part}\n" + "\n".join(self.lines))

    def has(self, part):
        return any(part in line for line in list(self.lines))

    def test_sign_in_and_out(self):
        for profile in ("azure", "websphere"):
            with self.subTest(profile=profile):
                self.browser = self.new_browser()
                self.begin(profile)
                self.assert_signed_in(self.sign_in(), profile)
                fetched = ["library: reads the discovery document", "library: fetches the key set",
                           "provider: publishes 1 key"] if profile == "azure" else []
                self.said(
                    "browser: starts a sign-in: /webman/login.cgi",
                    "login program: sends the browser to the provider with a new state and nonce, "
                    "with a cookie",
                    "browser: asks the provider to sign the user in",
                    "provider: knows the user, and sends the browser back to the device",
                    "browser: comes back from the provider to /webman/login.cgi with a code",
                    "library: redeems the code",
                    "provider: hands out an ID token for \"alice", *fetched,
                    f"library: accepted the ID token ({CHECKED[profile]})",
                    "login program: sends the browser to the relay page: signed in")
                self.sign_out()
                self.said("login program: ends the session here, and sends the browser")

    def test_no_secret_is_said(self):
        for profile in ("azure", "websphere"):
            self.begin(profile)
            url = self.callback_url()
            self.browser.get(url)
            said = "\n".join(self.lines)
            self.assertIn("accepted the ID token", said)
            for secret in (self.device.clients[profile].secret, self.device.person.password,
                           re.search("code=([^&]*)", url)[1], "eyJ",
                           *(cookie.value for cookie in self.browser.cookies)):
                self.assertNotIn(secret, said)

    def test_refusals(self):
        for script, part in (
                (Script(refuse={"error": "access_denied", "error_description": "No way."}),
                 ("provider: refuses: \"access_denied\", \"No way.\"",
                  "browser: comes back from the provider with the error \"access_denied\"")),
                (Script(token_answer=lambda *_: (400, "application/json",
                                                 '{"error": "invalid_grant"}')),
                 ("provider: refuses the code: status 400, \"invalid_grant\"",)),
                (Script(claims=lambda claims: {**claims, "nonce": "other"}),
                 ("provider: hands out an ID token", "nonce does not belong to this login"))):
            with self.subTest(part=part):
                self.begin("websphere")
                self.device.provider.script = script
                self.assertEqual(self.relay(self.sign_in())["success"], "false")
                self.said(*part, "relay page: NOT signed in, reason")
                self.assertNotIn("accepted the ID token", "\n".join(self.lines))

    def test_a_token_that_is_refused_is_not_called_accepted_later(self):
        self.begin("websphere")
        self.device.provider.script = Script(signature=lambda sign: sign[:-1])
        self.assertEqual(self.relay(self.sign_in())["success"], "false")
        self.assertNotIn("accepted", "\n".join(self.lines))

    def test_a_server_that_is_away(self):
        self.begin("websphere")
        url = self.callback_url()
        self.device.home.stop()
        self.addCleanup(self.device.home.start)
        self.assertEqual(self.relay(self.browser.get(url))["success"], "false")
        self.said("library: redeems the code", "NOT signed in")


if __name__ == "__main__":
    unittest.main()
