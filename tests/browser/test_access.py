"""Every page for everyone: by keyboard, on a phone, in the dark, with large text, to the right."""

import os
import secrets
import unittest
import urllib.parse

from device import EXPECTED
from access import cut, findings
from scenario import ENGLISH, TEXTS, Scenario
from stage import WWW, write

PHONE = {"width": 320, "height": 568, "deviceScaleFactor": 2, "mobile": True}
DESK = {"width": 1280, "height": 800, "deviceScaleFactor": 1, "mobile": False}
FAILED = "#success=false&reason=provider-error.K7Q2M9XB&origin=/index.cgi"


class Pages(Scenario):
    """Each test goes through all pages; the last one is the front page of a signed-in user."""

    def setUp(self):
        super().setUp()
        self.addCleanup(self.tab.command, "Emulation.clearDeviceMetricsOverride")
        self.addCleanup(self.tab.command, "Emulation.setEmulatedMedia", media="")

    def media(self, **features):
        self.tab.command("Emulation.setEmulatedMedia", features=[
            {"name": name.replace("_", "-"), "value": value} for name, value in features.items()])

    def pages(self):
        for text in ("", FAILED, "#success=false", "#success=false&reason=sign-out-refused.22223333",
                     "#success=true&origin=/index.cgi"):
            self.tab.open("about:blank")
            self.tab.open(self.relay_url + text)
            yield "relay" + text
        self.tab.open(self.device.front_url)
        yield "front"
        self.cookie("__Host-outcome", "timeout.K7Q2M9XB")
        self.tab.open(self.device.front_url)
        yield "front with an outcome"
        self.cookie("__Host-session", "0" * 64)
        self.tab.open(self.device.front_url)
        yield "front after the session"
        self.sign_in("azure")
        self.on("/index.cgi")
        self.assertEqual(self.tab.find("#user").text, EXPECTED["azure"])
        yield "front with a user"

    def cookie(self, name, value):
        self.tab.driver.add_cookie({"name": name, "value": value, "path": "/", "secure": True,
                                    "httpOnly": True, "sameSite": "Lax"})

    def each(self, check):
        count = 0
        for name in self.pages():
            with self.subTest(page=name):
                check()
            count += 1
        self.assertEqual(count, 9)

    def no_findings(self):
        self.assertEqual(findings(self.tab), [])

    # -- the rules ---------------------------------------------------------------------------

    def test_findings(self):
        self.each(self.no_findings)

    def test_findings_in_dark_mode_on_a_phone(self):
        self.media(prefers_color_scheme="dark")
        self.tab.command("Emulation.setDeviceMetricsOverride", **PHONE)
        self.each(self.no_findings)
        self.assertLess(sum(self.background()), 3 * 64)

    def test_findings_in_light_mode(self):
        self.media(prefers_color_scheme="light")
        self.each(self.no_findings)
        self.assertGreater(sum(self.background()), 3 * 192)

    def background(self):
        return self.tab.script("return getComputedStyle(document.body).backgroundColor"
                               ".match(/[0-9]+/g).map(Number)")

    def test_the_rules_find_what_they_are_for(self):
        self.tab.open(self.device.front_url)
        for rule, fault in (
                ("document-title", "document.title = ''"),
                ("html-has-lang", "document.documentElement.lang = ''"),
                ("meta-viewport", "document.querySelector('meta[name=viewport]').content = "
                                  "'maximum-scale=1'"),
                ("landmark-one-main", "document.querySelector('main').remove()"),
                ("one-h1", "document.querySelector('h1').remove()"),
                ("duplicate-id", "document.querySelector('h1').id = 'sign-in'"),
                ("image-alt", "document.querySelector('img').removeAttribute('alt')"),
                ("image-name", "document.querySelector('img').removeAttribute('alt')"),
                ("link-name", "document.querySelector('#sign-in').textContent = ''"),
                ("heading-name", "document.querySelector('h1').innerHTML = '<img alt>'"),
                ("tabindex", "document.querySelector('#sign-in').tabIndex = 1"),
                ("label", "document.querySelector('main').append("
                          "document.createElement('input'))"),
                ("target-size", "document.querySelector('#sign-in').style.cssText = "
                                "'min-height: 0; padding: 0'"),
                ("link-in-text-block", "document.querySelector('#sign-in').className = '';"
                                       "document.querySelector('#sign-in').style.textDecoration ="
                                       "'none'"),
                ("color-contrast", "document.querySelector('p').style.color = '#999'"),
                ("region", "document.body.append('words')"),
                ("aria-roles", "document.querySelector('p').role = 'butler'"),
                ("aria-valid-attr-value", "document.querySelector('p').setAttribute("
                                          "'aria-describedby', 'nothing')"),
                ("focus-visible", "document.querySelector('#sign-in').focus();"
                                  "document.querySelector('#sign-in').style.outline = 'none'"),
                ("focus-contrast", "document.querySelector('#sign-in').focus();"
                                   "document.querySelector('#sign-in').style.outline = "
                                   "'3px solid #eee'")):
            with self.subTest(rule=rule):
                self.tab.driver.refresh()
                self.assertEqual(findings(self.tab), [])
                self.tab.press("TAB")
                self.tab.script(fault)
                self.assertIn(rule, {found.split(":")[0] for found in findings(self.tab)})

    # -- sizes and directions ------------------------------------------------------------------

    def test_on_a_phone(self):
        self.tab.command("Emulation.setDeviceMetricsOverride", **PHONE)
        self.each(self.fits)

    def fits(self):
        self.assertEqual(cut(self.tab), [])
        self.assertLessEqual(self.tab.script("return document.documentElement.scrollWidth"),
                             self.tab.script("return innerWidth"))
        self.assertGreaterEqual(self.tab.script(
            "return parseFloat(getComputedStyle(document.body).fontSize)"), 16)

    def test_text_of_twice_the_size(self):
        for screen in (PHONE, DESK):
            self.tab.command("Emulation.setDeviceMetricsOverride", **screen)
            self.each(self.fits_twice)

    def fits_twice(self):
        before = self.tab.find("h1").size["height"]
        self.tab.script("document.documentElement.style.fontSize = '200%'")
        self.assertGreater(self.tab.find("h1").size["height"], before)
        self.fits()

    def test_from_right_to_left(self):
        self.tab.command("Emulation.setDeviceMetricsOverride", **PHONE)
        self.each(self.mirrored)

    def mirrored(self):
        self.tab.script("document.documentElement.dir = 'rtl'")
        self.fits()
        logo, name = self.tab.script(
            "return [...document.querySelector('.brand').children].map("
            "(part) => part.getBoundingClientRect().left)")
        self.assertGreater(logo, name)

    def test_a_long_name_and_a_long_user(self):
        self.tab.command("Emulation.setDeviceMetricsOverride", **PHONE)
        self.tab.open(self.device.front_url)
        for selector in (".brand span", "h1", "p", "#sign-in"):
            self.tab.script("document.querySelector(arguments[0]).textContent = 'W'.repeat(256)",
                            selector)
            self.fits()

    # -- while the device asks the provider ------------------------------------------------------

    def waiting(self, accepted):
        """The page that is shown during an exchange, in that language, without going on."""
        page = self.browser.get(self.callback_url(), {
            "Sec-Fetch-Dest": "document", "Accept-Language": accepted})
        self.assertEqual(page.status, 200)
        self.assertEqual(page.headers["Refresh"], "0; url=" + urllib.parse.urlsplit(
            page.url)._replace(scheme="", netloc="").geturl() + "&go=1")
        self.assertIn("default-src 'none'; style-src 'self'; img-src 'self'; base-uri 'none'",
                      page.headers["Content-Security-Policy"])
        name = f"/waiting-{secrets.token_hex(4)}.html"  # server and browser keep what they know
        write(WWW + name, page.body)
        self.tab.open(self.device.stage.device + name)
        os.unlink(WWW + name)

    def test_page_of_the_exchange(self):
        """It is as good as the others, and something moves on it if the person likes that."""
        for accepted, expected in (("de-DE,de;q=0.9", "de"), ("en", "en")):
            for colours in ("light", "dark"):
                with self.subTest(language=expected, colours=colours):
                    self.media(prefers_color_scheme=colours)
                    self.waiting(accepted)
                    self.assertEqual(self.tab.title, TEXTS[expected]["waiting"])
                    self.no_findings()
                    self.assertEqual(self.moving(), 1)
                    self.media(prefers_color_scheme=colours, prefers_reduced_motion="reduce")
                    self.assertEqual(self.moving(), 0)
                    self.tab.command("Emulation.setDeviceMetricsOverride", **PHONE)
                    self.fits_twice()

    def moving(self):
        return self.tab.script("return document.getAnimations().length")

    # -- languages, keyboard -------------------------------------------------------------------

    def test_head_of_the_front_page(self):
        page = self.browser.get(self.device.front_url)
        self.assertEqual(page.headers.get_all("Content-Security-Policy")[0],
                         "default-src 'none'; style-src 'self'; img-src 'self'; base-uri 'none'; "
                         "form-action 'self' https:; frame-ancestors 'none'")
        self.assertEqual(page.headers["Cache-Control"], "no-store")
        self.assertEqual(set(page.headers.get_all("Referrer-Policy")), {"same-origin"})
        self.assertNotRegex(page.body, "<script|<style|style=| on[a-z]+=")

    def test_front_page_in_every_language(self):
        """What its programs choose is what the relay page's script would."""
        for accepted, expected in (("de-AT,de", "de"), ("en-US,en", "en"), ("fr,de,en", "de"),
                                   ("ja", "en"), ("constructor", "en")):
            with self.subTest(accepted=accepted):
                words = TEXTS[expected]
                self.tab.open(self.device.front_url)
                self.tab.speak(accepted)
                self.assertEqual(self.tab.title, words["device"])
                self.assertEqual(self.tab.find("#sign-in").text, words["sign-in-with"].replace(
                    "{provider}", words["provider"]))
                self.assertEqual(self.tab.script("return document.documentElement.lang"), expected)

    def test_weights_of_languages(self):
        for accepted, expected in (
                ("de;q=0.5, en;q=0.4", "de"), ("en;q=0.4,de;q=0.5", "de"), ("de;q=0", "en"),
                ("de;q=0.001", "de"), ("*", "en"), ("", "en"), (",,;q=,-,=", "en"), ("de;q=x,en", "en"),
                ("de;q=1e9", "de"), ("en;q=nan,de", "de"), ("de" + ";" * 4000, "de"), ("DE", "de"),
                ("x," * 2000 + "de", "en"), ("\u00e9,de".encode().decode("latin-1"), "de")):
            with self.subTest(accepted=accepted[:40]):
                page = self.browser.get(self.device.front_url, {"Accept-Language": accepted})
                self.assertEqual(page.status, 200)
                self.assertIn(f'<html lang="{expected}" dir="ltr">', page.body)

    def test_name_of_the_provider(self):
        for name in ("Example ID", "<b>R&D</b> \"ID\"", "{user} $& \u0645\u0632\u0648\u062f"):
            with self.subTest(name=name):
                self.device.options(provider_name=name)
                self.tab.open(self.device.front_url)
                self.assertEqual(self.tab.find("#sign-in").text, "Sign in with " + name)
                self.no_findings()

    def test_outcome_on_the_front_page(self):
        for language, accepted in (("en", "en"), ("de", "de")):
            self.tab.open(self.device.front_url)
            self.tab.speak(accepted)
            words = TEXTS[language]
            for code, (reason, hint) in words["failures"].items():
                with self.subTest(language=language, code=code):
                    self.cookie("__Host-outcome", code + ".K7Q2M9XB")
                    self.tab.open(self.device.front_url)
                    self.assertEqual(self.tab.find("#reason").text, reason)
                    self.assertEqual(self.tab.find("#help").text, hint)
                    self.assertEqual(self.tab.find("#reference").text, words["reference"].replace(
                        "{reference}", "K7Q2M9XB"))
                    self.tab.driver.refresh()
                    self.assertEqual(self.tab.all("#reason"), [])

    def test_outcome_that_is_none(self):
        for value in ("x", "expired", "expired.", "expired.CALLME99", "Expired.K7Q2M9XB",
                      "<b>.K7Q2M9XB", "expired.K7Q2M9XB1", "." + "K7Q2M9XB" * 2):
            with self.subTest(value=value):
                self.tab.open(self.device.front_url)
                self.cookie("__Host-outcome", value)
                self.tab.open(self.device.front_url)
                self.assertEqual(self.tab.all("#reason, #reference"), [])
                self.assertIsNone(self.tab.driver.get_cookie("__Host-outcome"))

    def test_session_that_has_ended(self):
        self.tab.open(self.device.front_url)
        self.cookie("__Host-session", "0" * 64)
        self.tab.driver.refresh()
        self.assertIn(ENGLISH["session-ended"], self.tab.text)
        self.tab.driver.refresh()
        self.assertIn(ENGLISH["no-user"], self.tab.text)

    def test_keys_reach_every_button(self):
        def reach():
            wanted = {node.text for node in self.tab.all("a, button")}
            reached = set()
            for _ in range(len(wanted) + 2):
                self.tab.press("TAB")
                self.assertEqual(findings(self.tab), [])  # the focus among others
                reached.add(self.tab.driver.switch_to.active_element.text)
            self.assertLessEqual(wanted, reached)
        self.each(reach)


if __name__ == "__main__":
    unittest.main()
