"""The twin of Entra ID: every endpoint and code over HTTPS, and sign-ins through the library."""

import base64
import email.utils
import hashlib
import json
import re
import ssl
import subprocess
import time
import unittest
import urllib.parse

from twin_test import CALLBACK, RELAY, SignIns, TwinTest, decoded, parts_of, signed_by
from providers import entra

TENANT = entra.Settings().tenant_id


class EntraTest(TwinTest):
    twin_class = entra.Entra
    defaults = {"client_secret": "kept+secret", "redirect_uris": [CALLBACK],
                "logout_uris": [RELAY], "password": "pass word", "keys": 4}

    def path(self, what, v2=True, tenant=TENANT):
        return f"/{tenant}/oauth2/{'v2.0/' if v2 else ''}{what}"

    def authorize(self, v2=True, tenant=TENANT, **changes):
        query = {"client_id": self.twin.settings.client_id, "redirect_uri": CALLBACK,
                 "response_type": "code", "scope": "openid", "state": "s+1", "nonce": "n",
                 **changes}
        return self.get(self.path("authorize", v2, tenant),
                        **{name: value for name, value in query.items() if value is not None})

    def code(self, **options):
        return self.sent_back(self.sign_in(self.authorize(**options)))["code"]

    def form(self, **changes):
        return {"grant_type": "authorization_code", "client_id": self.twin.settings.client_id,
                "client_secret": "kept+secret", "redirect_uri": CALLBACK, **changes}

    def redeem(self, v2=True, tenant=TENANT, **changes):
        """Asks for tokens, with a fresh code unless `changes` has one."""
        if "code" not in changes:
            changes["code"] = self.code(v2=v2)
        return self.post(self.path("token", v2, tenant), self.form(**changes))

    def for_the_client(self, v2=True, tenant=TENANT, **changes):
        scope = {"scope": "https://graph.microsoft.com/.default"} if v2 else {}
        return self.post(self.path("token", v2, tenant), self.form(
            **{"grant_type": "client_credentials", "redirect_uri": None, **scope, **changes}))

    def assert_fault(self, page, code, status, error, **more):
        """The members of an error answer, and that they agree with each other."""
        self.assertEqual(page.status, status, page.body)
        self.assertEqual(page.headers.get_content_type(), "application/json")
        value = json.loads(page.body)
        self.assertEqual(value.keys(), {
            "error", "error_description", "error_codes", "timestamp", "trace_id",
            "correlation_id", "error_uri"} | more.keys())
        self.assertEqual((value["error"], value["error_codes"]), (error, [code]))
        self.assertRegex(value["error_description"], (
            f"^AADSTS{code}: [^\\r\\n]+ Trace ID: {value['trace_id']} "
            f"Correlation ID: {value['correlation_id']} Timestamp: {value['timestamp']}$"))
        self.assertTrue(value["error_uri"].endswith(f"/error?code={code}"))
        for name, wanted in more.items():
            self.assertIn(wanted, value[name])

    def assert_page(self, page, code, status=200):
        """An error that the user sees on the provider's own page."""
        self.assertEqual(page.status, status)
        self.assertEqual(page.headers.get_content_type(), "text/html")
        self.assertIn(f"AADSTS{code}: ", page.text)
        config = json.loads(re.search(r"\$Config=(.*);\n", page.body)[1])
        self.assertEqual(config["iErrorCode"], code)
        self.assertTrue(config["strServiceExceptionMessage"].startswith(f"AADSTS{code}: "))


