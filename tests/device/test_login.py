"""What the login program does for an honest user, and against everybody else."""

import base64
import concurrent.futures
import hashlib
import json
import os
import re
import subprocess
import threading
import time
import unittest
import urllib.parse

from device import EXPECTED, LOGIN, STORE, DeviceTest, device, values_of
from providers.scripted import Script
from servers import Apache, Busybox, Lighttpd, Nginx

FOREIGN = ("https://evil.example/", "//evil.example/", "/\\evil.example", "javascript:alert(1)",
           "evil", "", "/" + "a" * 300, "/é", "/\"", "/<b>",
           "/..//evil.example/", "/.//evil.example/", "/%2e%2e//evil.example/")
DEADLINE = 4  # seconds; the child's own clock is set to twice as much


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
        self.assertEqual(name, "__Host-login")
        self.assertRegex(value, "^[0-9a-f]{64}$")
        self.assertEqual(attributes, ["Path", "/", "Secure", "HttpOnly", "SameSite", "Lax"])
        state = state_of(page.location)
        self.assertEqual(state["binding"], hashlib.md5(value.encode()).hexdigest())
        self.assertEqual(state["origin"], "/index.cgi")

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
        for origin in FOREIGN:
            with self.subTest(origin=origin):
                self.assertNotIn("origin", state_of(self.start(origin=origin).location))

    def test_line_break_in_the_origin(self):
        out = self.run_program("action=start&origin=/a%0D%0ASet-Cookie:%20x=y%0A%0A")
        location = re.fullmatch("Status: 302 Found\nCache-Control: no-store\n"
                                "Set-Cookie: __Host-login=[^\n]*\nLocation: ([^\n]*)\n\n", out)
        self.assertIsNotNone(location, out)
        self.assertNotIn("origin", state_of(location[1]))

    def test_own_origin_is_kept(self):
        for origin in ("/", "/index.cgi", "/a/b.html?x=1&y=%20", "/a?b=//c", "/~user/-_."):
            with self.subTest(origin=origin):
                self.assertEqual(state_of(self.start(origin=origin).location)["origin"], origin)

    def test_switched_off(self):
        self.device.stage.configure("profile", {"sso_enable": False}, 0o644)
        self.assert_refused(self.start(), "sso does not enable.")

    def test_unknown_profile(self):
        self.device.choose("Azure")
        self.assert_refused(self.start(), "profile not support.")


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
        self.assertEqual(len(cookies), 2)
        self.assertRegex(cookies[0], "^__Host-session=[0-9a-f]{64}; Path=/; Secure; HttpOnly; "
                                     "SameSite=Lax$")
        self.assertEqual(cookies[1], "__Host-login=; Path=/; Secure; HttpOnly; SameSite=Lax; "
                                     "Max-Age=0")

    def test_no_cookie(self):
        url = self.callback_url()
        other = self.new_browser()
        self.device.provider.seen.clear()
        self.assert_refused(other.get(url), "login was not started in this browser, or is used up",
                            browser=other)
        self.assertEqual(self.device.provider.seen, [], "the code was sent to the provider")

    def test_somebody_elses_state(self):
        """Login request forgery: the attacker's code and state in the victim's browser."""
        attackers = self.callback_url()
        victim = self.new_browser()
        self.start(victim)
        self.device.provider.seen.clear()
        self.assert_refused(victim.get(attackers), "state does not belong to this login",
                            browser=victim)
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
                self.assert_refused(attacker.get(url), "nonce does not belong to this login",
                                    browser=attacker)

    def test_stolen_code_and_a_state_made_to_fit(self):
        """The attacker writes the victim's nonce into the state of a login of his own."""
        victims = self.callback_url()
        attacker = self.new_browser()
        own = self.callback_url(attacker)
        nonce = state_of(victims)["nonce"]
        forged = with_state(own, lambda state: {**state, "nonce": nonce})
        forged = forged.replace("code=" + values_of(own)["code"],
                                "code=" + values_of(victims)["code"])
        self.assert_refused(attacker.get(forged), "state does not belong to this login",
                            browser=attacker)

    def test_replay(self):
        url = self.callback_url()
        header = self.cookie_header()
        self.assertEqual(self.relay(self.browser.get(url))["success"], "true")
        page = self.new_browser().get(url, header)
        self.assertEqual(self.relay(page)["reason"],
                         "login was not started in this browser, or is used up")

    def test_ticket_is_used_up_by_a_failure_too(self):
        url = self.callback_url()
        header = self.cookie_header()
        spoiled = with_state(url, lambda state: {**state, "origin": "/other"})
        self.assertEqual(self.relay(self.browser.get(spoiled))["success"], "false")
        page = self.new_browser().get(url, header)
        self.assertEqual(self.relay(page)["reason"],
                         "login was not started in this browser, or is used up")

    def test_ticket_expires(self):
        url = self.callback_url()
        for name in os.listdir(STORE + "/tickets"):
            os.utime(f"{STORE}/tickets/{name}", (time.time() - 601,) * 2)
        self.assert_refused(self.browser.get(url),
                            "login was not started in this browser, or is used up")

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
        self.assert_refused(page, "state does not belong to this login")

    def test_unusable_states(self):
        for state in ("", "=", "A", "====", "AAAA", "bnVsbA==", "WzFd", "e30=", "%00",
                      base64.b64encode(b"[" * 700).decode(), "A" * 4000, "é"):
            with self.subTest(state=state[:20]):
                code = values_of(self.callback_url())["code"]
                url = self.device.login_url + "?" + urllib.parse.urlencode(
                    {"code": code, "state": state})
                self.assert_refused(self.browser.get(url), "state does not belong to this login")

    def test_refused_at_the_provider(self):
        self.device.provider.script = Script(refuse={
            "error": "access_denied", "error_description": "The user said no."})
        self.assert_refused(self.sign_in(), "provider refused: access_denied")

    def test_no_code(self):
        state = values_of(self.start().location)["state"]
        page = self.browser.get(self.device.login_url + "?" +
                                urllib.parse.urlencode({"state": state}))
        self.assert_refused(page, "provider sent no code")

    def test_markup_in_the_reason(self):
        self.device.provider.script = Script(refuse={"error": "<img src=x onerror=alert(1)>&a=b"})
        page = self.sign_in()
        self.assertNotRegex(page.headers["Location"].split("#")[1], "[<> \"']")
        self.assert_refused(page, "provider refused: <img src=x onerror=alert(1)>&a=b")

    def test_line_break_in_the_reason(self):
        state = values_of(self.start().location)["state"]
        out = self.run_program("error=a%0D%0ASet-Cookie:%20evil=1%0D%0A%0D%0Ab&state=" + state,
                               self.cookie_header()["Cookie"])
        self.assertRegex(out, "^Status: 302 Found\nCache-Control: no-store\n"
                              "Set-Cookie: __Host-login=; [^\n]*\n"
                              "Location: /webman/ssoclient/relay.html#reason="
                              "provider%20refused%3A%20a%20%20Set-Cookie%3A%20evil%3D1%20%20%20%20b"
                              "&success=false\n\n$")
        self.assertTrue(any(line.endswith("refused: a  Set-Cookie: evil=1    b")
                            for line in self.log()), self.log())

    def test_long_reason_is_cut(self):
        self.device.provider.script = Script(refuse={"error": "x" * 500})
        self.assertEqual(len(self.relay(self.sign_in())["reason"]), 120)


