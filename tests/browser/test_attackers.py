"""What an attacker may put before a person's browser, and what comes of it."""

import base64
import json
import unittest
import urllib.parse

from device import values_of
from providers.scripted import Script
from scenario import ENGLISH, Scenario

USED_UP = "expired", "login was not started in this browser, or is used up"
OTHER_STATE = "expired", "state does not belong to this login"
MARKUP = "<img src=x onerror=\"document.title='owned'\"><script>document.title='owned'</script>"
FOREIGN = ("https://evil.localhost/", "//evil.localhost/", "/\\evil.localhost",
           "javascript:document.title='owned'", "data:text/html,owned")


class Callbacks(Scenario):
    """The attacker has his own browser (self.browser), and sends links."""

    def forged(self, profile):
        self.device.choose(profile)
        link = self.callback_url()
        self.device.provider.seen.clear()
        return link

    def assert_code_kept(self):
        self.assertFalse([path for _, path, _, _ in self.device.provider.seen
                          if path.endswith("/token")], "the code was used")

    def test_forged_callback_without_a_login(self):
        self.tab.open(self.forged("azure"))
        self.assert_refused_here(*USED_UP)
        self.assert_code_kept()

    def test_forged_callback_into_a_login_azure(self):
        self.forged_into_a_login("azure")

    def test_forged_callback_into_a_login_websphere(self):
        self.forged_into_a_login("websphere")

    def forged_into_a_login(self, profile):
        link = self.forged(profile)
        self.to_provider(profile)
        self.tab.find("#password")
        login = self.tab.url
        self.tab.open(link)
        self.assert_refused_here(*USED_UP)
        self.assert_code_kept()
        # The login that was under way is still good.
        self.tab.open(login)
        self.enter()
        self.assert_in(profile)

    def test_stolen_code_azure(self):
        self.stolen_code("azure")

    def test_stolen_code_websphere(self):
        self.stolen_code("websphere")

    def stolen_code(self, profile):
        """Somebody else's code, brought into a login of one's own."""
        code = values_of(self.forged(profile))["code"]
        self.to_provider(profile)
        self.tab.find("#password")
        state = values_of(self.tab.url)["state"]
        self.tab.open(self.device.login_url + "?" +
                      urllib.parse.urlencode({"code": code, "state": state}))
        self.assert_refused_here("not-verified", "nonce does not belong to this login")

    def test_replayed_in_the_same_browser(self):
        self.sign_in("azure")
        self.assert_in("azure")
        self.sign_out()
        self.assert_out()
        self.tab.open(self.device.provider.sent[-1])
        self.assert_refusal_shown("expired")
        self.assert_logged(USED_UP[1])
        self.assert_nobody()

    def test_replayed_in_another_browser(self):
        """The other one gets nothing, and the person stays signed in."""
        self.sign_in("websphere")
        self.assert_in("websphere")
        page = self.browser.get(self.device.provider.sent[-1])
        self.assert_refused(page, *USED_UP)
        self.assertEqual(self.user_shown(), "alice")

    def test_altered_state(self):
        self.to_provider("websphere")
        self.tab.find("#password")
        state = json.loads(base64.b64decode(values_of(self.tab.url)["state"]))
        state["origin"] = "/elsewhere"
        link = {"code": "x", "state": base64.b64encode(json.dumps(state).encode()).decode()}
        self.tab.open(self.device.login_url + "?" + urllib.parse.urlencode(link))
        self.assert_refused_here(*OTHER_STATE)

    def test_a_link_does_not_sign_out(self):
        self.sign_in("websphere")
        self.assert_in("websphere")
        self.tab.open(self.device.login_url + "?action=logout")
        self.tab.wait(lambda: self.tab.title == "Not signed in", "the relay page")
        self.assertEqual(self.user_shown(), "alice")


