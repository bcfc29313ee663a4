"""What the login program does for an honest user, and against everyone else."""

import base64
import concurrent.futures
import hashlib
import hmac
import json
import os
import re
import socket
import subprocess
import threading
import time
import unittest
import urllib.parse

from device import EXPECTED, HERE, LIBEXEC, LOGIN, STORE, DeviceTest, Launched, values_of
from providers.scripted import Script
from servers import Apache, Busybox, Lighttpd, Nginx

with open(HERE + "/origins.json", encoding="utf-8") as _file:
    ORIGINS = json.load(_file)  # the relay page's tests have the same ones


def state_of(url):
    return json.loads(base64.b64decode(values_of(url)["state"]))


def with_state(url, change):
    """The URL with another state."""
    parts = urllib.parse.urlsplit(url)
    values = dict(urllib.parse.parse_qsl(parts.query))
    state = json.loads(base64.b64decode(values["state"]))
    values["state"] = base64.b64encode(json.dumps(change(state)).encode()).decode()
    return parts._replace(query=urllib.parse.urlencode(values)).geturl()


class Start(DeviceTest):
    def test_cookie_and_state_belong_together(self):
        page = self.start()
        name, value, *attributes = re.split("[=;] ?", page.headers["Set-Cookie"])
        state = state_of(page.location)
        self.assertRegex(state["binding"], "^[0-9a-f]{16}$")
        self.assertEqual(name, "__Host-login-" + state["binding"])
        self.assertRegex(value, "^[0-9]{10}-[0-9a-f]{64}$")
        self.assertEqual(attributes, ["Path", "/", "Secure", "HttpOnly", "SameSite", "Lax",
                                      "Max-Age", "600"])
        self.assertEqual(state["origin"], "/index.cgi")

    def test_seal(self):
        """An HMAC of name, time and state, under the key that only root can read."""
        page = self.start()
        name, value = re.match("__Host-login-([^=]*)=([^;]*);", page.headers["Set-Cookie"]).groups()
        made, seal = value.split("-")
        with open(STORE + "/key", "rb") as file:
            key = file.read()
        self.assertEqual(len(key), 32)
        text = f"login {name} {made} {values_of(page.location)['state']}"
        self.assertEqual(seal, hmac.new(key, text.encode(), hashlib.sha256).hexdigest())

    def test_every_login_has_a_cookie_and_a_state_of_its_own(self):
        first, second = self.start(), self.start()
        self.assertNotEqual(first.headers["Set-Cookie"], second.headers["Set-Cookie"])
        self.assertNotEqual(values_of(first.location)["nonce"],
                            values_of(second.location)["nonce"])

    def test_goes_to_the_chosen_provider(self):
        for profile in ("azure", "websphere"):
            self.device.choose(profile)
            self.assertIn(f"/{profile}/authorization?client_id=device-{profile}&",
                          self.start().location)

    def test_foreign_origin_is_dropped(self):
        """Without a web server, which would refuse control characters itself."""
        for origin in (*ORIGINS["foreign"], "/" + "a" * 256, "/a\r\nSet-Cookie: x=y\n\n"):
            with self.subTest(origin=origin):
                out = self.run_program(urllib.parse.urlencode({"action": "start", "origin": origin}))
                location = re.fullmatch("Status: 302 Found\nCache-Control: no-store\n"
                                        "Set-Cookie: __Host-login-[^\n]*\nLocation: ([^\n]*)\n\n",
                                        out)
                self.assertIsNotNone(location, out)
                self.assertNotIn("origin", state_of(location[1]))

    def test_own_origin_is_kept(self):
        for origin in (*ORIGINS["own"], "/" + "a" * 255):
            with self.subTest(origin=origin):
                self.assertEqual(state_of(self.start(origin=origin).location)["origin"], origin)

    def test_switched_off(self):
        self.device.stage.configure("profile", {"sso_enable": False}, 0o644)
        self.assert_refused(self.start(), "disabled", "sso does not enable.")

    def test_unknown_profile(self):
        self.device.choose("Azure")
        self.assert_refused(self.start(), "not-set-up", "profile not support.")


