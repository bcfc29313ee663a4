"""The twins as programs of their own, and the list of codes that they must know."""

import json
import os
import re
import socket
import subprocess
import sys
import tempfile
import unittest

import test_entra
import test_liberty
from device import HERE, device
from browser import Browser, BrowserError
from providers import entra, liberty
from scene import PROVIDER

TENANT = entra.Settings().tenant_id
PROVIDERS = os.path.join(HERE, "..", "..", "demo", "providers")


class Alone(unittest.TestCase):
    """The twins as programs of their own, set up from outside."""

    def start(self, name, settings, *more):
        certificate, key = device().stage.certificate(PROVIDER)
        program = subprocess.Popen(
            [sys.executable, "-B", f"{PROVIDERS}/{name}.py", "--certificate", certificate, "--key",
             key, "--host", PROVIDER, "--settings", settings, *more],
            stdout=subprocess.PIPE, text=True)
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

    def test_other_address(self):
        """Only IPv6 reaches it then."""
        url = self.start("entra", '{"keys": 1}', "--address", "::1")
        port = int(url.rsplit(":", 1)[1])
        socket.create_connection(("::1", port), 10).close()
        with self.assertRaises(ConnectionRefusedError):
            socket.create_connection(("127.0.0.1", port), 10)

    def test_settings_that_cannot_be_used(self):
        for settings in ("{", '{"nothing": 1}', "[]", "/nothing/there"):
            done = subprocess.run(
                [sys.executable, "-B", f"{PROVIDERS}/liberty.py", "--certificate", "x", "--key", "x",
                 "--settings", settings], capture_output=True, text=True, timeout=30, check=False)
            self.assertEqual(done.returncode, 1)
            self.assertRegex(done.stderr, "^--settings: [^\n]+\n$")

    def test_unknown_settings(self):
        url = self.start("liberty", "{}")
        for body in ({"nothing": 1}, {"realm": 1}, [], "realm"):
            with self.subTest(body=body), self.assertRaisesRegex(BrowserError, "answered 400"):
                self.browser.call("POST", url + "/-/settings", body)


class Listed(unittest.TestCase):
    """The codes that an administrator meets, each with a case above."""
    ENTRA = {7000222, 7000215, 7000218, 700016, 700025, 50011, 500112, 90002, 9002313, 900144,
             90014, 70000, 70008, 54005, 53003, 50076, 50146, 65001, 65004, 50020, 50105, 50034,
             700054}
    LIBERTY = {"CWOAU0025E", "CWOAU0029E", "CWOAU0032E", "CWOAU0033E", "CWOAU0035E", "CWOAU0058E",
               "CWOAU0061E", "CWWKS1406E", "CWWKS1455E", "CWWKS1636E"}

    def test_documented(self):
        """The tables say how to reach each of them, and name no code that the twins lack."""
        with open(f"{PROVIDERS}/README.md", encoding="utf-8") as file:
            text = file.read()
        rows = [line for line in text.splitlines() if line.startswith("| ")]
        named = {int(code) for row in rows for code in re.findall(r"\b\d{5,7}\b", row)}
        self.assertLessEqual(self.ENTRA, named)
        self.assertLessEqual(named, entra.entra_codes.FAULTS.keys())
        named = set(re.findall(r"CWOAU\d{4}E|CWWKS\d{4}E", " ".join(rows)))
        self.assertLessEqual(self.LIBERTY, named)
        self.assertLessEqual(named, liberty.FAULTS.keys())

    def test_each_has_a_case(self):
        # test_code_redeemed_twice, test_consent, test_accounts
        singly = {54005, 65004, 50020, 50034}
        self.assertEqual(self.ENTRA - singly, self.ENTRA & (
            test_entra.EntraToken.CASES.keys() | test_entra.EntraToken.POLICIES.keys() |
            test_entra.EntraAuthorization.AFTER_THE_PASSWORD.keys() |
            test_entra.EntraAuthorization.SENT_BACK.keys()))
        # test_error_pages, test_logout
        self.assertEqual(self.LIBERTY - test_liberty.LibertyToken.CASES.keys(),
                         {"CWOAU0061E", "CWWKS1636E"})
        self.assertLessEqual(self.LIBERTY, liberty.FAULTS.keys())
        self.assertLessEqual(self.ENTRA, entra.entra_codes.FAULTS.keys())


if __name__ == "__main__":
    unittest.main()
