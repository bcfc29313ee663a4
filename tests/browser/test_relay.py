"""The relay page, with whatever its address may hold: outcomes, languages, links of attackers."""

import json
import random
import re
import unittest
import urllib.parse

from device import EXPECTED, HERE
from providers.scripted import Script
from scenario import ENGLISH, TEXTS, Scenario

START = "/webman/login.cgi?action=start"
LANGUAGES = {"en": "en-US,en", "de": "de-AT,de"}
REFERENCE = "K7Q2M9XB"
with open(HERE + "/origins.json", encoding="utf-8") as _file:
    ORIGINS = json.load(_file)


def fragment(**values):
    return "#" + urllib.parse.urlencode(values)


def sentences(words):
    """Everything that the table of a language can say."""
    for value in words.values():
        if isinstance(value, dict):
            yield from sentences(value)
        elif isinstance(value, list):
            yield from value
        else:
            yield value


class Relay(Scenario):
    def show(self, text):
        self.tab.open("about:blank")
        self.tab.open(self.relay_url + text)

    def change(self, text):
        """Another fragment in the page that is open; returns when the page has shown it."""
        self.tab.script("""
            return new Promise((go) => {
              addEventListener("hashchange", () => go(), {once: true});
              location.hash = arguments[0];
            });""", text)

    def target(self, link="#onward"):
        """Where a link of the page leads."""
        return self.tab.script("return document.querySelector(arguments[0]).href", link)

    def own(self, path):
        """The address of a page of the device, as the browser writes it."""
        return self.tab.script("return new URL(arguments[0], location.origin).href", path)


class Outcomes(Relay):
    def test_every_code_in_every_language(self):
        for language, accepted in LANGUAGES.items():
            self.tab.open(self.device.front_url)
            self.tab.speak(accepted)
            words = TEXTS[language]
            for code in set(words["failures"]) - {"sign-out-refused"}:
                with self.subTest(language=language, code=code):
                    self.show(fragment(reason=f"{code}.{REFERENCE}", success="false"))
                    self.assert_refusal_shown(code, words)
                    self.assertEqual(self.tab.find("#reference").text,
                                     words["reference"].replace("{reference}", REFERENCE))
                    self.assertEqual(self.language(), [language, words["direction"]])

    def language(self):
        return self.tab.script("const {lang, dir} = document.documentElement; return [lang, dir]")

    def test_refused_sign_out(self):
        for language, accepted in LANGUAGES.items():
            with self.subTest(language=language):
                self.tab.open(self.device.front_url)
                self.tab.speak(accepted)
                words = TEXTS[language]
                self.show(fragment(reason="sign-out-refused." + REFERENCE, success="false"))
                self.assertEqual(self.tab.title, words["not-signed-out"])
                self.assertEqual(self.tab.find("#reason").text,
                                 words["failures"]["sign-out-refused"][0])
                self.assertEqual(self.tab.all("#again"), [])
                self.assertEqual(self.target(), self.own("/"))

    def test_other_outcomes_in_every_language(self):
        for language, accepted in LANGUAGES.items():
            with self.subTest(language=language):
                self.tab.open(self.device.front_url)
                self.tab.speak(accepted)
                words = TEXTS[language]
                self.show("")
                self.assertEqual(self.tab.title, words["signed-out"])
                self.assertEqual(self.tab.find("#reason").text, words["signed-out-text"])
                self.show("#success=true")
                self.assertEqual(self.tab.relay()[-1]["text"].split("\n")[1], words["signed-in"])

    def test_language_that_there_is_no_text_in(self):
        for accepted, expected in (("fr-FR,fr,de", "de"), ("fr,ja", "en"), ("constructor", "en"),
                                   ("DE-ch", "de"), ("toString,en,de", "en")):
            with self.subTest(accepted=accepted):
                self.tab.open(self.device.front_url)
                self.tab.speak(accepted)
                self.assertEqual(self.language()[0], expected)
                self.show("#success=false")
                self.assertEqual(self.language()[0], expected)
                self.assertEqual(self.tab.title, TEXTS[expected]["not-signed-in"])

    def test_other_outcomes(self):
        """Whatever is in the fragment, no user is signed in by it."""
        for text in ("", "#", "#%", "#origin=/index.cgi", "#success", "#_=_"):
            with self.subTest(fragment=text):
                self.show(text)
                expected = "not-signed-in" if text == "#success" else "signed-out"
                self.assertEqual(self.tab.find("#outcome").text, ENGLISH[expected])
        for text in ("#success=maybe", "#success=TRUE", "#success=", "#success=false&success=true"):
            with self.subTest(fragment=text):
                self.show(text)
                self.assert_refusal_shown()
        self.assert_nobody()

    def test_try_again_keeps_the_origin(self):
        self.show(fragment(reason="expired." + REFERENCE, success="false",
                           origin="/index.cgi?page=2&x=%20"))
        self.assertEqual(self.target("#again"),
                         self.own(START + "&origin=%2Findex.cgi%3Fpage%3D2%26x%3D%2520"))
        self.device.choose("azure")
        self.tab.click("#again")
        self.enter()
        self.assert_in("azure", "/index.cgi?page=2&x=%20")

    def test_try_again_without_an_origin(self):
        self.show(fragment(reason="expired." + REFERENCE, success="false", origin="//["))
        self.assertEqual(self.target("#again"), self.own(START))