class Callback(DeviceTest):
    def test_signs_in(self):
        for profile in ("azure", "websphere"):
            with self.subTest(profile=profile):
                self.device.choose(profile)
                self.assert_signed_in(self.sign_in(), profile)
                self.assertTrue(any("signed in: " + EXPECTED[profile] in line
                                    for line in self.log()))
                self.browser = self.new_browser()

    def test_cookie_is_deleted_and_session_opened(self):
        cookies = self.sign_in().headers.get_all("Set-Cookie")
        self.assertEqual(len(cookies), 3)
        self.assertTrue(cookies[1].startswith("__Host-hint=eyJ"))
        self.assertRegex(cookies[0], "^__Host-session=[0-9a-f]{64}; Path=/; Secure; HttpOnly; "
                                     "SameSite=Lax$")
        self.assertRegex(cookies[2], "^__Host-login-[0-9a-f]{16}=; Path=/; Secure; HttpOnly; "
                                     "SameSite=Lax; Max-Age=0$")

    def test_no_cookie(self):
        url = self.callback_url()
        other = self.new_browser()
        self.device.provider.seen.clear()
        self.assert_refused(other.get(url), "expired",
                            "login was not started in this browser, or is used up", browser=other)
        self.assertEqual(self.device.provider.seen, [], "the code was sent to the provider")

    def test_somebody_elses_state(self):
        """Login request forgery: the attacker's code and state in the victim's browser."""
        attackers = self.callback_url()
        victim = self.new_browser()
        self.start(victim)
        self.device.provider.seen.clear()
        self.assert_refused(victim.get(attackers), "expired",
                            "login was not started in this browser, or is used up", browser=victim)
        self.assertEqual(self.device.provider.seen, [])

    def test_stolen_code_in_a_login_of_ones_own(self):
        """Code injection: the victim's code with the attacker's cookie and state."""
        for profile in ("azure", "websphere"):
            with self.subTest(profile=profile):
                self.device.choose(profile)
                code = values_of(self.callback_url())["code"]
                attacker = self.new_browser()
                own = values_of(self.callback_url(attacker))
                url = self.device.login_url + "?" + urllib.parse.urlencode(
                    {"code": code, "state": own["state"]})
                self.assert_refused(attacker.get(url), "not-verified",
                                    "nonce does not belong to this login", browser=attacker)

    def test_stolen_code_and_a_state_made_to_fit(self):
        """The attacker writes the victim's nonce into the state of his own login."""
        victims = self.callback_url()
        attacker = self.new_browser()
        own = self.callback_url(attacker)
        nonce = state_of(victims)["nonce"]
        forged = with_state(own, lambda state: {**state, "nonce": nonce})
        forged = forged.replace("code=" + values_of(own)["code"],
                                "code=" + values_of(victims)["code"])
        self.assert_refused(attacker.get(forged), "expired",
                            "state does not belong to this login", browser=attacker)

    def test_replay(self):
        url = self.callback_url()
        header = self.cookie_header()
        self.assertEqual(self.relay(self.browser.get(url))["success"], "true")
        self.device.provider.seen.clear()
        self.reference(self.new_browser().get(url, header), "expired", "/index.cgi")
        self.assert_logged(": login is used up")
        self.assertEqual(self.device.provider.seen, [])

    def test_ticket_is_used_up_by_a_failed_exchange_too(self):
        url = self.callback_url()
        header = self.cookie_header()
        wrong = re.sub("code=[^&]*", "code=0123456789ABCDEF", url)
        self.reference(self.browser.get(wrong), "provider-error")
        self.reference(self.new_browser().get(url, header), "expired")

    def test_a_foreign_state_uses_nothing_up(self):
        """A page of another site sends the browser to the callback while a person signs in."""
        url = self.callback_url()
        for query in ("", "?code=x", "?code=x&state=x", "?error=access_denied",
                      "?code=x&state=" + values_of(self.callback_url(self.new_browser()))["state"]):
            page = self.browser.get(self.device.login_url + query)
            self.assertNotIn("__Host-login", " ".join(page.headers.get_all("Set-Cookie")))
        spoiled = with_state(url, lambda state: {**state, "origin": "/other"})
        self.reference(self.browser.get(spoiled), "expired", "")
        self.assert_signed_in(self.browser.get(url), "websphere")

    def test_two_tabs(self):
        """Both sign in, whichever comes back first."""
        for order in ((0, 1), (1, 0)):
            with self.subTest(order=order):
                self.browser = self.new_browser()
                urls = [self.callback_url(), self.callback_url(origin="/index.cgi?second")]
                for tab in order:
                    self.assertEqual(self.relay(self.browser.get(urls[tab]))["success"], "true")
                    self.assertEqual(self.user(), EXPECTED["websphere"])

    def test_a_browser_keeps_eight_logins(self):
        """Of many tabs the last eight can sign in; the cookies do not grow without end."""
        urls = [self.callback_url() for _ in range(10)]
        self.assertEqual(len([cookie for cookie in self.browser.cookies
                              if cookie.name.startswith("__Host-login-")]), 8)
        outcomes = [self.relay(self.browser.get(url))["success"] for url in urls]
        self.assertEqual(outcomes.count("true"), 8)
        self.assertEqual(outcomes[-1], "true")

    def test_ticket_expires(self):
        """The seal covers the time: an old ticket is refused, a younger one cannot be written."""
        url = self.callback_url()
        name, value = self.cookie_header()["Cookie"].split("=")
        made, seal = value.split("-")
        for time_text in (int(made) - 601, int(made) + 1, int(made) + 10**6, "", made + "x"):
            page = self.new_browser().get(url, {"Cookie": f"{name}={time_text}-{seal}"})
            self.assert_refused(page, "expired", "state does not belong to this login")

    def test_two_at_once_get_one_session(self):
        """The ticket is taken atomically: of many callbacks at the same time one succeeds."""
        url = self.callback_url()
        header = self.cookie_header()
        browsers = [self.new_browser() for _ in range(8)]
        with concurrent.futures.ThreadPoolExecutor(len(browsers)) as pool:
            pages = pool.map(lambda browser: browser.get(url, header), browsers)
        outcomes = [self.relay(page)["success"] for page in pages]
        self.assertEqual(sorted(outcomes), ["false"] * 7 + ["true"])

    def test_state_altered(self):
        page = self.browser.get(with_state(self.callback_url(),
                                           lambda state: {**state, "origin": "/other"}))
        self.assert_refused(page, "expired", "state does not belong to this login")

    def test_unusable_states(self):
        code = values_of(self.callback_url())["code"]
        for state in ("", "=", "A", "====", "AAAA", "bnVsbA==", "WzFd", "e30=", "%00",
                      base64.b64encode(b"[" * 700).decode(), "A" * 4000, "é",
                      base64.b64encode(b'{"binding":"../../../../x"}').decode()):
            with self.subTest(state=state[:20]):
                url = self.device.login_url + "?" + urllib.parse.urlencode(
                    {"code": code, "state": state})
                self.assert_refused(self.browser.get(url), "expired",
                                    "state does not belong to a login of this device")

    def test_refused_at_the_provider(self):
        self.device.provider.script = Script(refuse={
            "error": "access_denied", "error_description": "The user said no."})
        self.assert_refused(self.sign_in(), "denied", "provider refused",
                            ", error access_denied, error_description The user said no.: ")

    def test_no_code(self):
        state = values_of(self.start().location)["state"]
        page = self.browser.get(self.device.login_url + "?" +
                                urllib.parse.urlencode({"state": state}))
        self.assert_refused(page, "bad-request", "provider sent no code")

    def test_error_with_markup_and_line_breaks(self):
        """A provider's words go to the log, on one line; the browser gets none of them."""
        state = values_of(self.start().location)["state"]
        out = self.run_program(urllib.parse.urlencode({
            "state": state, "error": "<img src=x onerror=alert(1)>&a=b\r\nSet-Cookie: c=1\r\n\r\nb",
            "error_description": "It was locked.\nCall +1 900\x9b\u2028\0."}),
            self.cookie_header()["Cookie"])
        found = re.fullmatch(
            "Status: 302 Found\nCache-Control: no-store\nSet-Cookie: __Host-login-[^\n]*Max-Age=0\n"
            "Set-Cookie: __Host-outcome=provider-error.([2-9A-Z]{8});[^\n]*\nLocation: "
            "/webman/ssoclient/relay.html#reason=provider-error.([2-9A-Z]{8})&success=false"
            "&origin=%2Findex.cgi\n\n", out)
        self.assertIsNotNone(found, out)
        self.assertEqual(found[1], found[2])
        self.assert_logged(
            f"sign-in failed [{found[1]}]: provider-error, client unknown, profile websphere, error "
            "<img src=x onerror=alert(1)>&a=b  Set-Cookie: c=1    b, error_description It was "
            "locked. Call +1 900   .: provider refused")

    def test_long_error_is_cut(self):
        self.device.provider.script = Script(refuse={"error": "x" * 500,
                                                     "error_description": "é" * 1000})
        line = self.assert_refused(self.sign_in(), "provider-error", "provider refused",
                                   ", error " + "x" * 100 + "...,")
        self.assertLess(len(line.encode()), 1200)

    def test_try_again_keeps_the_origin(self):
        self.device.provider.script = Script(refuse={"error": "access_denied"})
        page = self.sign_in(origin="/photos?album=1#3")
        self.reference(page, "denied", "/photos?album=1#3")
        self.device.stage.configure("profile", {"sso_enable": False}, 0o644)
        self.reference(self.start(origin="/photos?a"), "disabled", "/photos?a")
        self.reference(self.start(origin="//[evil"), "disabled", "")

    def test_outcome_for_a_browser_without_scripts(self):
        page = self.start(origin="/x")
        self.device.stage.configure("profile", {"sso_enable": False}, 0o644)
        page = self.start(origin="/x")
        self.assertEqual(page.headers.get_all("Set-Cookie"), [
            "__Host-outcome=" + self.relay(page)["reason"] +
            "; Path=/; Secure; HttpOnly; SameSite=Lax; Max-Age=120"])

    def test_browser_shows_a_page_while_it_waits(self):
        """Only for a browser that shows pages, only with a ticket, and it uses nothing up."""
        url = self.callback_url()
        shows = {"Sec-Fetch-Dest": "document"}
        page = self.browser.get(url, shows)
        self.assertEqual(page.status, 200)
        self.assertIn("default-src 'none'", page.headers["Content-Security-Policy"])
        target = page.headers["Refresh"].split("; url=")[1]
        self.assertEqual(target, url[len(self.device.stage.device):] + "&go=1")
        stranger = self.new_browser()
        self.assert_refused(stranger.get(url, shows), "expired",
                            "login was not started in this browser, or is used up",
                            browser=stranger)
        self.assert_signed_in(self.browser.get(self.device.stage.device + target, shows),
                              "websphere")


