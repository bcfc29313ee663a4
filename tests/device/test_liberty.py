"""The twin of WebSphere Liberty: every endpoint and code over HTTPS, and sign-ins through the
library."""

import base64
import hashlib
import hmac
import json
import unittest
import urllib.parse

from twin_test import CALLBACK, RELAY, SignIns, TwinTest, decoded, parts_of, signed_by
from providers import liberty


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
        page = self.post(self.BASE + "/token", self.form(client_id=None), Authorization="Basic ??")
        self.assert_fault(page, "CWWKS1406E", 401, "invalid_client")
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
                ({"client_secret": "other" * 12}, "error_description CWWKS1406E: "),
                ({"auth_method": "basic"}, "error_description CWWKS1406E: "),
                ({"algorithm": "HS512"}, "error_description CWWKS1455E: "),
                ({"algorithm": "RS256"}, "RS256 algorithm is not supported"),
                ({"clock_skew": -8000}, "id_token expired.")):
            with self.subTest(text=text, **settings):
                self.browser = self.new_browser()
                self.twin.settings = self.saved
                self.twin.set(**settings)
                self.refused(text)

    def test_logout_comes_back(self):
        """The login program sends the ID token along; without it the person would stay there."""
        self.assert_signed_in(self.sign_in(), "websphere")
        page = self.browser.get(self.sign_out().location)
        self.assertEqual(page.location,
                         self.device.stage.device + "/webman/ssoclient/relay.html")
        self.assertIsNone(self.user())
        page = self.browser.get(self.start().location)
        self.assertEqual(page.location, self.twin.url + "/oidc/login.jsp", "no password is asked")


if __name__ == "__main__":
    unittest.main()