class ForeignPages(Scenario):
    """A page of another site, which the person has open in the same browser."""

    def foreign_page(self):
        self.tab.driver.switch_to.new_window("tab")
        self.tab.open(self.device.provider.url + "/websphere/logout")

    def post(self, **fields):
        """What a script of that page can send, with the person's cookies or without."""
        self.tab.script("""
            const form = document.createElement("form");
            form.method = "post";
            form.action = arguments[0];
            for (const [name, value] of Object.entries(arguments[1])) {
              const input = document.createElement("input");
              input.name = name;
              input.value = value;
              form.append(input);
            }
            document.body.append(form);
            form.submit();""", self.device.login_url + "?action=logout", fields)

    def test_sign_out(self):
        self.sign_in("websphere")
        self.assert_in("websphere")
        home = self.tab.driver.current_window_handle
        token = self.tab.script("return document.querySelector('[name=token]').value")
        for fields in ({}, {"token": "0" * 32}, {"token": token}):
            with self.subTest(fields=fields.keys()):
                self.foreign_page()
                self.post(**fields)
                self.tab.wait(lambda: self.tab.title == ENGLISH["not-signed-out"], "the refusal")
                self.assertEqual(self.tab.find("#reason").text,
                                 ENGLISH["failures"]["sign-out-refused"][0])
                self.assertEqual(self.tab.all("#again"), [])
                self.assertEqual(len(self.sessions()), 1)
                self.tab.click("#onward")
                self.tab.wait(lambda: self.tab.all("#user"), "the front page")
        self.tab.driver.switch_to.window(home)
        self.assertEqual(self.user_shown(), "alice")
        self.sign_out()
        self.assert_out()

    def test_start_of_another_login(self):
        """Links and images that start logins, while the person is busy at the provider."""
        self.to_provider("websphere")
        home = self.tab.driver.current_window_handle
        self.tab.find("#password")
        self.foreign_page()
        for link in ("?action=start", "?code=x&state=x", "?error=access_denied&state=x", "?x"):
            self.tab.script("""
                return new Promise((done) => {
                  const image = new Image();
                  image.onload = image.onerror = () => done(true);
                  image.src = arguments[0];
                });""", self.device.login_url + link)
            self.tab.open(self.device.login_url + link)
        self.tab.complaints()  # of the images, which are none
        self.tab.driver.switch_to.window(home)
        self.enter()
        self.assert_in("websphere")


class Links(Scenario):
    """Links to the device's own pages with somebody else's words in them."""

    def test_foreign_origin(self):
        for origin in FOREIGN:
            with self.subTest(origin=origin):
                self.device.choose("websphere")
                self.tab.open(self.device.login_url + "?" +
                              urllib.parse.urlencode({"action": "start", "origin": origin}))
                self.enter()
                self.on("/")
                self.assertEqual(self.tab.find("#user").text, "alice")
                self.sign_out()
                self.assert_out()

    def test_foreign_origin_in_the_fragment(self):
        for origin in (*FOREIGN, "\t//evil.localhost/", "/\t/evil.localhost/", "/..//evil.localhost"):
            with self.subTest(origin=origin):
                self.tab.open("about:blank")
                self.tab.open(self.relay_url + "#success=true&origin=" +
                              urllib.parse.quote(origin, safe=""))
                self.on("/")
                self.assertEqual(self.tab.title, "Device")

    def test_markup_in_the_providers_reason(self):
        self.device.provider.script = Script(refuse={"error": MARKUP[:90]})
        self.to_provider("azure")
        self.assert_refused_here("provider-error", "provider refused")
        self.assertIn(f", error {MARKUP[:90]}:", self.logged("sign-in failed")[-1])
        self.assertNotIn("owned", self.tab.text)

    def test_markup_in_the_users_name(self):
        self.device.provider.script = Script(claims=lambda claims: {**claims, "sub": MARKUP})
        self.sign_in("websphere")
        self.on("/index.cgi")
        self.assertEqual(self.tab.find("#user").text, MARKUP)
        self.assertEqual(self.tab.title, "Device")

    def test_policy_of_the_relay_page(self):
        """The page would not run a script that got into it, and this test would see one tried."""
        self.tab.open(self.relay_url + "#success=false")
        self.tab.script("""
            const inline = document.createElement("script");
            inline.textContent = "document.title = 'owned'";
            document.body.append(inline);
            const image = document.createElement("img");
            image.src = arguments[0];
            document.body.append(image);""", self.device.provider.url + "/image.png")
        seen = []
        self.tab.wait(lambda: seen.extend(self.tab.complaints()) or len(seen) > 1, "two violations")
        self.assertIn("inline script violates", seen[0])
        self.assertIn("/image.png' violates", seen[1])
        self.assertEqual(self.tab.title, "Not signed in")
        self.assertNotIn("/image.png", [path for _, path, _, _ in self.device.provider.seen])

    def test_no_frame(self):
        """Nobody lays a page of the device under his own page."""
        self.tab.open(self.device.provider.url + "/websphere/logout")
        self.tab.script("""
            const frame = document.createElement("iframe");
            frame.src = arguments[0];
            document.body.append(frame);""", self.device.front_url)
        self.tab.wait(lambda: [text for text in self.tab.complaints() if "frame" in text.lower()],
                      "the browser's refusal")


if __name__ == "__main__":
    unittest.main()