class Exchange(DeviceTest):
    """What goes wrong behind the browser's back."""

    def refused(self, script, code, text, *more, profile="websphere"):
        self.device.choose(profile)
        self.device.provider.script = script
        return self.assert_refused(self.sign_in(), code, text, *more)

    def test_wrong_nonce(self):
        for profile in ("azure", "websphere"):
            for nonce in ("other", None, 5, ""):
                with self.subTest(profile=profile, nonce=nonce):
                    self.refused(Script(claims=lambda claims, n=nonce: {**claims, "nonce": n}),
                                 "not-verified", "nonce does not belong to this login",
                                 profile=profile)

    def test_no_nonce(self):
        self.refused(Script(claims=lambda claims: {
            name: value for name, value in claims.items() if name != "nonce"}),
            "not-verified", "nonce does not belong to this login")

    def test_error_response(self):
        """The provider's error is in the log with both clients, whatever its length."""
        for profile in ("azure", "websphere"):
            for length in (0, 5000):
                document = {"error": "invalid_grant",
                            "error_description": "It is <b>gone</b>.", "x": "y" * length}
                exact = "we cannot find key 'id_token' in response!"
                if profile == "azure":
                    exact = json.dumps(document, separators=(",", ":"))
                    exact = exact if length == 0 else exact[:700] + "..."
                with self.subTest(profile=profile, length=length):
                    self.refused(Script(token_answer=lambda *_, d=document: (
                        400, "application/json", json.dumps(d))), "provider-error", exact,
                        ", error invalid_grant, error_description It is <b>gone</b>.: ",
                        profile=profile)

    def test_error_behind_a_long_text(self):
        document = {"correlation": "y" * 8000, "error": "invalid_client",
                    "error_description": "AADSTS7000215: Invalid client secret."}
        for profile in ("azure", "websphere"):
            self.device.choose(profile)
            self.device.provider.script = Script(token_answer=lambda *_: (
                401, "application/json", json.dumps(document)))
            reference = self.reference(self.sign_in(), "provider-error")
            line = self.logged(reference)[0]
            self.assertIn(", error invalid_client, error_description AADSTS7000215: Invalid "
                          "client secret.: ", line)
            self.assertLess(len(line), 2000)

    def test_a_code_cannot_erase_the_message(self):
        url = self.callback_url()
        for code in ("a", "e", "parse", "falied", "parse json falied", "invalid_grant",
                     "temporarily_unavailable"):
            browser = self.new_browser()
            url = re.sub("code=[^&]*", "code=" + urllib.parse.quote(code),
                         self.callback_url(browser))
            self.device.provider.script = Script(token_answer=lambda *_: (
                400, "application/json", json.dumps({"error": "temporarily_unavailable",
                                                     "error_description": "invalid_grant"})))
            with self.subTest(code=code):
                self.assert_refused(
                    browser.get(url), "provider-error",
                    "we cannot find key 'id_token' in response!", "temporarily_unavailable",
                    "error_description invalid_grant", browser=browser)

    def test_secrets_stay_out_of_log_and_url(self):
        """A provider that sends back what it was sent, and a token besides."""
        sent = {}

        def echo(*_):
            form = self.device.provider.seen[-1][3]
            sent.update(form)
            return 400, "application/json", json.dumps({
                "error": form["code"] + form["client_secret"],
                "error_description": self.device.provider.id_token("azure", "n"),
                "form": urllib.parse.urlencode(form, quote_via=urllib.parse.quote),
                "other": urllib.parse.quote(form["client_secret"], safe="").lower()})

        for profile in ("azure", "websphere"):
            self.device.choose(profile)
            self.device.provider.script = Script(token_answer=echo)
            page = self.sign_in()
            reference = self.reference(page, "provider-error")
            line = self.logged(reference)[0]
            self.assertIn(", error [...][...], error_description [...]", line)
            secret = sent["client_secret"]
            self.assertNotEqual(secret, urllib.parse.quote(secret, safe=""))
            for text in [page.headers["Location"], *self.log()]:
                for never in (sent["code"], secret, urllib.parse.quote(secret, safe=""), "eyJ"):
                    self.assertNotIn(never, text)

    def test_exceptions_of_the_library(self):
        old = int(time.time()) - 10
        for script, code, text in (
                (Script(token_answer=lambda *_: (200, "text/html", "<html>")), "provider-error",
                 "parse json falied"),
                (Script(token_answer=lambda *_: (200, "text/html", "")), "unreachable",
                 "parse json falied"),
                (Script(token_answer=lambda *_: (200, "application/json", "{}")), "provider-error",
                 "we cannot find key 'id_token' in response!"),
                (Script(claims=lambda claims: {**claims, "exp": old}), "not-verified",
                 "id_token expired."),
                (Script(claims=lambda claims: {**claims, "aud": "other"}), "not-verified",
                 "client ID invalid"),
                (Script(claims=lambda claims: {**claims, "sub": 5}), "unknown-user",
                 "cannot find the user name!"),
                (Script(header=lambda header: {**header, "alg": "none"}), "not-verified",
                 "none algorithm is not supported"),
                (Script(header=lambda header: {**header, "alg": "RS256"}), "not-verified",
                 "RS256 algorithm is not supported"),
                (Script(signature=lambda signature: bytes(32)), "not-verified",
                 "verify hmac signature failed")):
            with self.subTest(text=text):
                self.refused(script, code, text)

    def test_exceptions_of_the_library_for_azure(self):
        for script, code, text in (
                (Script(claims=lambda claims: {**claims, "tid": "other"}), "not-verified",
                 "tenant ID invalid"),
                (Script(header=lambda header: {**header, "kid": "other"}), "not-verified",
                 "kid does not exist in Azure verified kyes"),
                (Script(header=lambda header: {**header, "alg": "HS256"}), "not-verified",
                 "HS256 algorithm is not supported"),
                (Script(signature=lambda signature: bytes(256)), "not-verified",
                 "verify rsa signature failed"),
                (Script(claims=lambda claims: {**claims, "unique_name": "alice"}), "unknown-user",
                 "cannot get the user name!")):
            with self.subTest(text=text):
                self.refused(script, code, text, profile="azure")

    def test_exception_of_another_kind(self):
        """An array where text is expected: the JSON library's own exception."""
        self.device.provider.script = Script(claims=lambda claims: {**claims, "aud": ["a", "b"]})
        self.reference(self.sign_in(), "not-verified")
        self.assertIsNone(self.user())

    def test_provider_down(self):
        self.change("websphere", token_endpoint="https://provider.localhost:1/")
        self.assert_refused(self.sign_in(), "unreachable", "parse json falied")
        self.assertTrue(any("request token uri Couldn't connect to server" in line
                            for line in self.log()), self.log())