class EntraToken(EntraTest):
    # Code: settings, changes of the request, status, error. Each request is otherwise good.
    CASES = {
        900144: ({}, {"grant_type": None}, 400, "invalid_request"),
        90014: ({}, {"code": ""}, 400, "invalid_request"),
        90002: ({}, {"tenant": "0f0f0f0f-0000-4000-8000-000000000000"}, 400, "invalid_request"),
        900023: ({}, {"tenant": "wrong"}, 400, "invalid_request"),
        50194: ({}, {"tenant": "common"}, 400, "invalid_request"),
        70003: ({}, {"grant_type": "password"}, 400, "unsupported_grant_type"),
        9002313: ({}, {"code": "not-a-code"}, 400, "invalid_grant"),
        700016: ({}, {"client_id": "other"}, 400, "unauthorized_client"),
        7000215: ({}, {"client_secret": "wrong"}, 401, "invalid_client"),
        7000218: ({}, {"client_secret": None}, 401, "invalid_client"),
        7000222: ({"secret_expired": True}, {}, 401, "invalid_client"),
        700025: ({"public_client": True}, {}, 401, "invalid_client"),
        500112: ({}, {"redirect_uri": RELAY}, 401, "invalid_client"),
        50011: ({}, {"code": f"1.A{'b' * 30}.{'c' * 60}", "redirect_uri": RELAY}, 400,
                "invalid_request"),
        70000: ({}, {"code": f"0.A{'b' * 30}.{'c' * 60}"}, 400, "invalid_grant"),
        70008: ({"code_seconds": 0}, {}, 400, "invalid_grant"),
        50146: ({"app_key": "missing"}, {}, 400, "invalid_request"),
    }
    # Those that have a member more.
    POLICIES = {
        53003: ({"policy": "block at token"}, {"suberror": "message_only", "claims": "capolids"}),
        50076: ({"policy": "mfa at token"}, {"suberror": "basic_action", "claims": "capolids"}),
        65001: ({"consent": "missing"}, {"suberror": "consent_required"}),
    }

    def test_codes(self):
        for v2 in (False, True):
            for code, (settings, changes, status, error) in self.CASES.items():
                with self.subTest(code=code, v2=v2):
                    self.setUp()
                    self.twin.set(**settings)
                    self.assert_fault(self.redeem(v2=v2, **changes), code, status, error)

    def test_policies(self):
        for code, (settings, more) in self.POLICIES.items():
            with self.subTest(code=code):
                self.setUp()
                self.twin.set(**settings)
                self.assert_fault(self.redeem(), code, 400, "invalid_grant", **more)

    def test_code_redeemed_twice(self):
        code = self.code()
        self.assertEqual(self.redeem(code=code).status, 200)
        self.assert_fault(self.redeem(code=code), 54005, 400, "invalid_grant")

    def test_each_missing_parameter(self):
        for name in ("grant_type", "client_id", "code", "redirect_uri"):
            page = self.redeem(**{name: None})
            self.assert_fault(page, 900144, 400, "invalid_request")
            self.assertIn(f"'{name}'", page.body)

    def test_order_of_the_checks(self):
        """Parameters, tenant, form of the code, client, redirect URI, redemption."""
        wrong = (({"code": None}, 900144), ({"tenant": "other.example.org"}, 90002),
                 ({"code": "short"}, 9002313), ({"client_secret": "wrong"}, 7000215),
                 ({"redirect_uri": RELAY}, 500112))
        spent = self.code()
        self.redeem(code=spent)
        for first in range(len(wrong)):
            changes = {"code": spent}
            for change, _ in reversed(wrong[first:]):
                changes |= change
            code = wrong[first][1]
            self.assertIn(f"AADSTS{code}: ", self.redeem(**changes).body)

    def test_forced(self):
        """A code that no request of the device leads to."""
        self.twin.set(fail={"token": 50034})
        self.assert_fault(self.redeem(), 50034, 400, "invalid_grant")

    def test_older_forms(self):
        self.twin.set(era=2020)
        value = json.loads(self.redeem(client_secret="x").body)
        self.assertIn(".\r\nTrace ID: ", value["error_description"])
        self.twin.set(era=2018)
        value = json.loads(self.redeem(client_secret="x").body)
        self.assertTrue(value["error_description"].startswith("AADSTS70002: "))
        self.assertIn(" AADSTS7000215: ", value["error_description"])
        self.assertEqual(value["error_codes"], [70002, 7000215])
        self.assertNotIn("error_uri", value)

    def test_only_post(self):
        self.assert_page(self.get(self.path("token")), 900561)

    def test_success(self):
        old = json.loads(self.redeem(v2=False).body)
        self.assertEqual(old.keys(), {
            "token_type", "scope", "expires_in", "ext_expires_in", "expires_on", "not_before",
            "resource", "access_token", "id_token"})
        self.assertEqual(old["expires_in"], "3599")
        new = json.loads(self.redeem().body)
        self.assertEqual(new.keys(), {"token_type", "scope", "expires_in", "ext_expires_in",
                                      "access_token", "id_token"})
        self.assertEqual(new["expires_in"], 3599)

    def test_versions_mixed(self):
        for v2 in (False, True):
            self.assertEqual(self.redeem(code=self.code(v2=v2), v2=not v2).status, 200)
            self.twin.set(mixed_versions=70000)
            self.assertEqual(self.redeem(v2=v2).status, 200)
            self.assert_fault(self.redeem(code=self.code(v2=v2), v2=not v2), 70000, 400,
                              "invalid_grant")
            self.twin.set(mixed_versions=0)

    def test_client_credentials(self):
        for v2 in (False, True):
            with self.subTest(v2=v2):
                page = self.for_the_client(v2=v2)
                self.assertEqual(page.status, 200, page.body)
                self.assertNotIn("id_token", json.loads(page.body))
                self.assert_fault(self.for_the_client(v2=v2, client_secret="x"), 7000215, 401,
                                  "invalid_client")
                self.assert_fault(self.for_the_client(v2=v2, client_secret=None), 7000216, 401,
                                  "invalid_client")
                self.assert_fault(self.for_the_client(v2=v2, client_id="x"), 700016, 400,
                                  "unauthorized_client")
                self.assert_fault(self.for_the_client(v2=v2, tenant="other.example.org"), 90002,
                                  400, "invalid_request")
                self.assert_fault(self.for_the_client(v2=v2, tenant="common"), 50059, 400,
                                  "invalid_request")
        self.assert_fault(self.for_the_client(scope=None), 900144, 400, "invalid_request")
        self.assert_fault(self.for_the_client(scope="openid"), 1002012, 400, "invalid_scope")
        self.twin.set(secret_expired=True)
        self.assert_fault(self.for_the_client(), 7000222, 401, "invalid_client")