class Exchange(DeviceTest):
    """What goes wrong behind the browser's back."""

    def refused(self, script, reason, logged=None, profile="websphere"):
        self.device.choose(profile)
        self.device.provider.script = script
        self.assert_refused(self.sign_in(), reason, logged)

    def test_wrong_nonce(self):
        for profile in ("azure", "websphere"):
            for nonce in ("other", None, 5, ""):
                with self.subTest(profile=profile, nonce=nonce):
                    self.refused(Script(claims=lambda claims, n=nonce: {**claims, "nonce": n}),
                                 "nonce does not belong to this login", profile=profile)

    def test_no_nonce(self):
        self.refused(Script(claims=lambda claims: {
            name: value for name, value in claims.items() if name != "nonce"}),
            "nonce does not belong to this login")

    def test_error_response(self):
        document = {"error": "invalid_grant", "error_description": "It is <b>gone</b>."}
        self.refused(Script(token_answer=lambda *_: (400, "application/json",
                                                     json.dumps(document))),
                     "invalid_grant", json.dumps(document, separators=(",", ":")),
                     profile="azure")

    def test_secrets_stay_out_of_log_and_url(self):
        """A provider that sends back what it was sent, and a token besides."""
        sent = {}

        def echo(*_):
            form = self.device.provider.seen[-1][3]
            sent.update(form)
            return 400, "application/json", json.dumps({
                "error": form["code"] + form["client_secret"],
                "error_description": self.device.provider.id_token("azure", "n"),
                "form": urllib.parse.urlencode(form, quote_via=urllib.parse.quote)})

        self.device.choose("azure")
        self.device.provider.script = Script(token_answer=echo)
        page = self.sign_in()
        self.assertEqual(self.relay(page)["reason"], "[...][...]")
        secret = sent["client_secret"]
        self.assertNotEqual(secret, urllib.parse.quote(secret, safe=""))
        for text in [page.headers["Location"], *self.log()]:
            for never in (sent["code"], secret, urllib.parse.quote(secret, safe=""), "eyJ"):
                self.assertNotIn(never, text)

    def test_exceptions_of_the_library(self):
        old = int(time.time()) - 10
        for script, text in (
                (Script(token_answer=lambda *_: (200, "text/html", "<html>")),
                 "parse json falied"),
                (Script(token_answer=lambda *_: (200, "text/html", "")), "parse json falied"),
                (Script(token_answer=lambda *_: (200, "application/json", "{}")),
                 "we cannot find key 'id_token' in response!"),
                (Script(claims=lambda claims: {**claims, "exp": old}), "id_token expired."),
                (Script(claims=lambda claims: {**claims, "aud": "other"}), "client ID invalid"),
                (Script(claims=lambda claims: {**claims, "sub": 5}),
                 "cannot find the user name!"),
                (Script(header=lambda header: {**header, "alg": "none"}),
                 "none algorithm is not supported"),
                (Script(header=lambda header: {**header, "alg": "RS256"}),
                 "RS256 algorithm is not supported"),
                (Script(signature=lambda signature: bytes(32)), "verify hmac signature failed")):
            with self.subTest(text=text):
                self.refused(script, text)

    def test_exceptions_of_the_library_for_azure(self):
        for script, text in (
                (Script(claims=lambda claims: {**claims, "tid": "other"}), "tenant ID invalid"),
                (Script(header=lambda header: {**header, "kid": "other"}),
                 "kid does not exist in Azure verified kyes"),
                (Script(header=lambda header: {**header, "alg": "HS256"}),
                 "HS256 algorithm is not supported"),
                (Script(signature=lambda signature: bytes(256)), "verify rsa signature failed"),
                (Script(claims=lambda claims: {**claims, "unique_name": "alice"}),
                 "cannot get the user name!")):
            with self.subTest(text=text):
                self.refused(script, text, profile="azure")

    def test_exception_of_another_kind(self):
        """An array where text is expected: the JSON library's own exception."""
        self.device.provider.script = Script(claims=lambda claims: {**claims, "aud": ["a", "b"]})
        page = self.sign_in()
        self.assertEqual(self.relay(page)["success"], "false")
        self.assertNotEqual(self.relay(page)["reason"], "")
        self.assertIsNone(self.user())

    def test_provider_down(self):
        endpoints = self.device.provider.add_websphere(self.device.clients["websphere"])
        settings = {"websphere_client_id": "device-websphere",
                    "websphere_redirect_uri": self.device.login_url,
                    "websphere_authorization_endpoint": endpoints["authorization"],
                    "websphere_token_endpoint": "https://provider.localhost:1/"}
        with open("/usr/qova/etc/ssoclient/websphere.conf", encoding="ascii") as file:
            before = json.load(file)
        try:
            self.device.stage.configure("websphere", settings)
            self.assert_refused(self.sign_in(), "parse json falied")
            self.assertTrue(any("request token uri Couldn't connect to server" in line
                                for line in self.log()), self.log())
        finally:
            self.device.stage.configure("websphere", before)