class SetUp(DeviceTest):
    """A device that was not set up says so: the browser is not sent in circles."""

    def test_settings_missing(self):
        for profile in ("azure", "websphere"):
            path = f"/usr/qova/etc/ssoclient/{profile}.conf"
            with open(path, encoding="ascii") as file:
                before = json.load(file)
            self.addCleanup(self.device.stage.configure, profile, before)
            self.device.choose(profile)
            os.unlink(path)
            self.assert_refused(self.start(), "not-set-up",
                                f"{path}: {profile}_redirect_uri is missing or no URL")
            self.device.stage.configure(profile, {})
            self.reference(self.start(), "not-set-up")
            with open(path, "w", encoding="ascii"):
                pass
            self.reference(self.start(), "not-set-up")
            for key in ("authorization_endpoint", "token_endpoint", "client_id", "redirect_uri"):
                for value in ("", "not an address"):
                    if (key, value) == ("client_id", "not an address"):
                        continue
                    self.device.stage.configure(profile, {**before, f"{profile}_{key}": value})
                    self.assert_refused(self.start(), "not-set-up",
                                        f"{path}: {profile}_{key} is missing or no URL")

    def test_line_break_in_the_endpoint(self):
        """It does not begin another header."""
        self.change("websphere", authorization_endpoint=self.device.provider.url + "/a\nSet-Cookie: a=b\n\n")
        out = self.run_program("action=start")
        self.assertIn("#reason=internal.", out)
        self.assertNotIn("a=b", out)
        self.assert_logged("control character in a header")

    def test_profile_missing(self):
        os.unlink("/usr/qova/etc/ssoclient/profile.conf")
        self.assert_refused(self.start(), "disabled", "sso does not enable.")