class EntraAuthorization(EntraTest):
    # Code: settings, changes of the request. All on the provider's page.
    PAGES = {
        900144: ({}, {"client_id": None}),
        90002: ({}, {"tenant": "other.example.org"}),
        700016: ({}, {"client_id": "other"}),
        50194: ({}, {"tenant": "common"}),
        50011: ({}, {"redirect_uri": RELAY}),
    }
    AFTER_THE_PASSWORD = {50105: {"assigned": False}, 53003: {"policy": "block"}}
    # Code: settings, changes, error. All sent back to the client, with its state.
    SENT_BACK = {
        700054: ({}, {"response_type": "id_token"}, "unsupported_response_type"),
        900144: ({}, {"scope": None}, "invalid_request"),
        50058: ({}, {"prompt": "none"}, "login_required"),
    }

    def test_pages(self):
        for v2 in (False, True):
            for code, (settings, changes) in self.PAGES.items():
                with self.subTest(code=code, v2=v2):
                    self.twin.set(**settings)
                    self.assert_page(self.authorize(v2=v2, **changes), code)
        self.twin.set(page_status=400)
        self.assert_page(self.authorize(client_id=None), 900144, 400)

    def test_pages_after_the_password(self):
        for code, settings in self.AFTER_THE_PASSWORD.items():
            with self.subTest(code=code):
                self.setUp()
                self.twin.set(**settings)
                self.assert_page(self.sign_in(self.authorize()), code)

    def test_accounts(self):
        for typed, password, code in (("bob@ad.example.net", "pass word", 50034),
                                      ("alice@ad.example.net", "wrong", 50126)):
            page = self.authorize()
            page = self.browser.post(
                urllib.parse.urljoin(page.url, page.form("login")["action"]),
                {"loginfmt": typed, "passwd": password})
            self.assertIn(f"AADSTS{code}: ", page.text)
            self.assertIn("loginfmt", page.body, "the form is there again")
        page = self.browser.post(page.url, {"loginfmt": "alice@other.example.org", "passwd": "x"})
        self.assert_page(page, 50020)

    def test_sent_back(self):
        for code, (settings, changes, error) in self.SENT_BACK.items():
            with self.subTest(code=code):
                self.twin.set(**settings)
                page = self.authorize(**changes)
                values = self.sent_back(page)
                self.assertEqual((values["error"], values["state"]), (error, "s+1"))
                self.assertTrue(values["error_description"].startswith(f"AADSTS{code}: "))
                self.assertEqual("#" in page.location, code == 700054)

    def test_consent(self):
        self.twin.set(consent="asked")
        page = self.sign_in(self.authorize())
        form = page.form("consent")
        there = urllib.parse.urljoin(page.url, form["action"])
        values = self.sent_back(self.browser.post(there, {"consent": "cancel"}))
        self.assertEqual((values["error"], values["error_subcode"]), ("access_denied", "cancel"))
        self.assertTrue(values["error_description"].startswith("AADSTS65004: "))
        self.assertIn("code", self.sent_back(self.browser.post(there, {"consent": "accept"})))
        self.twin.set(consent="missing")
        values = self.sent_back(self.authorize(prompt="none"))
        self.assertEqual(values["error"], "interaction_required")
        self.assertTrue(values["error_description"].startswith("AADSTS65001: "))

    def test_session_and_logout(self):
        """A second request asks for no password, one after the logout does."""
        self.code()
        self.assertIn("code", self.sent_back(self.authorize()))
        page = self.get(self.path("logout"), post_logout_redirect_uri=RELAY)
        self.assertEqual(self.sent_back(page, RELAY), {})
        self.assertIn("loginfmt", self.authorize().body)
        page = self.get(self.path("logout"), post_logout_redirect_uri="https://other.example.org/")
        self.assertEqual(page.status, 200)
        self.assertIn("You signed out", page.text)

    def test_request_for_the_token_endpoint(self):
        """The two URLs swapped."""
        self.assert_page(self.post(self.path("authorize"), self.form(code="x")), 900144)


