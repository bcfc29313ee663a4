"""The twins of Entra ID and Liberty: every endpoint and code over HTTPS, and sign-ins with both."""

import base64
import hashlib
import hmac
import json
import os
import re
import ssl
import subprocess
import sys
import tempfile
import unittest
import urllib.parse

from device import HERE, DeviceTest, device, values_of
from browser import Browser, BrowserError
from providers import entra, liberty
from scene import PROVIDER

TENANT = entra.Settings().tenant_id
CALLBACK, RELAY = "https://device.example.net/login.cgi", "https://device.example.net/relay.html"
PROVIDERS = os.path.join(HERE, "..", "demo", "providers")


def decoded(part):
    return base64.urlsafe_b64decode(part + "=" * (-len(part) % 4))


def parts_of(token):
    """Header and claims of a token."""
    return [json.loads(decoded(part)) for part in token.split(".")[:2]]


def signed_by(token, key):
    """Whether an RS256 token is signed with the key of a key set."""
    signed, _, signature = token.rpartition(".")
    n, e = (int.from_bytes(decoded(key[name]), "big") for name in "ne")
    plain = pow(int.from_bytes(decoded(signature), "big"), e, n)
    return plain & ((1 << 256) - 1) == int(hashlib.sha256(signed.encode()).hexdigest(), 16)


class TwinTest(unittest.TestCase):
    twin_class = None
    defaults = {}
    longMessage = True

    @classmethod
    def setUpClass(cls):
        cls.twin = cls.twin_class()
        port = cls.twin.listen(0, device().stage.certificate(PROVIDER))
        cls.twin.url = f"https://{PROVIDER}:{port}"

    @classmethod
    def tearDownClass(cls):
        cls.twin.stop()

    def setUp(self):
        self.twin.settings = self.twin.settings_class()
        self.twin.set(**self.defaults)
        self.twin.codes.clear()
        self.twin.log.clear()
        self.browser = Browser(device().stage.authority)

    def get(self, path, **query):
        return self.browser.get(
            self.twin.url + path + ("?" + urllib.parse.urlencode(query) if query else ""))

    def post(self, path, form, **headers):
        form = {name: value for name, value in form.items() if value is not None}
        return self.browser.post(self.twin.url + path, form, headers)

    def followed(self, page):
        """The page at the end of the redirects within the twin."""
        while page.location is not None and page.location.startswith(self.twin.url):
            page = self.browser.get(page.location)
        return page

    def sign_in(self, page):
        """From a page of the twin to the redirect that leads back to the client."""
        page = self.followed(page)
        if page.location is None:
            page = self.followed(self.twin.sign_in(self.browser, page))
        return page

    def sent_back(self, page, base=CALLBACK):
        self.assertEqual(page.status, 302, page.body)
        self.assertEqual(re.split("[?#]", page.location)[0], base)
        return values_of(page.location)


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
            value = self.document(f"/{TENANT}{'/v2.0' if v2 else ''}/.well-known/openid-configuration")
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
        self.twin.set(clock_skew=-7200)
        claims = self.token(True)[1]
        self.assertLess(claims["exp"], self.twin.now() + 7200 - 3000)


class LibertyTest(TwinTest):
    twin_class = liberty.Liberty
    defaults = {"client_secret": "kept" * 10, "redirect_uris": [CALLBACK], "logout_uris": [RELAY],
                "password": "pass word"}
    BASE = "/oidc/endpoint/OP"

    def authorize(self, **changes):
        query = {"client_id": "device", "redirect_uri": CALLBACK, "response_type": "code",
                 "scope": "openid profile email", "state": "s+1", "nonce": "n", **changes}
        return self.get(self.BASE + "/authorize",
                        **{name: value for name, value in query.items() if value is not None})

    def code(self):
        return self.sent_back(self.sign_in(self.authorize()))["code"]

    def form(self, **changes):
        return {"grant_type": "authorization_code", "client_id": "device",
                "client_secret": self.twin.settings.client_secret, "redirect_uri": CALLBACK,
                **changes}

    def redeem(self, **changes):
        if "code" not in changes:
            changes["code"] = self.code()
        return self.post(self.BASE + "/token", self.form(**changes))

    def basic(self, secret=None, **changes):
        """The same with the client's credentials in a header."""
        pair = "device:" + (secret or self.twin.settings.client_secret)
        return self.post(self.BASE + "/token", self.form(
            **{"client_id": None, "client_secret": None, "code": self.code(), **changes}),
            Authorization="Basic " + base64.b64encode(pair.encode()).decode())

    def assert_fault(self, page, code, status, error):
        self.assertEqual(page.status, status, page.body)
        value = json.loads(page.body)
        self.assertEqual(value.keys(), {"error", "error_description"})
        self.assertEqual(value["error"], error)
        self.assertTrue(value["error_description"].startswith(code + ": "), page.body)
        self.assertIn(value["error_description"], self.twin.log)