class Options(DeviceTest):
    """login.conf: root's word, and nobody else's."""

    PATH = "/usr/qova/etc/ssoclient/login.conf"

    def tearDown(self):
        os.unlink(self.PATH)
        super().tearDown()

    def test_nonce_check(self):
        self.device.provider.script = Script(claims=lambda claims: {**claims, "nonce": "other"})
        for value in ("yes", "No", "", "nope"):
            self.device.options(nonce_check=value)
            self.reference(self.sign_in(), "not-verified")
        self.device.options(nonce_check="no")
        for profile in ("azure", "websphere"):
            self.device.choose(profile)
            self.assert_signed_in(self.sign_in(), profile)
            self.browser = self.new_browser()

    def test_bound_to_the_browser_without_the_nonce_check(self):
        self.device.options(nonce_check="no")
        url = self.callback_url()
        victim = self.new_browser()
        self.start(victim)
        self.assert_refused(victim.get(url), "expired",
                            "login was not started in this browser, or is used up", browser=victim)

    def test_what_cannot_be_used_is_reported(self):
        with open(self.PATH, "w", encoding="ascii") as file:
            file.write("# comment\n\n deadline = 0\nmax_exchanges=x\r\nspeed = 5\nnothing\n"
                       "nonce_check = maybe\nsession_lifetime = 99999999999\ndeadline = 21\n")
        self.assert_signed_in(self.sign_in(), "websphere")
        for text in ("line 3: bad value (deadline)", "line 4: bad value (max_exchanges)",
                     'line 5: unknown key (speed)', 'line 6: no "=" (nothing)',
                     "line 7: bad value (nonce_check)", "line 8: bad value (session_lifetime)"):
            self.assert_logged(f"{self.PATH}, {text}")
        self.assertFalse([line for line in self.log() if "line 9" in line])

    def test_file_of_somebody_else(self):
        """Refused: the defaults could leave out a check that the administrator asked for."""
        for problem, prepare in (
                ("does not belong to root", lambda: os.chown(self.PATH, 33, 33)),
                ("others than root can write it", lambda: os.chmod(self.PATH, 0o664)),
                ("others than root can write it", lambda: os.chmod(self.PATH, 0o646)),
                ("Permission denied", lambda: os.chmod(self.PATH, 0o600)),
                ("too large", lambda: os.truncate(self.PATH, 65537))):
            with self.subTest(problem=problem):
                os.unlink(self.PATH)
                self.device.options()
                prepare()
                page = self.start()
                reference = self.reference(page, "internal")
                self.assertTrue(self.logged(f"[{reference}]")[0].endswith(
                    f": {self.PATH}: {problem}"), self.log())

    def test_not_a_file(self):
        os.unlink(self.PATH)
        os.mkfifo(self.PATH)
        self.reference(self.start(), "internal")

    def test_proxy(self):
        """The way through a proxy comes from the file, not from the environment."""
        with socket.create_server(("127.0.0.1", 0)) as proxy:
            proxy.settimeout(10)
            address = f"127.0.0.1:{proxy.getsockname()[1]}"
            url = self.callback_url()
            self.device.options(proxy="http://" + address, deadline=5)
            thread = threading.Thread(target=self.browser.get, args=(url,))
            thread.start()
            connection, _ = proxy.accept()
            with connection:
                asked = connection.recv(1000).decode()
            thread.join(30)
            self.assertTrue(asked.startswith("CONNECT provider.localhost:8444 HTTP/1.1"), asked)
            self.device.options(proxy="http://" + address, no_proxy="other.example.org,.localhost")
            self.assert_signed_in(self.sign_in(), "websphere")

    def test_no_file(self):
        os.unlink(self.PATH)
        self.assert_signed_in(self.sign_in(), "websphere")
        self.device.options()


