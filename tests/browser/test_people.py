"""An honest person's whole road in the browser, with each provider."""

import time
import unittest

from device import device
from providers.entra import Entra
from providers.glewlwyd import Glewlwyd
from providers.lemonldap import LemonLDAP
from providers.liberty import Liberty
from scenario import Scenario

PHONE = {"width": 320, "height": 568, "deviceScaleFactor": 2, "mobile": True}


class Road:
    """From the device's page to the provider's, in, back to the origin, out, and up to the
    password of the next sign-in."""
    key_by_key = True

    def road(self, profile):
        self.assertIsNone(self.user_shown())
        self.sign_in(profile)
        self.assert_in(profile)
        self.sign_out()
        if self.device.provider.comes_back:
            self.assert_out()
        else:
            self.tab.wait(lambda: self.device.provider.goodbye in self.tab.text,
                          "the provider's last page")
            self.assert_nobody()
        self.to_provider(profile)
        self.tab.find(self.device.provider.fields[1])

    def test_azure(self):
        self.road("azure")

    def test_websphere(self):
        self.road("websphere")


class OnScripted(Road, Scenario):
    pass


class Visited(Road):
    """With a provider that was not written for these tests."""
    provider = None

    @classmethod
    def setUpClass(cls):
        device().visit(cls.provider)

    @classmethod
    def tearDownClass(cls):
        device().come_home()


class OnGlewlwyd(Visited, Scenario):
    provider = Glewlwyd


class OnLemonLDAP(Visited, Scenario):
    provider = LemonLDAP


class OnEntra(Visited, Scenario):
    provider = Entra
    test_websphere = None

    def test_azure_v1(self):
        self.device.register("azure v1.0")
        self.addCleanup(self.device.register, "azure v2.0")
        self.road("azure")


class OnLiberty(Visited, Scenario):
    provider = Liberty
    test_azure = None


class AtThePage(Scenario):
    def test_wrong_password_first(self):
        self.to_provider("azure")
        self.enter(password="wrong")
        self.tab.wait(lambda: "Wrong name or password." in self.tab.text, "the provider's no")
        self.enter()
        self.assert_in("azure")

    def test_nobody_after_a_wrong_password(self):
        self.to_provider("websphere")
        self.enter(password="wrong")
        self.tab.wait(lambda: "Wrong name or password." in self.tab.text, "the provider's no")
        self.assert_nobody()

    def test_back_to_where_it_began(self):
        self.device.choose("azure")
        self.tab.open(self.device.login_url + "?action=start&origin=/index.cgi%3Fpage%3D2%26x%3D%2520")
        self.enter()
        self.assert_in("azure", "/index.cgi?page=2&x=%20")

    def test_twice_in_a_row(self):
        for profile in ("azure", "websphere"):
            self.sign_in(profile)
            self.assert_in(profile)
            self.sign_out()
            self.assert_out()

    def test_back_button_after_the_logout(self):
        """What was shown to the person is not shown to the next one at the same screen."""
        self.sign_in("websphere")
        self.assert_in("websphere")
        self.sign_out()
        self.assert_out()
        self.sign_in("websphere")
        self.assert_in("websphere")
        self.sign_out()
        self.tab.wait(lambda: self.tab.title == "Signed out", "the relay page")
        for _ in range(4):
            self.tab.driver.back()
            self.assertNotIn("Signed in as", self.tab.text)

    def test_two_tabs(self):
        """One login at a time: the first of two is refused, and uses up the second."""
        self.to_provider("websphere")
        first = self.tab.driver.current_window_handle
        self.tab.find("#password")
        self.tab.driver.switch_to.new_window("tab")
        self.to_provider("websphere")
        second = self.tab.driver.current_window_handle
        self.tab.driver.switch_to.window(first)
        self.enter()
        self.assert_refused_here("state does not belong to this login")
        self.tab.driver.switch_to.window(second)
        self.enter()
        self.assert_refused_here("login was not started in this browser, or is used up")

    # -- keyboard, phone, no scripts -------------------------------------------------------

    def focused(self):
        """The element that has the focus; a person can see that it has."""
        shown = self.tab.script("const style = getComputedStyle(document.activeElement);"
                                "return style.outlineStyle !== 'none' && style.outlineWidth")
        self.assertNotIn(shown, (False, "0px"))
        return self.tab.script("return document.activeElement.id || "
                               "document.activeElement.closest('[id]').id")

    def test_by_keyboard_alone(self):
        self.device.choose("azure")
        self.tab.open(self.device.front_url)
        self.tab.press("TAB")
        self.assertEqual(self.focused(), "sign-in")
        self.tab.press("ENTER")
        self.tab.find("#password")
        person = self.device.person
        self.tab.press(person.account, "TAB", person.password, "ENTER")
        self.assert_in("azure")
        self.tab.press("TAB")
        self.assertEqual(self.focused(), "sign-out")
        self.tab.press("ENTER")
        self.tab.wait(lambda: self.tab.title == "Signed out", "the relay page after the logout")
        self.assertEqual(self.focused(), "onward")
        self.tab.press("ENTER")
        self.on("/")
        self.assert_nobody()

    def test_refusal_by_keyboard(self):
        self.tab.open(self.relay_url + "#success=false&reason=no")
        self.assertEqual(self.focused(), "onward")
        self.tab.press("ENTER")
        self.on("/")

    def test_on_a_phone(self):
        self.tab.command("Emulation.setDeviceMetricsOverride", **PHONE)
        self.addCleanup(self.tab.command, "Emulation.clearDeviceMetricsOverride")
        for path in ("/index.cgi", "/webman/ssoclient/relay.html",
                     "/webman/ssoclient/relay.html#success=false&reason=" + "W" * 120,
                     "/webman/ssoclient/relay.html#success=false&reason=" + "long words " * 40):
            with self.subTest(path=path):
                self.tab.open("about:blank")
                self.tab.open(self.device.stage.device + path)
                self.fits()
        self.sign_in("azure")
        self.assert_in("azure")
        self.fits()

    def fits(self):
        """Nothing to scroll sideways; text and buttons are large enough."""
        wide, high, size = self.tab.script(
            "return [document.documentElement.scrollWidth, "
            "document.querySelector('.button').offsetHeight, "
            "parseFloat(getComputedStyle(document.body).fontSize)]")
        self.assertLessEqual(wide, PHONE["width"])
        self.assertGreaterEqual(high, 44)
        self.assertGreaterEqual(size, 16)

    def test_without_scripts(self):
        self.tab.command("Emulation.setScriptExecutionDisabled", value=True)
        try:
            self.tab.open(self.relay_url + "#success=true&origin=/index.cgi")
            text = self.tab.driver.find_element("css selector", "main").text
            self.assertIn("This page needs scripts to tell how the sign-in ended.", text)
            self.tab.driver.find_element("css selector", "#onward").click()
            self.on("/")
        finally:
            self.tab.command("Emulation.setScriptExecutionDisabled", value=False)

    def test_a_person_may_go_on_at_once(self):
        begun = time.monotonic()
        self.tab.open(self.relay_url + "#success=true&origin=/index.cgi")
        self.tab.press("ENTER")
        self.on("/index.cgi")
        self.assertLess(time.monotonic() - begun, 30)


if __name__ == "__main__":
    unittest.main()