class EntraDocuments(EntraTest):
    def document(self, path, **query):
        page = self.get(path, **query)
        self.assertEqual((page.status, page.headers.get_content_type()), (200, "application/json"))
        return json.loads(page.body)

    def test_discovery(self):
        url = self.twin.url
        for v2, issuer, keys in (
                (False, f"https://sts.windows.net/{TENANT}/", "/common/discovery/keys"),
                (True, f"{url}/{TENANT}/v2.0", f"/{TENANT}/discovery/v2.0/keys")):
            base = f"/{TENANT}/v2.0" if v2 else "/" + TENANT
            value = self.document(base + "/.well-known/openid-configuration")
            self.assertEqual(value["issuer"], issuer)
            self.assertEqual(value["jwks_uri"], url + keys)
            for name, what in (("authorization", "authorize"), ("token", "token"),
                               ("end_session", "logout")):
                self.assertEqual(value[name + "_endpoint"], url + self.path(what, v2))

    def test_common(self):
        value = self.document("/common/v2.0/.well-known/openid-configuration")
        self.assertEqual(value["issuer"], self.twin.url + "/{tenantid}/v2.0")
        self.assertEqual(value["token_endpoint"], self.twin.url + "/common/oauth2/v2.0/token")
        value = self.document("/organizations/.well-known/openid-configuration")
        self.assertEqual(value["issuer"], "https://sts.windows.net/{tenantid}/")
        self.twin.set(multi_tenant=True)
        self.assertEqual(self.redeem(code=self.code(tenant="common"), tenant="common").status, 200)

    def test_domain_names_the_tenant(self):
        value = self.document("/ad.example.net/v2.0/.well-known/openid-configuration")
        self.assertEqual(value["issuer"], f"{self.twin.url}/{TENANT}/v2.0")

    def test_tenant_in_upper_case(self):
        value = self.document(f"/{TENANT.upper()}/v2.0/.well-known/openid-configuration")
        self.assertEqual(value["issuer"], f"{self.twin.url}/{TENANT}/v2.0")

    def test_another_tenant(self):
        """It exists, has documents and the same keys, and does not know the application."""
        other = "0a0b0c0d-0000-4000-8000-000000000001"
        self.twin.set(other_tenants=[other])
        value = self.document(f"/{other}/v2.0/.well-known/openid-configuration")
        self.assertEqual(value["issuer"], f"{self.twin.url}/{other}/v2.0")
        keys = [[key["kid"] for key in self.document(f"/{tenant}/discovery/v2.0/keys")["keys"]]
                for tenant in (TENANT, other)]
        self.assertEqual(*keys)
        self.assert_page(self.authorize(tenant=other), 700016)
        self.assert_fault(self.redeem(tenant=other), 700016, 400, "unauthorized_client")
        self.assert_fault(self.for_the_client(tenant=other), 700016, 400, "unauthorized_client")

    def test_unknown_tenant(self):
        for tenant, code, error in (("other.example.org", 90002, "invalid_tenant"),
                                    ("nonsense", 900023, "invalid_request")):
            page = self.get(f"/{tenant}/v2.0/.well-known/openid-configuration")
            self.assert_fault(page, code, 400, error)

    def test_keys(self):
        for count in (4, 8):
            self.twin.set(keys=count)
            for path, v2 in (("/common/discovery/keys", False),
                             (f"/{TENANT}/discovery/v2.0/keys", True)):
                keys = self.document(path)["keys"]
                self.assertEqual(len({key["kid"] for key in keys}), count)
                for key in keys:
                    self._check_key(key, v2)

    def _check_key(self, key, v2):
        self.assertEqual(key.keys(), {"kty", "use", "kid", "x5t", "n", "e", "x5c"} |
                         ({"issuer"} if v2 else set()))
        certificate = base64.b64decode(key["x5c"][0])
        self.assertEqual(decoded(key["x5t"]), hashlib.sha1(certificate).digest())
        done = subprocess.run(["openssl", "x509", "-noout", "-modulus"], check=True, timeout=30,
                              input=ssl.DER_cert_to_PEM_cert(certificate).encode(),
                              stdout=subprocess.PIPE)
        self.assertEqual(done.stdout.decode().strip(), "Modulus=" + decoded(key["n"]).hex().upper())

    def test_rollover(self):
        """Between two fetches: another key signs, the one before is still published."""
        path = f"/{TENANT}/discovery/v2.0/keys"
        self.twin.set(rollover=1)
        token = json.loads(self.redeem().body)["id_token"]
        first = self.document(path)["keys"]
        self.twin.set(rollover=0)
        later = json.loads(self.redeem().body)["id_token"]
        second = self.document(path)["keys"]
        kid, new = parts_of(token)[0]["kid"], parts_of(later)[0]["kid"]
        self.assertNotEqual(kid, new)
        self.assertIn(kid, [key["kid"] for key in first])
        self.assertNotIn(new, [key["kid"] for key in first])
        self.assertLess({kid, new}, {key["kid"] for key in second})
        self.assertEqual(len(second), 4)

    def test_application_key(self):
        """It is published behind ?appid= alone."""
        self.twin.set(app_key="own")
        client = self.twin.settings.client_id
        token = json.loads(self.redeem().body)["id_token"]
        kid = parts_of(token)[0]["kid"]
        self.assertNotIn(kid, [key["kid"] for key in
                               self.document(f"/{TENANT}/discovery/v2.0/keys")["keys"]])
        for v2 in ("", "/v2.0"):
            value = self.document(f"/{TENANT}{v2}/.well-known/openid-configuration", appid=client)
            self.assertTrue(value["jwks_uri"].endswith("?appid=" + client))
            keys = json.loads(self.browser.get(value["jwks_uri"]).body)["keys"]
            self.assertEqual([key["kid"] for key in keys], [kid])
            self.assertTrue(signed_by(token, keys[0]))