class Requests(DeviceTest):
    def test_never_a_blank_page(self):
        url = self.device.login_url
        for page, code in ((self.browser.get(url), "expired"),
                           (self.browser.get(url + "?action=logout"), "bad-request"),
                           (self.browser.get(url + "?action=other"), "bad-request"),
                           (self.browser.get(url + "?%zz&=&=x&a"), "expired"),
                           (self.browser.post(url + "?action=start", {}), "bad-request"),
                           (self.browser.post(url, {}), "bad-request")):
            with self.subTest(url=page.url):
                self.reference(page, code)

    def test_forged_session(self):
        self.start()
        ticket = next(iter(self.browser.cookies)).value
        for value in ("", "0" * 64, "a" * 63, "../key", "../../../etc/hostname", ticket,
                      ticket.split("-")[1]):
            page = self.new_browser().get(self.device.front_url,
                                          {"Cookie": "__Host-session=" + value})
            self.assertIn('id="sign-in"', page.body)

    def test_name_with_markup(self):
        self.device.provider.script = Script(
            claims=lambda claims: {**claims, "sub": "<script>alert(1)</script>"})
        self.sign_in()
        page = self.browser.get(self.device.front_url)
        self.assertNotIn("<script>", page.body)
        self.assertEqual(self.user(), "<script>alert(1)</script>")

    def test_files_are_roots(self):
        """No other program that runs as the web server's user can write a session, read the key
        of the tickets, or take a session over."""
        self.sign_in()
        key = next(cookie.value for cookie in self.browser.cookies
                   if cookie.name == "__Host-session")
        modes = {"": 0o755, "/sessions": 0o750, "/slots": 0o700, "/key": 0o600,
                 "/redeemed": 0o600, "/slots/0": 0o600}
        for name in os.listdir(STORE + "/sessions"):
            modes["/sessions/" + name] = 0o640
            self.assertNotIn(name, key)
        for name, mode in modes.items():
            status = os.stat(STORE + name)
            self.assertEqual((status.st_mode & 0o7777, status.st_uid), (mode, 0), name)
        self.assertEqual(set(os.listdir(STORE)), {"sessions", "slots", "key", "redeemed"})

    def test_folder_of_somebody_else(self):
        os.rename(STORE, STORE + "-away")
        try:
            os.mkdir(STORE)
            os.chown(STORE, 33, 33)
            reference = self.reference(self.start(), "internal")
            self.assertTrue(self.logged(reference)[0].endswith(
                f"{STORE} is not a folder that root alone can write to"))
            os.rmdir(STORE)
            os.symlink(STORE + "-away", STORE)
            self.reference(self.start(), "internal")
            os.unlink(STORE)
        finally:
            os.rename(STORE + "-away", STORE)
        self.assert_signed_in(self.sign_in(), "websphere")