class Coming(Relay):
    """The page is shown again, or with another fragment."""

    def test_another_fragment(self):
        self.show("#success=false")
        self.assert_refusal_shown()
        self.change("reason=busy.22223333&success=false")
        self.assert_refusal_shown("busy")
        self.tab.driver.back()
        self.tab.wait(lambda: self.tab.find("#reason").text == ENGLISH["general"][0], "the first")
        self.assertEqual(self.tab.all("#reference"), [])
        self.change("")
        self.assertEqual(self.tab.title, ENGLISH["signed-out"])
        self.change("success=true&origin=/index.cgi%3Fa")
        self.on("/index.cgi?a")

    def test_a_changed_fragment_stops_the_clock(self):
        self.show("#success=true&origin=/index.cgi")
        self.change("success=false")
        self.stays()
        self.assert_refusal_shown()

    def stays(self):
        """The page does not go on by itself, although there is time for it."""
        url = self.tab.url
        self.tab.driver.execute_async_script("setTimeout(arguments[0], 2500)")
        self.assertEqual(self.tab.url, url)

    def test_a_person_who_comes_back_may_stay(self):
        """As the browser keeps the page, and as it loads it again."""
        for kept in (True, False):
            with self.subTest(kept=kept):
                self.show("#success=true&origin=/index.cgi%3Fa")
                if not kept:  # a page that another window may reach is not kept
                    self.tab.script("window.open('about:blank')")
                self.tab.script("window.before = true")
                self.tab.click("#onward")
                self.on("/index.cgi?a")
                self.tab.driver.back()
                self.tab.wait(lambda: self.tab.title == ENGLISH["signed-in"], "the relay page")
                self.assertEqual(self.tab.script("return window.before === true"), kept)
                self.stays()
                self.assertEqual(self.tab.all("#reason"), [])
                self.tab.click("#onward")
                self.on("/index.cgi?a")

    def test_not_in_the_history(self):
        """Who goes back from the origin does not meet the relay page again."""
        self.tab.open(self.device.front_url + "?before")
        self.tab.open(self.relay_url + "#success=true&origin=/index.cgi%3Fafter")
        self.on("/index.cgi?after")
        self.tab.driver.back()
        self.on("/index.cgi?before")