class Deadline(DeviceTest):
    """A provider that takes the request and never answers."""

    @classmethod
    def setUpClass(cls):
        device().use(Lighttpd, SSO_LOGIN_DEADLINE=str(DEADLINE))

    @classmethod
    def tearDownClass(cls):
        device().use(Lighttpd)

    def test_silent_provider(self):
        self.device.provider.script = Script(silent=("token",))
        url = self.callback_url()
        begun = time.monotonic()
        page = self.browser.get(url)
        took = time.monotonic() - begun
        self.assert_refused(page, "provider did not answer in time")
        self.assertTrue(DEADLINE - 0.5 < took < 2 * DEADLINE, f"it took {took:.1f} s")
        self.assertEqual(programs(), [], "a process is left behind")

    def test_identities_and_orphan(self):
        """While it waits: effective ids of the web server, root saved. And when the web server
        ends the login program, its child does not wait for ever."""
        self.device.provider.script = Script(silent=("token",))
        url = self.callback_url()
        waiting = threading.Thread(target=self.browser.get, args=(url,))
        waiting.start()
        # The child is past the settings when it talks to the provider: its ids are at rest.
        wait_until(lambda: any(path.endswith("/token")
                               for _, path, _, _ in self.device.provider.seen))
        self.assertEqual(len(programs()), 2)
        for pid in programs():
            with open(f"/proc/{pid}/status", encoding="ascii") as status:
                ids = {line.split()[0]: line.split()[1:4] for line in status if "id:" in line}
            self.assertEqual(ids["Uid:"], ["33", "33", "0"])
            self.assertEqual(ids["Gid:"], ["33", "33", "0"])
        os.kill(programs()[0], 9)
        waiting.join(20)
        wait_until(lambda: not programs())

    def test_plain_road(self):
        self.addCleanup(self.setUpClass)
        self.device.use(Lighttpd, SSO_LOGIN_DEADLINE="1", SSO_LOGIN_ROAD="plain")
        self.device.provider.script = Script(silent=("token",))
        self.assert_refused(self.sign_in(), "provider did not answer in time")