class LibertyToken(LibertyTest):
    # Code: settings, changes of the request, status, error.
    CASES = {
        "CWOAU0025E": ({}, {"grant_type": "password"}, 400, "unsupported_grant_type"),
        "CWOAU0029E": ({}, {"code": "unknown"}, 400, "invalid_grant"),
        "CWOAU0032E": ({}, {"redirect_uri": RELAY}, 400, "invalid_grant"),
        "CWOAU0033E": ({}, {"code": None}, 400, "invalid_request"),
        "CWOAU0035E": ({"public_client": True}, {"client_secret": None}, 400, "invalid_client"),
        "CWOAU0058E": ({"code_seconds": 0}, {}, 400, "invalid_grant"),
        "CWWKS1406E": ({}, {"client_secret": "wrong"}, 401, "invalid_client"),
        "CWWKS1455E": ({"algorithm": "HS512"}, {}, 400, "server_error"),
    }

    def test_codes(self):
        for code, (settings, changes, status, error) in self.CASES.items():
            with self.subTest(code=code):
                self.setUp()
                self.twin.set(**settings)
                self.assert_fault(self.redeem(**changes), code, status, error)

    def test_unknown_client_is_like_a_wrong_secret(self):
        self.assert_fault(self.redeem(client_id="other"), "CWWKS1406E", 401, "invalid_client")

    def test_no_client(self):
        self.assert_fault(self.redeem(client_id=None), "CWWKS1406E", 400, "invalid_request")

    def test_redeemed_twice(self):
        code = self.code()
        self.assertEqual(self.redeem(code=code).status, 200)
        self.assert_fault(self.redeem(code=code), "CWOAU0029E", 400, "invalid_grant")

    def test_client_comes_first(self):
        self.assert_fault(self.redeem(client_secret="wrong", grant_type="x", code="x"),
                          "CWWKS1406E", 401, "invalid_client")

    def test_registered_method(self):
        self.assert_fault(self.basic(), "CWWKS1406E", 401, "invalid_client")
        self.twin.set(auth_method="basic")
        self.assertEqual(self.basic().status, 200)
        page = self.redeem()
        self.assert_fault(page, "CWWKS1406E", 401, "invalid_client")
        self.assertNotIn("WWW-Authenticate", page.headers)
        self.assertIn('error="invalid_client"', self.basic("wrong").headers["WWW-Authenticate"])
        self.twin.set(auth_method="any")
        self.assertEqual((self.basic().status, self.redeem().status), (200, 200))

    def test_least_length_of_the_secret(self):
        for algorithm, length in (("HS256", 32), ("HS384", 48), ("HS512", 64)):
            self.twin.set(algorithm=algorithm, client_secret="x" * length)
            self.assertEqual(self.redeem().status, 200)
            self.twin.set(client_secret="x" * (length - 1))
            self.assert_fault(self.redeem(), "CWWKS1455E", 400, "server_error")
            self.twin.set(secret_length_checked=False)
            self.assertEqual(self.redeem().status, 200)
            self.twin.set(secret_length_checked=True)

    def test_client_credentials(self):
        form = {"grant_type": "client_credentials", "redirect_uri": None, "code": None}
        page = self.redeem(**form)
        self.assertEqual(page.status, 200)
        self.assertEqual(json.loads(page.body).keys(),
                         {"access_token", "token_type", "expires_in", "scope"})
        self.assert_fault(self.redeem(**form, client_secret="wrong"), "CWWKS1406E", 401,
                          "invalid_client")
        self.twin.set(grant_types=["authorization_code"])
        self.assert_fault(self.redeem(**form), "CWOAU0025E", 400, "unsupported_grant_type")
        self.twin.set(grant_types=["client_credentials"], public_client=True, public_clients=True)
        self.assert_fault(self.redeem(**form, client_secret=None), "CWOAU0071E", 401,
                          "invalid_client")

    def test_id_token(self):
        answer = json.loads(self.redeem().body)
        token = answer["id_token"]
        header, claims = parts_of(token)
        self.assertEqual(header, {"alg": "HS256"})
        self.assertEqual(claims.keys(), {"iss", "iat", "sub", "exp", "aud", "realmName", "nonce",
                                         "uniqueSecurityName", "at_hash", "sid"})
        self.assertEqual((claims["aud"], claims["sub"], claims["nonce"]), ("device", "alice", "n"))
        self.assertEqual(claims["iss"], self.twin.url + self.BASE)
        half = hashlib.sha256(answer["access_token"].encode()).digest()[:16]
        self.assertEqual(decoded(claims["at_hash"]), half)
        signed, _, signature = token.rpartition(".")
        self.assertEqual(decoded(signature), hmac.digest(
            self.twin.settings.client_secret.encode(), signed.encode(), "sha256"))

    def test_rsa(self):
        self.twin.set(algorithm="RS256")
        token = json.loads(self.redeem().body)["id_token"]
        keys = json.loads(self.get(self.BASE + "/jwk").body)["keys"]
        self.assertTrue(signed_by(token, keys[0]))

    def test_introspection(self):
        token = json.loads(self.redeem().body)["access_token"]
        client = {"client_id": "device", "client_secret": self.twin.settings.client_secret}
        there = self.BASE + "/introspect"
        value = json.loads(self.post(there, {**client, "token": token}).body)
        self.assertEqual((value["active"], value["sub"], value["realmName"]),
                         (True, "alice", "BasicRealm"))
        value = json.loads(self.post(there, {**client, "token": "x"}).body)
        self.assertEqual(value, {"active": False})
        self.assert_fault(self.post(there, client), "CWWKS1405E", 400, "invalid_request")
        self.assert_fault(self.post(there, {**client, "client_secret": "x", "token": token}),
                          "CWWKS1406E", 401, "invalid_client")