class Origins(Relay):
    def test_origins_of_a_success(self):
        """The table is also the login program's."""
        self.show("")
        for origin in ORIGINS["own"]:
            with self.subTest(origin=origin):
                self.change(fragment(success="true", origin=origin))
                self.assertEqual(self.target(), self.own(origin))
        for origin in ORIGINS["foreign"]:
            with self.subTest(origin=origin):
                self.change(fragment(success="true", origin=origin))
                self.assertEqual(self.tab.title, ENGLISH["signed-in"])
                self.assertEqual(self.target(), self.own("/"))

    def test_origins_of_a_failure(self):
        self.show("")
        for kind, origins in ORIGINS.items():
            for origin in origins:
                with self.subTest(origin=origin):
                    self.change(fragment(success="false", origin=origin))
                    again = START + "&origin=" + urllib.parse.quote(origin, safe="!'()*~")
                    self.assertEqual(self.target("#again"),
                                     self.own(again if kind == "own" else START))

    def test_goes_on_to_a_page_with_every_sign(self):
        origin = "/index.cgi?a:b,c(d)+e@f;g[h]!i*j$k#l'm"
        self.show(fragment(success="true", origin=origin))
        self.on(origin)


class Hostile(Relay):
    """Links of attackers: no word of them is shown, nothing runs, nobody is led away."""

    PIECES = (
        "Your account was locked. Call +1 900 555 0100", "<img src=x onerror=alert(1)>", "<script>",
        "javascript:alert(1)", "//other.example.org/", "https://other.example.org", "//[", "%", "%00",
        "%zz", "&", "=", "#", "?", "\\", "\u202e", "\ud83d\ude00", "\u0000", "success", "true", "false",
        "origin", "reason", "expired", ".", REFERENCE, "CALLME99", "5550100", "__proto__",
        "constructor", "toString", "general", "/index.cgi", "/", "'", "\"", "{reference}", "$&", "$'",
        "A" * 300, "data:text/html,<b>", "\r\n", "\t", "[", "]", "..", "%2e%2e", "%2f", "+")
    NAMES = ("success", "success", "reason", "reason", "origin", "origin", "x", "")

    def texts(self):
        known = set(sentences(ENGLISH))
        return known | {ENGLISH["reference"].replace("{reference}", REFERENCE)}

    def generate(self, count):
        chance = random.Random(5)
        for _ in range(count):
            pairs = []
            for _ in range(chance.randint(1, 4)):
                value = "".join(chance.choices(self.PIECES, k=chance.randint(1, 3)))
                if chance.random() < 0.7:
                    value = urllib.parse.quote(value, safe="", errors="surrogatepass")
                pairs.append(chance.choice(self.NAMES) + "=" + value)
            yield "&".join((*pairs, chance.choice(("success=true", "success=false", "x"))))

    def test_generated_fragments(self):
        self.show("")
        before = self.tab.script("return document.querySelectorAll('*').length")
        known, shown = self.texts(), set()
        for text in self.generate(600):
            with self.subTest(fragment=text):
                lines, links, elements, place = self.tab.script(r"""
                    return new Promise((go) => {
                      const look = () => go([
                        [document.title, ...document.body.innerText.split("\n")],
                        [...document.links].map((link) => link.origin + link.pathname),
                        document.querySelectorAll("*").length, location.origin + location.pathname]);
                      const old = location.href;
                      location.hash = arguments[0];
                      // An event comes only if the address has changed.
                      if (location.href === old) look();
                      else addEventListener("hashchange", look, {once: true});
                    });""", text)
                shown.update(lines)
                self.assertEqual(set(lines) - known - {""}, set())
                self.assertEqual({link.rsplit(":8443", 1)[0] for link in links},
                                 {self.device.stage.device.rsplit(":8443", 1)[0]})
                self.assertEqual((elements, place), (before, self.relay_url))
        # The fragments were not all refused alike.
        self.assertTrue({ENGLISH["signed-in"], ENGLISH["not-signed-in"],
                         ENGLISH["general"][0]} <= shown, shown)

    def test_reason_that_is_not_a_code(self):
        for reason in ("no", "Your account was locked", "expired", "expired.", ".K7Q2M9XB",
                       "expired.k7q2m9xb", "expired.K7Q2M9X", "expired.K7Q2M9XBB", "expired.CALLME99",
                       "EXPIRED.K7Q2M9XB", "expired.K7Q2M9XB.", " expired.K7Q2M9XB",
                       "expired.K7Q2M9XB\n", "x" * 33 + ".K7Q2M9XB", "expired.K7Q2M9X\u0412"):
            with self.subTest(reason=reason):
                self.show(fragment(reason=reason, success="false"))
                self.assert_refusal_shown()
                self.assertEqual(self.tab.all("#reference"), [])

    def test_code_that_there_is_no_sentence_for(self):
        for code in ("unknown", "constructor", "general", "device", "-", "to-string"):
            with self.subTest(code=code):
                self.show(fragment(reason=f"{code}.{REFERENCE}", success="false"))
                self.assert_refusal_shown()
                self.assertIn(REFERENCE, self.tab.find("#reference").text)