class Logout(DeviceTest):
    def assert_logs_out(self, profile):
        """By way of the provider, which sends the browser back to the relay page."""
        self.device.choose(profile)
        self.sign_in()
        page = self.sign_out()
        relay = self.device.stage.device + "/webman/ssoclient/relay.html"
        hint = {"azure": "", "websphere": r"&id_token_hint=eyJ[A-Za-z0-9_-]+[.]eyJ[\w-]+[.][\w-]+"}
        self.assertRegex(page.location, f"^{self.device.provider.url}/{profile}/logout"
                         "[?]post_logout_redirect_uri=" + urllib.parse.quote(relay, safe="") +
                         hint[profile] + "$")
        self.assertEqual([cookie.name for cookie in self.browser.cookies], [])
        self.assertIsNone(self.user())
        self.assertEqual(self.browser.get(page.location).location, relay)

    def test_azure(self):
        self.assert_logs_out("azure")

    def test_websphere(self):
        self.assert_logs_out("websphere")

    def test_own_pages(self):
        """What browsers send from the device's own page."""
        site = self.device.stage.device
        for headers in ({}, {"Origin": site}, {"Origin": site, "Sec-Fetch-Site": "same-origin"},
                        {"Origin": "null", "Sec-Fetch-Site": "same-origin"}):
            with self.subTest(headers=headers):
                self.sign_in()
                self.sign_out(headers=headers)
                self.assertIsNone(self.user())

    def test_forgery(self):
        """Another site's form, with the browser's cookies."""
        self.sign_in()
        url = self.device.login_url + "?action=logout"
        token = self.browser.get(self.device.front_url).form("sign-out")["fields"]["token"]
        other = self.new_browser()
        self.device.home.script = Script()
        other.get(self.callback_url(other))
        foreign = other.get(self.device.front_url).form("sign-out")["fields"]["token"]
        self.assertNotEqual(token, foreign)
        for fields, headers in (
                ({}, {}), ({"token": ""}, {}), ({"token": foreign}, {}), ({"token": token[:-1]}, {}),
                ({"token": token}, {"Origin": "https://other.example.org"}),
                ({"token": token}, {"Origin": "null"}),
                ({"token": token}, {"Origin": self.device.stage.device + "0"}),
                ({"token": token}, {"Sec-Fetch-Site": "cross-site"}),
                ({"token": token}, {"Sec-Fetch-Site": "same-site"}),
                ({"token": token}, {"Sec-Fetch-Site": "none"}),
                ({"token": token}, {"Origin": "null", "Sec-Fetch-Site": "cross-site"}),
                ({"token": token}, {"Content-Type": "text/plain"}),
                ({"token": token, "x": "y" * 5000}, {})):
            with self.subTest(fields=fields, headers=headers):
                page = self.browser.post(url, fields, headers)
                self.reference(page, "sign-out-refused")
                self.assertNotIn("__Host-session", str(page.headers))
                self.assertEqual(self.user(), EXPECTED["websphere"])
        page = self.browser.get(url + "&token=" + token)
        self.reference(page, "bad-request")
        self.assertEqual(self.user(), EXPECTED["websphere"])

    def test_without_a_session(self):
        self.reference(self.browser.post(self.device.login_url + "?action=logout", {"token": ""}),
                       "sign-out-refused")

    def test_session_is_gone_on_the_device(self):
        """That session and no other."""
        self.sign_in()
        other = self.new_browser()
        other.get(self.callback_url(other))
        key = next(cookie.value for cookie in self.browser.cookies
                   if cookie.name == "__Host-session")
        self.sign_out()
        page = self.new_browser().get(self.device.front_url, {"Cookie": "__Host-session=" + key})
        self.assertIn('id="sign-in"', page.body)
        self.assertEqual(self.user(other), EXPECTED["websphere"])

    def test_host_header_is_not_believed(self):
        self.device.choose("azure")
        self.sign_in()
        page = self.sign_out(headers={"Host": "evil.example"})
        self.assertNotIn("evil", page.headers["Location"])

    def test_session_that_ended_meanwhile(self):
        """A page that was left open: the person is signed out all the same."""
        self.sign_in()
        fields = self.browser.get(self.device.front_url).form("sign-out")["fields"]
        for name in os.listdir(STORE + "/sessions"):
            os.unlink(f"{STORE}/sessions/{name}")
        page = self.browser.post(self.device.login_url + "?action=logout", fields)
        self.assertTrue(page.location.startswith(self.device.provider.url), page.location)

    def test_no_logout_endpoint(self):
        for profile in ("azure", "websphere"):
            self.device.choose(profile)
            self.sign_in()
            self.change(profile, logout_endpoint="")
            self.assertEqual(self.sign_out().location,
                             self.device.stage.device + "/webman/ssoclient/relay.html")

    def test_switched_off(self):
        self.sign_in()
        self.device.stage.configure("profile", {"sso_enable": False}, 0o644)
        page = self.sign_out(headers={"Origin": self.device.stage.device})
        self.assertEqual(page.location,
                         self.device.stage.device + "/webman/ssoclient/relay.html")
        self.assertIsNone(self.user())


