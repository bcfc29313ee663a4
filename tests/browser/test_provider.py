"""What a provider may do wrong, and what the person at the browser then meets."""

import hashlib
import hmac
import json
import time
import unittest

from providers.scripted import Script
from scenario import ENGLISH, Scenario

PROFILES = ("azure", "websphere")
NOT_JSON = "provider-error", "parse json falied"
NO_ANSWER = "unreachable", "parse json falied"
NO_KEY = "not-verified", "kid does not exist in Azure verified kyes"
NO_TOKEN = "provider-error", "we cannot find key 'id_token' in response!"
HTML = "<!DOCTYPE html><html><body><h1>Down for maintenance</h1></body></html>"
DEADLINE = 3


def claim(name, value):
    return Script(claims=lambda claims: {**claims, name: value})


def header(**values):
    return Script(header=lambda given: {**given, **values})


def answers_html(path):
    """An answer for people instead of the document at a path."""
    if path == "token":
        return Script(token_answer=lambda *_: (200, "text/html", HTML))
    return Script(document=lambda asked, *answer: (200, "text/html", HTML) if asked == path
                  else answer)


class Refusals(Scenario):
    """One bad answer each. Beside the profile: what the provider does, the code of the failure,
    its text in the log, and the lines there that lead to it."""

    TABLE = {
        "refused_at_the_provider": (
            PROFILES, Script(refuse={"error": "access_denied"}),
            "denied", "provider refused"),
        "audience_of_another_client": (PROFILES, claim("aud", "other-client"), "not-verified", "client ID invalid"),
        "tenant_of_somebody_else": (("azure",), claim("tid", "tenant-8"), "not-verified", "tenant ID invalid"),
        "expired": (PROFILES, claim("exp", int(time.time()) - 5), "not-verified", "id_token expired."),
        "algorithm_none": (
            PROFILES, Script(header=lambda given: {**given, "alg": "none"}, sign=lambda _: b""),
            "not-verified", "none algorithm is not supported"),
        "rsa_for_websphere": (("websphere",), header(alg="RS256"),
                              "not-verified", "RS256 algorithm is not supported"),
        "hmac_without_key_identity_for_azure": (
            ("azure",), Script(header=lambda _: {"alg": "HS256"}), *NO_KEY),
        "altered_signature": (("azure",), Script(signature=lambda made: bytes([made[0] ^ 1]) +
                                                 made[1:]),
                              "not-verified", "verify rsa signature failed", "EVP_DigestVerifyFinal failed"),
        "altered_hmac": (("websphere",), Script(signature=lambda made: bytes([made[0] ^ 1]) +
                                                made[1:]),
                         "not-verified", "verify hmac signature failed"),
        "nonce_of_another_login": (PROFILES, claim("nonce", "other"),
                                   "not-verified", "nonce does not belong to this login"),
        "html_from_the_token_endpoint": (PROFILES, answers_html("token"), *NOT_JSON),
        "html_for_the_discovery_document": (
            ("azure",), answers_html("wellknown"), *NO_KEY, "bad wellknown json format."),
        "html_for_the_key_set": (
            ("azure",), answers_html("keys"), *NO_KEY,
            "request wellknown uri bad wellknown json format.."),
        "token_answer_cut_off": (PROFILES, Script(cut=("token",)), *NOT_JSON,
                                 "request token uri Transferred a partial file."),
        "discovery_document_cut_off": (("azure",), Script(cut=("wellknown",)), *NO_KEY,
                                       "Transferred a partial file"),
        "key_set_cut_off": (("azure",), Script(cut=("keys",)), *NO_KEY,
                            "request wellknown uri Transferred a partial file."),
    }

    def refused(self, profile, script, code, text, *lines):
        self.device.provider.script = script
        self.to_provider(profile)
        if script.refuse is None:
            self.enter()
        self.assert_refused_here(code, text, lines)


def _add(name, profile, row):
    setattr(Refusals, f"test_{name}_{profile}",
            lambda self: self.refused(profile, *row))


for _name, (_profiles, *_row) in Refusals.TABLE.items():
    for _profile in _profiles:
        _add(_name, _profile, _row)


class Secrets(Scenario):
    """Device and provider do not agree on a secret or a key."""

    def test_wrong_client_secret_azure(self):
        self.change("azure", client_secret="another")
        self.sign_in("azure")
        self.assert_refused_here("provider-error", '{"error":"invalid_client"}')

    def test_wrong_client_secret_websphere(self):
        self.change("websphere", client_secret="another")
        self.sign_in("websphere")
        self.assert_refused_here(*NO_TOKEN)

    def test_wrong_tenant_in_the_settings(self):
        self.change("azure", tenant_id="tenant-8")
        self.sign_in("azure")
        self.assert_refused_here("not-verified", "tenant ID invalid")

    def test_signed_under_another_secret(self):
        self.device.provider.script = Script(
            sign=lambda data: hmac.new(b"guessed", data, hashlib.sha256).digest())
        self.sign_in("websphere")
        self.assert_refused_here("not-verified", "verify hmac signature failed")

    def test_hmac_under_the_published_key(self):
        """The forger takes what everyone can read as the secret of an HMAC."""
        published = json.dumps(self.device.provider.document("azure", "keys")[2]).encode()
        self.device.provider.script = Script(
            header=lambda given: {**given, "alg": "HS256"},
            sign=lambda data: hmac.new(published, data, hashlib.sha256).digest())
        self.sign_in("azure")
        self.assert_refused_here("not-verified", "HS256 algorithm is not supported")

    def test_key_rotated_between_two_logins(self):
        self.sign_in("azure")
        self.assert_in("azure")
        self.sign_out()
        self.assert_out()
        self.device.provider.rotate("key-2")
        self.sign_in("azure")
        self.assert_in("azure")

    def test_signed_with_the_key_from_before_the_rotation(self):
        before = self.device.provider.signer("azure")
        self.device.provider.rotate("key-3")
        self.device.provider.script = Script(header=lambda given: {**given, "kid": "key-1"},
                                             sign=before)
        self.sign_in("azure")
        self.assert_refused_here(*NO_KEY)

    def test_another_key_under_the_same_name(self):
        before = self.device.provider.signer("azure")
        self.device.provider.rotate("key-1")
        self.device.provider.script = Script(sign=before)
        self.sign_in("azure")
        self.assert_refused_here("not-verified", "verify rsa signature failed",
                                 lines=("EVP_DigestVerifyFinal failed",))