class WithoutScripts(Relay):
    def setUp(self):
        super().setUp()
        self.tab.command("Emulation.setScriptExecutionDisabled", value=True)
        self.addCleanup(self.tab.command, "Emulation.setScriptExecutionDisabled", value=False)

    def test_relay_page_leads_to_the_front_page(self):
        self.tab.open(self.relay_url + "#success=true&origin=/index.cgi")
        self.on("/")
        self.assertEqual(self.tab.find("h1").text, ENGLISH["sign-in"])

    def test_signs_in_and_out(self):
        for profile in ("azure", "websphere"):
            with self.subTest(profile=profile):
                self.sign_in(profile)
                self.on("/")
                self.assertEqual(self.tab.find("#user").text, EXPECTED[profile])
                self.sign_out()
                self.on("/")
                self.assert_nobody()

    def test_refusal(self):
        for profile in ("azure", "websphere"):
            with self.subTest(profile=profile):
                self.device.provider.script = Script(refuse={"error": "access_denied"})
                self.to_provider(profile)
                self.on("/")
                self.assertEqual(self.tab.find("h1").text, ENGLISH["not-signed-in"])
                self.assertEqual([self.tab.find("#reason").text, self.tab.find("#help").text],
                                 ENGLISH["failures"]["denied"])
                reference = self.tab.find("#reference").text.split()[-1]
                self.assertEqual(len(self.logged(f"sign-in failed [{reference}]: denied, ")), 1)


class Texts(unittest.TestCase):
    def keys(self, words):
        return {name: self.keys(value) if isinstance(value, dict) else type(value)
                for name, value in words.items()}

    def test_no_language_lacks_a_text(self):
        self.assertGreaterEqual(set(TEXTS), {"en", "de"})
        for language, words in TEXTS.items():
            with self.subTest(language=language):
                self.assertEqual(self.keys(words), self.keys(ENGLISH))
                self.assertTrue(all(text.strip() == text != "" for text in sentences(words)))
                for text in ("provider", "user", "time", "reference"):
                    self.assertEqual(self.slots(words, text), self.slots(ENGLISH, text))

    def slots(self, words, name):
        return [key for key, text in words.items() if f"{{{name}}}" in text]

    def test_every_code_has_a_sentence(self):
        path = HERE + "/../../device/login/failure.h"
        with open(path, encoding="utf-8") as file:
            names = re.search(r"kFailureNames\[\] = \{(.*?)\}", file.read(), re.S).group(1)
        codes = set(re.findall(r'"([a-z-]+)"', names))
        self.assertGreater(len(codes), 10)
        for language, words in TEXTS.items():
            with self.subTest(language=language):
                self.assertEqual(set(words["failures"]), codes)


if __name__ == "__main__":
    unittest.main()