class EntraIDToken(EntraTest):
    def token(self, v2, **options):
        token = json.loads(self.redeem(code=self.code(v2=v2, **options), v2=v2).body)["id_token"]
        keys = json.loads(self.get("/common/discovery/keys").body)["keys"]
        header, claims = parts_of(token)
        self.assertTrue(signed_by(token, next(key for key in keys if key["kid"] == header["kid"])))
        return header, claims

    def test_v1(self):
        header, claims = self.token(False)
        self.assertEqual(header, {"typ": "JWT", "alg": "RS256", "x5t": header["kid"],
                                  "kid": header["kid"]})
        self.assertEqual(claims["iss"], f"https://sts.windows.net/{TENANT}/")
        self.assertEqual((claims["tid"], claims["ver"], claims["nonce"]), (TENANT, "1.0", "n"))
        self.assertEqual(claims["unique_name"], "alice@ad.example.net")
        self.assertNotIn("email", claims)

    def test_v2(self):
        header, claims = self.token(True)
        self.assertEqual(header.keys(), {"typ", "alg", "kid"})
        self.assertEqual(claims["iss"], f"{self.twin.url}/{TENANT}/v2.0")
        self.assertEqual((claims["tid"], claims["ver"]), (TENANT, "2.0"))
        for name in ("unique_name", "email", "preferred_username"):
            self.assertNotIn(name, claims)
        claims = self.token(True, scope="openid profile")[1]
        self.assertEqual(claims["preferred_username"], "alice@ad.example.net")

    def test_email(self):
        self.assertIn("email", self.token(True, scope="openid email")[1])
        self.twin.set(email_claim=True)
        for v2 in (False, True):
            self.assertEqual(self.token(v2)[1]["email"], "alice@ad.example.net")

    def test_guest(self):
        self.twin.set(guest=True, upn="alice@other.example.org", email="alice@other.example.org")
        for v2 in (False, True):
            self.assertEqual(self.token(v2)[1]["email"], "alice@other.example.org")
        self.twin.set(external_name=True)
        stored = "alice_other.example.org#EXT#@ad.example.net"
        self.assertEqual(self.token(False)[1]["unique_name"], stored)
        self.assertEqual(self.token(True, scope="openid profile")[1]["preferred_username"], stored)

    def test_clock(self):
        """The provider's clock is in its tokens and in the header Date."""
        self.twin.set(clock_skew=-7200)
        now = time.time()
        self.assertAlmostEqual(self.token(True)[1]["exp"], now - 3600, delta=60)
        date = email.utils.parsedate_to_datetime(self.authorize().headers["Date"])
        self.assertAlmostEqual(date.timestamp(), now - 7200, delta=60)