class LibertyPages(LibertyTest):
    def assert_page(self, page, code, status=200):
        self.assertEqual((page.status, page.headers.get_content_type()), (status, "text/html"))
        self.assertTrue(page.text.split(" ", 2)[2].startswith(code + ": "), page.text)
        self.assertTrue(any(line.startswith(code) for line in self.twin.log))

    def test_error_pages(self):
        for code, changes in (("CWOAU0033E", {"client_id": None}),
                              ("CWOAU0061E", {"client_id": "other"}),
                              ("CWOAU0062E", {"redirect_uri": RELAY})):
            self.assert_page(self.authorize(**changes), code)
        self.twin.set(page_status=400)
        self.assert_page(self.authorize(client_id="other"), "CWOAU0061E", 400)

    def test_sent_back(self):
        for code, kind, error in (("CWOAU0027E", "id_token", "unsupported_response_type"),
                                  ("CWOAU0033E", "", "invalid_request")):
            values = self.sent_back(self.authorize(response_type=kind))
            self.assertEqual((values["error"], values["state"]), (error, "s+1"))
            self.assertTrue(values["error_description"].startswith(code + ": "))

    def test_login(self):
        page = self.authorize()
        self.assertEqual(page.location, self.twin.url + "/oidc/login.jsp")
        page = self.browser.get(page.location)
        there = urllib.parse.urljoin(page.url, page.form("login")["action"])
        page = self.browser.post(there, {"j_username": "alice", "j_password": "wrong"})
        self.assertIn("Wrong user name or password.", page.text)
        page = self.browser.post(there, {"j_username": "alice", "j_password": "pass word"})
        self.assertIn("code", self.sent_back(self.browser.get(page.location)))
        self.assertIn("code", self.sent_back(self.authorize()), "asked for the password again")

    def test_documents(self):
        value = json.loads(self.get(self.BASE + "/.well-known/openid-configuration").body)
        issuer = self.twin.url + self.BASE
        for name, what in (("issuer", ""), ("authorization_endpoint", "/authorize"),
                           ("token_endpoint", "/token"), ("jwks_uri", "/jwk"),
                           ("end_session_endpoint", "/end_session"),
                           ("introspection_endpoint", "/introspect")):
            self.assertEqual(value[name], issuer + what)
        self.assertEqual(json.loads(self.get(self.BASE + "/jwk").body), {"keys": []})
        for path in ("/oidc/endpoint/OTHER/token", self.BASE + "/nothing", "/"):
            self.assertEqual(self.get(path).status, 404)

    def logout(self, **query):
        return self.get(self.BASE + "/end_session", **query)

    def test_logout(self):
        """It returns with an ID token only; the session ends in any case."""
        token = json.loads(self.redeem().body)["id_token"]
        out, wrong = (self.twin.url + "/oidc/end_session_" + name for name in
                      ("logout.html", "error.html"))
        self.assertEqual(self.logout(post_logout_redirect_uri=RELAY).location, out)
        self.assertTrue(self.twin.log[-1].startswith("CWWKS1636E: "))
        self.assertEqual(self.authorize().location, self.twin.url + "/oidc/login.jsp")
        self.assertEqual(self.logout(post_logout_redirect_uri=RELAY, id_token_hint=token).location,
                         RELAY)
        self.assertEqual(self.logout(post_logout_redirect_uri="https://other.example.org/",
                                     id_token_hint=token).location, out)
        self.assertEqual(self.logout(id_token_hint=token[:-4] + "AAAA").location, wrong)
        self.assertEqual(self.logout().location, out)
        self.assertIn("You are logged out.", self.browser.get(out).text)
        self.assertIn("The logout failed", self.browser.get(wrong).text)

    def test_forced(self):
        self.twin.set(fail={"token": "CWOAU0061E", "authorize": "CWOAU0058E"})
        self.assertEqual(self.post(self.BASE + "/token", self.form(code="x")).status, 400)
        self.assert_page(self.authorize(), "CWOAU0058E")