class Unreachable(Scenario):
    """The device does not get through to the provider, or to the right one."""

    def test_down_before_the_login(self):
        """The person sees the browser's own page; the device has nothing to say yet."""
        self.device.provider.stop()
        self.addCleanup(self.device.provider.start)
        self.to_provider("azure")
        self.tab.wait(lambda: "ERR_CONNECTION_REFUSED" in self.tab.text, "the browser's own page")
        self.assert_nobody()

    def test_down_after_the_login(self):
        self.addCleanup(self.device.provider.start)
        self.device.provider.script = Script(leave=True)
        self.sign_in("azure")
        self.assert_refused_here(*NO_ANSWER,
                                 lines=("request token uri Couldn't connect to server.",))

    def test_unknown_name(self):
        self.change("websphere", token_endpoint="https://nowhere.invalid/token")
        self.sign_in("websphere")
        self.assert_refused_here(*NO_ANSWER,
                                 lines=("request token uri Couldn't resolve host name.",))

    def second_server(self, certificate):
        """The same provider at another port, with that certificate; returns its address."""
        port = self.device.stage.provider_port + 1
        self.device.provider.listen(port, certificate)
        self.addCleanup(self.device.provider.start)
        self.addCleanup(self.device.provider.stop)
        return f"https://{self.device.stage.provider_name}:{port}"

    WRONG = "SSL peer certificate or SSH remote key was not OK"

    def test_token_endpoint_with_an_unknown_certificate(self):
        stage = self.device.stage
        server = self.second_server(stage.unknown_certificate(stage.provider_name))
        for profile in PROFILES:
            with self.subTest(profile=profile):
                self.change(profile, token_endpoint=f"{server}/{profile}/token")
                self.device.provider.seen.clear()
                self.sign_in(profile)
                self.assert_refused_here(*NO_ANSWER, lines=(f"request token uri {self.WRONG}.",))
                self.assertFalse([path for _, path, _, _ in self.device.provider.seen
                                  if path.endswith("/token")], "the code went to a stranger")

    def test_token_endpoint_with_a_certificate_for_another_name(self):
        server = self.second_server(self.device.stage.device_certificate)
        self.change("websphere", token_endpoint=server + "/websphere/token")
        self.sign_in("websphere")
        self.assert_refused_here(*NO_ANSWER, lines=(f"request token uri {self.WRONG}.",))

    def test_keys_from_an_unknown_certificate(self):
        stage = self.device.stage
        server = self.second_server(stage.unknown_certificate(stage.provider_name))
        self.change("azure", wellknown=server + "/azure/wellknown")
        self.sign_in("azure")
        self.assert_refused_here(*NO_KEY, lines=(self.WRONG,))

    def test_login_page_with_an_unknown_certificate(self):
        """Here it is the browser that warns, before a password is typed."""
        stage = self.device.stage
        server = self.second_server(stage.unknown_certificate(stage.provider_name))
        self.change("azure", authorization_endpoint=server + "/azure/authorization")
        self.to_provider("azure")
        self.tab.wait(lambda: "ERR_CERT_AUTHORITY_INVALID" in self.tab.text,
                      "the browser's warning")
        self.assertEqual(self.tab.driver.find_elements("css selector", "#password"), [])
        self.assert_nobody()


class Silent(Scenario):
    """A provider that takes the request and never answers: the device gives up."""

    def setUp(self):
        super().setUp()
        self.device.options(deadline=DEADLINE)

    def given_up(self, profile, path):
        self.device.provider.script = Script(silent=(path,))
        begun = time.monotonic()
        self.sign_in(profile)
        self.assert_refused_here("timeout", "provider did not answer in time")
        self.assertGreater(time.monotonic() - begun, DEADLINE)
        shown, = self.tab.waited()
        self.assertEqual(shown["text"].split("\n\n"), [
            ENGLISH["device"] + "\n" + ENGLISH["waiting"], ENGLISH["waiting-text"],
            ENGLISH["waiting-link"]])
        self.assertGreater(shown["seconds"], DEADLINE - 0.5)

    def test_token_endpoint(self):
        self.given_up("websphere", "token")

    def test_key_set(self):
        self.given_up("azure", "keys")


if __name__ == "__main__":
    unittest.main()