class Plain(DeviceTest):
    """The switchable road through OIDCLogin alone."""

    @classmethod
    def setUpClass(cls):
        device().use(Lighttpd, SSO_LOGIN_ROAD="plain")

    @classmethod
    def tearDownClass(cls):
        device().use(Lighttpd)

    def test_signs_in(self):
        for profile in ("azure", "websphere"):
            with self.subTest(profile=profile):
                self.device.choose(profile)
                self.assert_signed_in(self.sign_in(), profile)
                self.browser = self.new_browser()

    def test_nonce_is_not_looked_at(self):
        self.device.provider.script = Script(claims=lambda claims: {**claims, "nonce": "other"})
        self.assert_signed_in(self.sign_in(), "websphere")

    def test_bound_to_the_browser_all_the_same(self):
        url = self.callback_url()
        victim = self.new_browser()
        self.start(victim)
        self.assert_refused(victim.get(url), "state does not belong to this login",
                            browser=victim)

    def test_foreign_origin_in_an_altered_state(self):
        for origin in FOREIGN:
            with self.subTest(origin=origin):
                url = with_state(self.callback_url(),
                                 lambda state, o=origin: {**state, "origin": o})
                self.assertEqual(self.relay(self.browser.get(url)), {"success": "true"})


class Requests(DeviceTest):
    def test_never_a_blank_page(self):
        url = self.device.login_url
        for page in (self.browser.get(url), self.browser.get(url + "?action=logout"),
                     self.browser.get(url + "?action=other"), self.browser.get(url + "?%zz&=&=x&a"),
                     self.browser.post(url + "?action=start", {}), self.browser.post(url, {})):
            with self.subTest(url=page.url):
                self.assertEqual(self.relay(page)["success"], "false")
                self.assertNotEqual(self.relay(page)["reason"], "")

    def test_forged_session(self):
        self.start()
        ticket = next(iter(self.browser.cookies)).value
        for value in ("", "0" * 64, "a" * 63, "../tickets/" + ticket, "../../../etc/hostname"):
            page = self.new_browser().get(self.device.front_url,
                                          {"Cookie": "__Host-session=" + value})
            self.assertIn("Nobody is signed in", page.text)

    def test_a_ticket_is_no_session(self):
        self.start()
        key = next(iter(self.browser.cookies)).value
        page = self.new_browser().get(self.device.front_url, {"Cookie": "__Host-session=" + key})
        self.assertIn("Nobody is signed in", page.text)

    def test_name_with_markup(self):
        self.device.provider.script = Script(
            claims=lambda claims: {**claims, "sub": "<script>alert(1)</script>"})
        self.sign_in()
        page = self.browser.get(self.device.front_url)
        self.assertNotIn("<script>", page.body)
        self.assertEqual(self.user(), "<script>alert(1)</script>")

    def test_too_many_logins_under_way(self):
        folder = STORE + "/tickets"
        names = [f"{folder}/{number:064x}" for number in range(1000)]
        try:
            for name in names:
                with open(name, "w", encoding="ascii"):
                    pass
            self.assert_refused(self.start(), f"too many entries below {folder}/")
            for name in names:
                os.utime(name, (time.time() - 601,) * 2)
            self.assertIn("/authorization?", self.start().location)
            self.assertFalse(os.path.exists(names[0]), "an old ticket is kept")
        finally:
            for name in names:
                if os.path.exists(name):
                    os.unlink(name)

    def test_files_are_for_the_web_server_alone(self):
        self.sign_in()
        self.start()
        for folder in ("tickets", "sessions"):
            self.assertEqual(os.stat(f"{STORE}/{folder}").st_mode & 0o777, 0o700)
            for name in os.listdir(f"{STORE}/{folder}"):
                status = os.stat(f"{STORE}/{folder}/{name}")
                self.assertEqual((status.st_mode & 0o777, status.st_uid), (0o600, 33))