class Alone(unittest.TestCase):
    """The twins as programs of their own, set up from outside."""

    def start(self, name, settings):
        certificate, key = device().stage.certificate(PROVIDER)
        program = subprocess.Popen(
            [sys.executable, "-B", f"{PROVIDERS}/{name}.py", "--certificate", certificate, "--key",
             key, "--host", PROVIDER, "--settings", settings], stdout=subprocess.PIPE, text=True)
        self.addCleanup(program.stdout.close)
        self.addCleanup(program.wait, 10)
        self.addCleanup(program.terminate)
        self.browser = Browser(device().stage.authority)
        return program.stdout.readline().strip()

    def set(self, url, **values):
        return self.browser.call("POST", url + "/-/settings", values)

    def test_entra(self):
        url = self.start("entra", '{"client_secret": "one", "keys": 1}')
        there = f"{url}/{TENANT}/oauth2/token"
        form = {"grant_type": "client_credentials", "client_id": entra.Settings().client_id,
                "client_secret": "one"}
        self.assertEqual(self.browser.post(there, form).status, 200)
        self.assertEqual(self.set(url, client_secret="two")["client_secret"], "two")
        self.assertIn("AADSTS7000215: ", self.browser.post(there, form).body)
        requests = self.browser.call("GET", url + "/-/requests")
        self.assertEqual([request[1] for request in requests], [f"/{TENANT}/oauth2/token"] * 2)
        keys = f"{url}/common/discovery/keys"
        before = self.browser.get(keys).body
        self.assertEqual(self.browser.get(keys).body, before)
        self.browser.call("POST", url + "/-/rotate")
        self.assertNotEqual(self.browser.get(keys).body, before)

    def test_liberty_with_a_settings_file(self):
        with tempfile.NamedTemporaryFile("w", suffix=".json") as file:
            json.dump({"provider": "Login", "client_secret": "x"}, file)
            file.flush()
            url = self.start("liberty", file.name)
        page = self.browser.get(url + "/oidc/endpoint/Login/authorize?client_id=other")
        self.assertIn("CWOAU0061E: ", page.text)
        self.assertTrue(self.browser.call("GET", url + "/-/log")[0].startswith("CWOAU0061E: "))

    def test_unknown_settings(self):
        url = self.start("liberty", "{}")
        for body in ({"nothing": 1}, {"realm": 1}, [], "realm"):
            with self.subTest(body=body), self.assertRaisesRegex(BrowserError, "answered 400"):
                self.browser.call("POST", url + "/-/settings", body)