class EntraSignIns(SignIns):
    twin_class = entra.Entra

    def test_both_versions(self):
        self.device.choose("azure")
        for title in self.twin.setups:
            with self.subTest(title=title):
                self.device.register(title)
                self.assert_signed_in(self.sign_in(), "azure")
                page = self.browser.get(self.sign_out().location)
                self.assertEqual(page.location, self.device.stage.device +
                                 "/webman/ssoclient/relay.html")
                page = self.browser.get(self.start().location)
                self.assertIn("loginfmt", page.body, "no password is asked for")

    def test_refusals(self):
        self.device.choose("azure")
        for title, settings, text in (
                ("azure v1.0", {"secret_expired": True}, "AADSTS7000222: "),
                ("azure v2.0", {"policy": "block at token"}, "AADSTS53003: "),
                ("azure v2.0", {"email_claim": False}, "cannot find the user name!"),
                ("azure v2.0", {"app_key": "own"}, "kid does not exist in Azure verified kyes"),
                ("azure v1.0", {"clock_skew": -7200}, "id_token expired.")):
            with self.subTest(text=text):
                self.browser = self.new_browser()
                self.twin.settings = self.saved
                self.device.register(title)
                self.twin.set(**settings)
                self.refused(text)

    def test_error_that_comes_back(self):
        self.device.choose("azure")
        self.twin.set(consent="asked")
        page = self.browser.get(self.start().location)
        page = self.twin.sign_in(self.browser, page)
        there = urllib.parse.urljoin(page.url, page.form("consent")["action"])
        back = self.browser.post(there, {"consent": "cancel"}).location
        self.assert_refused(self.browser.get(back), "denied", "provider refused",
                            ", error access_denied, error_description AADSTS65004: ")

    def test_guest_with_the_stored_name(self):
        """The device makes its name of the two parts around the @ of the stored name."""
        self.device.choose("azure")
        self.device.register("azure v1.0")
        domain = self.twin.settings.tenant_domain
        self.twin.set(guest=True, external_name=True, upn="alice@other.example.org")
        self.relay(self.sign_in())
        self.assertEqual(self.user(), domain.upper() + "\\alice_other.example.org#EXT#")


if __name__ == "__main__":
    unittest.main()