class Logout(DeviceTest):
    def logout(self):
        return self.browser.post(self.device.login_url + "?action=logout", {})

    def assert_logs_out(self, profile):
        """By way of the provider, which sends the browser back to the relay page."""
        self.device.choose(profile)
        self.sign_in()
        page = self.logout()
        relay = self.device.stage.device + "/webman/ssoclient/relay.html"
        self.assertEqual(page.location, f"{self.device.provider.url}/{profile}/logout"
                         "?post_logout_redirect_uri=" + urllib.parse.quote(relay, safe=""))
        self.assertIsNone(self.user())
        self.assertEqual(self.browser.get(page.location).location, relay)

    def test_azure(self):
        self.assert_logs_out("azure")

    def test_websphere(self):
        self.assert_logs_out("websphere")

    def test_host_header_is_not_believed(self):
        self.device.choose("azure")
        page = self.browser.post(self.device.login_url + "?action=logout", {},
                                 {"Host": "evil.example"})
        self.assertNotIn("evil", page.headers["Location"])

    def test_session_is_gone_on_the_device(self):
        self.sign_in()
        key = next(cookie.value for cookie in self.browser.cookies
                   if cookie.name == "__Host-session")
        self.logout()
        page = self.new_browser().get(self.device.front_url, {"Cookie": "__Host-session=" + key})
        self.assertIn("Nobody is signed in", page.text)

    def test_switched_off(self):
        self.device.stage.configure("profile", {"sso_enable": False}, 0o644)
        page = self.logout()
        self.assertEqual(page.location,
                         self.device.stage.device + "/webman/ssoclient/relay.html")


class Identity(DeviceTest):
    """Installed or started in another way, the program says so and does nothing."""

    def test_started_by_root(self):
        self.assertIn("#reason=web%20server%20runs%20as%20root&success=false\n",
                      self.run_program("action=start", user=0))

    def test_not_set_id(self):
        copy = os.path.dirname(LOGIN) + "/plain.cgi"
        subprocess.run(["install", "-m", "755", LOGIN, copy], check=True)
        try:
            out = self.run_program("action=start", path=copy)
        finally:
            os.unlink(copy)
        self.assertIn("#reason=login%20program%20is%20not%20installed%20set-id%20root&", out)

    def test_nobody_else_can_start_it(self):
        with self.assertRaises(PermissionError):
            self.run_program("action=start", user=65534)