class SignIns(DeviceTest):
    """The login program and the library, with each twin."""
    twin_class = None

    @classmethod
    def setUpClass(cls):
        device().visit(cls.twin_class)

    @classmethod
    def tearDownClass(cls):
        device().come_home()

    def setUp(self):
        super().setUp()
        self.twin = self.device.provider
        self.saved = self.twin.settings

    def tearDown(self):
        self.twin.settings = self.saved

    def callback_url(self, browser=None, **options):
        browser = browser or self.browser
        page = browser.get(self.start(browser, **options).location)
        for _ in range(4):
            if page.location is None:
                page = self.twin.sign_in(browser, page)
            elif page.location.startswith(self.twin.url):
                page = browser.get(page.location)
        self.assertTrue(page.location.startswith(self.device.login_url + "?"), page.location)
        return page.location

    def refused(self, *texts):
        values = self.relay(self.sign_in())
        self.assertEqual(values["success"], "false")
        log = "\n".join(self.log())
        for text in texts:
            self.assertIn(text, log)
        self.assertIsNone(self.user())


class EntraSignIns(SignIns):
    twin_class = entra.Entra

    def test_both_versions(self):
        self.device.choose("azure")
        for title in self.twin.setups:
            with self.subTest(title=title):
                self.device.register(title)
                self.assert_signed_in(self.sign_in(), "azure")
                page = self.browser.post(self.device.login_url + "?action=logout", {})
                page = self.browser.get(page.location)
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
        self.assert_refused(self.browser.get(back), "provider refused: access_denied")

    def test_guest_with_the_stored_name(self):
        """The device takes what stands before and behind the @ of the stored name."""
        self.device.choose("azure")
        self.device.register("azure v1.0")
        domain = self.twin.settings.tenant_domain
        self.twin.set(guest=True, external_name=True, upn="alice@other.example.org")
        self.relay(self.sign_in())
        self.assertEqual(self.user(), domain.upper() + "\\alice_other.example.org#EXT#")


class LibertySignIns(SignIns):
    twin_class = liberty.Liberty

    def test_each_algorithm(self):
        self.twin.set(secret_length_checked=False)
        for algorithm in ("HS256", "HS384", "HS512"):
            with self.subTest(algorithm=algorithm):
                self.browser = self.new_browser()
                self.twin.set(algorithm=algorithm)
                self.assert_signed_in(self.sign_in(), "websphere")

    def test_refusals(self):
        for settings, text in (
                ({"client_secret": "other" * 12}, "we cannot find key 'id_token' in response!"),
                ({"auth_method": "basic"}, "we cannot find key 'id_token' in response!"),
                ({"algorithm": "HS512"}, "we cannot find key 'id_token' in response!"),
                ({"algorithm": "RS256"}, "RS256 algorithm is not supported"),
                ({"clock_skew": -8000}, "id_token expired.")):
            with self.subTest(text=text, **settings):
                self.browser = self.new_browser()
                self.twin.settings = self.saved
                self.twin.set(**settings)
                self.refused(text)

    def test_logout_ends_on_the_providers_page(self):
        self.assert_signed_in(self.sign_in(), "websphere")
        page = self.browser.post(self.device.login_url + "?action=logout", {})
        page = self.browser.get(page.location)
        self.assertEqual(page.location, self.twin.url + "/oidc/end_session_logout.html")
        self.assertIsNone(self.user())
        page = self.browser.get(self.start().location)
        self.assertEqual(page.location, self.twin.url + "/oidc/login.jsp", "no password is asked")


class Listed(unittest.TestCase):
    """The codes that an administrator meets, each with a case above."""
    ENTRA = {7000222, 7000215, 7000218, 700016, 700025, 50011, 500112, 90002, 9002313, 900144, 90014,
             70000, 70008, 54005, 53003, 50076, 50146, 65001, 65004, 50020, 50105, 50034, 700054}
    LIBERTY = {"CWOAU0025E", "CWOAU0029E", "CWOAU0032E", "CWOAU0033E", "CWOAU0035E", "CWOAU0058E",
               "CWOAU0061E", "CWWKS1406E", "CWWKS1455E", "CWWKS1636E"}

    def test_each_has_a_case(self):
        singly = {54005, 65004, 50020, 50034}  # test_code_redeemed_twice, test_consent, test_accounts
        self.assertEqual(self.ENTRA - singly, self.ENTRA & (
            EntraToken.CASES.keys() | EntraToken.POLICIES.keys() |
            EntraAuthorization.AFTER_THE_PASSWORD.keys() | EntraAuthorization.SENT_BACK.keys()))
        self.assertEqual(self.LIBERTY - LibertyToken.CASES.keys(), {"CWOAU0061E", "CWWKS1636E"})
        self.assertLessEqual(self.LIBERTY, liberty.FAULTS.keys())
        self.assertLessEqual(self.ENTRA, entra.entra_codes.FAULTS.keys())


if __name__ == "__main__":
    unittest.main()
