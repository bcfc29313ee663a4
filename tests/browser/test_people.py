"""What an honest person does in the browser, from beginning to end, with each provider."""

import time
import unittest

from selenium import webdriver

from device import device
from providers.entra import Entra
from providers.glewlwyd import Glewlwyd
from providers.lemonldap import LemonLDAP
from providers.liberty import Liberty
from scenario import Scenario


class Visit:
    """From the device's page to the provider's, in, back to the origin, out, and up to the
    password of the next sign-in."""
    key_by_key = True

    def visit(self, profile):
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
        self.visit("azure")

    def test_websphere(self):
        self.visit("websphere")


class OnScripted(Visit, Scenario):
    pass


class Visited(Visit):
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
        self.visit("azure")


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
        """Each login has its own cookie: both sign in, in the other order."""
        self.to_provider("websphere")
        first = self.tab.driver.current_window_handle
        self.tab.find("#password")
        self.tab.driver.switch_to.new_window("tab")
        self.to_provider("websphere")
        self.enter()
        self.on("/index.cgi")
        self.assertEqual(self.tab.find("#user").text, "alice")
        self.tab.driver.switch_to.window(first)
        self.enter()
        self.on("/index.cgi")
        self.assertEqual(self.tab.find("#user").text, "alice")
        self.assertEqual(len(self.sessions()), 1)

    def test_impatient_click(self):
        """A double click starts two logins; the second one is the one that counts."""
        self.device.choose("websphere")
        self.tab.open(self.device.front_url)
        webdriver.ActionChains(self.tab.driver).double_click(self.tab.find("#sign-in")).perform()
        self.enter()
        self.assert_in("websphere")

    # -- keyboard -----------------------------------------------------------------------------

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
        self.assertEqual(self.focused(), "again")
        self.tab.press("TAB")
        self.assertEqual(self.focused(), "onward")
        self.tab.press("ENTER")
        self.on("/")

    def test_a_person_may_go_on_at_once(self):
        begun = time.monotonic()
        self.tab.open(self.relay_url + "#success=true&origin=/index.cgi")
        self.tab.press("ENTER")
        self.on("/index.cgi")
        self.assertLess(time.monotonic() - begun, 30)


if __name__ == "__main__":
    unittest.main()