class Launched(DeviceTest):
    """The other way to the same identities: the launcher is set-id, the login program is not."""

    PROGRAM = "/usr/qova/libexec/ssoclient-login"
    BAIT = {"LD_PRELOAD": "/nowhere.so", "BASH_ENV": "/nowhere", "HTTP_PROXY": "http://evil:1"}

    @classmethod
    def setUpClass(cls):
        build = os.environ["SSOCLIENT_BUILD"] + "/device/"
        cls.stage = device().stage
        os.makedirs(os.path.dirname(cls.PROGRAM), exist_ok=True)
        cls.stage.install_login(build + "login.cgi", cls.PROGRAM, 0o750)
        cls.stage.install_login(build + "launcher.cgi", LOGIN, 0o4750)
        device().use(Lighttpd, SSO_LOGIN_DEADLINE=str(DEADLINE), **cls.BAIT)

    @classmethod
    def tearDownClass(cls):
        os.unlink(cls.PROGRAM)
        cls.stage.install_login(os.environ["SSOCLIENT_BUILD"] + "/device/login.cgi", LOGIN, 0o4750)
        device().use(Lighttpd)

    def test_signs_in_and_out(self):
        for profile in ("azure", "websphere"):
            with self.subTest(profile=profile):
                self.device.choose(profile)
                self.assert_signed_in(self.sign_in(), profile)
                self.browser.post(self.device.login_url + "?action=logout", {})
                self.assertIsNone(self.user())

    def test_under_the_other_web_servers(self):
        self.addCleanup(self.setUpClass)
        for server in (Apache, Nginx, Busybox):
            with self.subTest(server=server.title or server.__name__):
                self.device.use(server)
                self.browser = self.new_browser()
                self.assert_signed_in(self.sign_in(), "websphere")

    def test_identities_and_environment(self):
        """As for the set-id program; and of what the web server has set, only what is read."""
        self.device.provider.script = Script(silent=("token",))
        url = self.callback_url()
        waiting = threading.Thread(target=self.browser.get, args=(url,))
        waiting.start()
        wait_until(lambda: any(path.endswith("/token")
                               for _, path, _, _ in self.device.provider.seen))
        running = programs("ssoclient-login")
        self.assertEqual(len(running), 2)
        for pid in running:
            with open(f"/proc/{pid}/status", encoding="ascii") as status:
                ids = {line.split()[0]: line.split()[1:4] for line in status if "id:" in line}
            self.assertEqual(ids["Uid:"], ["33", "33", "0"])
            self.assertEqual(ids["Gid:"], ["33", "33", "0"])
            with open(f"/proc/{pid}/environ", encoding="ascii") as environ:
                names = {pair.split("=")[0] for pair in environ.read().split("\0") if pair}
            self.assertEqual(names, {"PATH", "REQUEST_METHOD", "QUERY_STRING", "HTTP_COOKIE",
                                     "SSO_LOGIN_DEADLINE"})
        waiting.join(20)
        self.assertEqual(programs("ssoclient-login"), [])

    def test_not_through_the_launcher(self):
        out = self.run_program("action=start", path=self.PROGRAM)
        self.assertIn("#reason=login%20program%20is%20not%20installed%20set-id%20root&", out)
        with self.assertRaises(PermissionError):
            self.run_program("action=start", path=self.PROGRAM, user=65534)

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
        os.rename(self.PROGRAM, self.PROGRAM + "-away")
        self.addCleanup(os.rename, self.PROGRAM + "-away", self.PROGRAM)
        self.refused("login program does not start")


def programs(program="login.cgi"):
    """Process ids of the login programs that run, parents before children."""
    found = []
    for name in os.listdir("/proc"):
        if not name.isdigit():
            continue
        try:
            with open(f"/proc/{name}/stat", encoding="ascii") as file:
                stat = file.read()
        except OSError:
            continue
        if f"({program})" in stat and stat.split()[2] != "Z":
            found.append(int(name))
    return sorted(found)


def wait_until(condition, seconds=15):
    end = time.monotonic() + seconds
    while not condition():
        if time.monotonic() > end:
            raise AssertionError("waited in vain")
        time.sleep(0.05)


if __name__ == "__main__":
    unittest.main()