class Identity(DeviceTest):
    """Installed or started in another way, the program says so and does nothing."""

    def test_started_by_root(self):
        self.assertIn("#reason=internal.", self.run_program("action=start", user=0))
        self.assert_logged("web server runs as root")

    def test_not_set_id(self):
        copy = os.path.dirname(LOGIN) + "/plain.cgi"
        subprocess.run(["install", "-m", "755", LOGIN, copy], check=True)
        try:
            out = self.run_program("action=start", path=copy)
        finally:
            os.unlink(copy)
        self.assertIn("#reason=internal.", out)
        self.assert_logged("login program is not installed set-id root")

    def test_nobody_else_can_start_it(self):
        with self.assertRaises(PermissionError):
            self.run_program("action=start", user=65534)


class ThroughTheLauncher(Launched, DeviceTest):
    def test_signs_in_and_out(self):
        for profile in ("azure", "websphere"):
            with self.subTest(profile=profile):
                self.device.choose(profile)
                self.assert_signed_in(self.sign_in(), profile)
                self.sign_out()
                self.assertIsNone(self.user())

    def test_under_the_other_web_servers(self):
        self.addCleanup(self.device.use, Lighttpd)
        for server in (Apache, Nginx, Busybox):
            with self.subTest(server=server.title or server.__name__):
                self.device.use(server)
                self.browser = self.new_browser()
                self.assert_signed_in(self.sign_in(), "websphere")

    def test_not_through_the_launcher(self):
        out = self.run_program("action=start", path=LIBEXEC)
        self.assertIn("#reason=internal.", out)
        self.assert_logged("login program is not installed set-id root")
        with self.assertRaises(PermissionError):
            self.run_program("action=start", path=LIBEXEC, user=65534)

    def refused(self, reason, **options):
        self.assertRegex(self.run_program("action=start", **options),
                         "^Status: 302 Found\n.*\nLocation: [^\n]*relay.html#success=false\n\n$")
        line = "sign-in failed: " + reason
        self.assertTrue(any(entry.endswith(line) for entry in self.log()), self.log())

    def test_launcher_started_by_root(self):
        self.refused("web server runs as root", user=0)

    def test_launcher_not_set_id(self):
        copy = os.path.dirname(LOGIN) + "/plain.cgi"
        subprocess.run(["install", "-m", "755", LOGIN, copy], check=True)
        self.addCleanup(os.unlink, copy)
        self.refused("launcher is not installed set-id root", path=copy)

    def test_launcher_for_the_web_server_alone(self):
        with self.assertRaises(PermissionError):
            self.run_program("action=start", user=65534)

    def test_no_program(self):
        os.rename(LIBEXEC, LIBEXEC + "-away")
        self.addCleanup(os.rename, LIBEXEC + "-away", LIBEXEC)
        self.refused("login program does not start")


if __name__ == "__main__":
    unittest.main()
