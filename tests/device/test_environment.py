"""No variable of the environment has an effect, whoever sets it, in both ways of installation."""

import os
import re
import subprocess
import time
import unittest
import urllib.parse

from device import BUILD, LOGIN, DeviceTest, Launched, SetId
from providers.scripted import Script
from traps import FOLDER, VARIABLES, Traps

# What a host that does nothing about it suffers from: the traps do notice.
EFFECTIVE = ("LD_PRELOAD", "LD_AUDIT", "LD_LIBRARY_PATH", "LD_DEBUG", "LD_DEBUG_OUTPUT",
             "OPENSSL_CONF", "SSLKEYLOGFILE", "https_proxy", "HTTPS_PROXY", "all_proxy",
             "ALL_PROXY", "TZ")


def without_time(lines):
    """Lines of the log without what differs from login to login; the time stays if it is off."""
    shown = []
    for line in lines:
        stamp = re.match(r"<\d+>(... .\d \d\d:\d\d:\d\d) ", line)[1]
        made = time.mktime(time.strptime(f"{time.strftime('%Y')} {stamp}", "%Y %b %d %H:%M:%S"))
        when = "now" if abs(time.time() - made) < 120 else stamp
        shown.append(when + line[line.index(stamp) + len(stamp):])
    return shown


class Environment:
    """The traps are set by a local program that starts the login program as a web server does."""

    @classmethod
    def setUpClass(cls):
        super().setUpClass()
        cls.traps = Traps()

    @classmethod
    def tearDownClass(cls):
        cls.traps.close()
        super().tearDownClass()

    def exchange(self, variables):
        """A callback; returns what was written and logged."""
        self.browser = self.new_browser()
        query = urllib.parse.urlsplit(self.callback_url()).query
        cookie = self.cookie_header()["Cookie"]
        self.forget_log()
        self.traps.sprung()
        done = self.run_raw(query, cookie, **variables)
        self.assertTrue(self.logged("signed in: "), self.log())
        output = re.sub("[0-9a-f]{16,64}|eyJ[A-Za-z0-9_.-]*", "X", done.stdout.decode())
        return output, done.stderr, done.returncode, without_time(self.log())

    def test_no_variable_has_an_effect(self):
        self.device.choose("azure")
        plain = self.exchange({})
        self.assertIn("&success=true", plain[0])
        for name in self.variables:
            variables = self.traps.value(name)
            with self.subTest(variables=variables):
                self.assertEqual(self.exchange(variables), plain)
                self.assertEqual(self.traps.sprung(), [])

    def test_all_at_once(self):
        for profile in ("azure", "websphere"):
            self.device.choose(profile)
            plain = self.exchange({})
            everything = {}
            for name in self.variables:
                everything.update(self.traps.value(name))
            self.assertEqual(self.exchange(everything), plain)
            self.assertEqual(self.traps.sprung(), [])

    def test_the_checks_stay_on(self):
        self.device.provider.script = Script(claims=lambda claims: {**claims, "nonce": "other"})
        query = urllib.parse.urlsplit(self.callback_url()).query
        out = self.run_program(query, self.cookie_header()["Cookie"], SSO_LOGIN_ROAD="plain")
        self.assertIn("#reason=not-verified.", out)


class EnvironmentSetId(Environment, SetId, DeviceTest):
    # The loader acts on these before the program's first instruction: it lists the libraries and
    # starts nothing, or writes below /var/profile, where that is. See SECURITY.md.
    variables = [name for name in VARIABLES if not name.startswith(("LD_TRACE", "LD_PROFILE"))]


class EnvironmentLaunched(Environment, Launched, DeviceTest):
    variables = VARIABLES


class Control(DeviceTest):
    """The same traps, and a program that leaves its environment as it is."""

    def test_traps_notice(self):
        program = "/run/stage/host"
        flags = subprocess.run(["pkg-config", "--cflags", "--libs", "ssoclient"], check=True,
                               stdout=subprocess.PIPE, text=True, env={
                                   **os.environ, "PKG_CONFIG_PATH": BUILD + "/prefix/lib/pkgconfig"})
        subprocess.run(["g++", "-std=c++17", os.path.dirname(__file__) + "/host.cpp", "-o", program,
                        *flags.stdout.split()], check=True)
        traps = Traps()
        self.addCleanup(traps.close)
        ineffective = []
        for name in EFFECTIVE:
            self.forget_log()
            traps.sprung()
            subprocess.run([program], env=traps.value(name), stdout=subprocess.DEVNULL,
                           stderr=subprocess.DEVNULL, check=False, timeout=20)
            lines = without_time(self.log())
            if not traps.sprung() and all(line.startswith("now") for line in lines):
                ineffective.append(name)
            for left in os.listdir(FOLDER):
                if left.startswith("debug"):
                    os.unlink(f"{FOLDER}/{left}")
        self.assertEqual(ineffective, [])


if __name__ == "__main__":
    unittest.main()
