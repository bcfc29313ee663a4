"""Which names can sign in, and what becomes of their sessions."""

import os
import time
import unittest

from device import EXPECTED, STORE, DeviceTest, programs
from providers.scripted import Script

SESSIONS = STORE + "/sessions"
LONGEST = "é" * 128
COMMAND = "/usr/qova/libexec/lookup"

# A name, and what is wrong with it.
BAD = (
    ("", "is empty"), (".", 'is "." or ".."'), ("..", 'is "." or ".."'),
    (" alice", "begins or ends with a blank"), ("alice ", "begins or ends with a blank"),
    ("\u00a0alice", "begins or ends with a blank"), ("alice\u3000", "begins or ends with a blank"),
    ("alice\u200b", "begins or ends with a blank"), (" ", "begins or ends with a blank"),
    ("alice\0", "holds a control character"), ("\0", "holds a control character"),
    ("root\0alice", "holds a control character"), ("al\nice", "holds a control character"),
    ("alice\n", "holds a control character"), ("\talice", "holds a control character"),
    ("al\x7fice", "holds a control character"), ("al\x9bice", "holds a control character"),
    ("al\u2028ice", "holds a control character"), ("\x1b[31malice", "holds a control character"),
    ("a" * 257, "is longer than 256 bytes"), (LONGEST + "x", "is longer than 256 bytes"),
    ("a" * 5000, "is longer than 256 bytes"), ("a" * 4095, "is longer than 256 bytes"),
)
GOOD = ("alice", "a", "a" * 256, LONGEST, "Zoë Müller", "al ice", "名前", "PLANT7\\alice", "...",
        "alice@ad.example.net", "<b>&\"'", "-n", "\U0001f600")


class Names(DeviceTest):
    def sign_in_as(self, name, profile="websphere"):
        self.device.choose(profile)
        claim = {"websphere": "sub", "azure": "unique_name"}[profile]
        self.device.provider.script = Script(claims=lambda claims: {**claims, claim: name})
        self.browser = self.new_browser()
        return self.sign_in()

    def test_unusable(self):
        for name, problem in BAD:
            with self.subTest(name=name[:20], size=len(name)):
                self.assert_refused(self.sign_in_as(name), "unknown-user",
                                    f"user name (claim) {problem}"
                                    if name else "user name (on this device) is empty")

    def test_unusable_for_azure(self):
        """Also what the platform would cut, or end at a zero byte."""
        for name, problem in (("al\0ice@ad.example.net", "holds a control character"),
                              ("alice@ad.example.net\0", "holds a control character"),
                              ("a" * 5000 + "@ad.example.net", "is longer than 256 bytes"),
                              (" alice@ad.example.net", "begins or ends with a blank")):
            with self.subTest(name=name[:20]):
                self.assert_refused(self.sign_in_as(name, "azure"), "unknown-user",
                                    f"user name (claim) {problem}")

    def test_not_utf8(self):
        """Bytes that no text holds; a token can hold them all the same."""
        for bad in (b"\xff", b"\xc0\xaf", b"\xed\xa0\x80", b"\xf4\x90\x80\x80", b"\xe2\x82", b"\x80"):
            raw = b'"al' + bad + b'ice"'
            with self.subTest(raw=raw):
                self.device.provider.script = Script(
                    raw_claims=lambda text, r=raw: text.replace(b'"alice"', r))
                self.browser = self.new_browser()
                self.assert_refused(self.sign_in(), "unknown-user",
                                    "user name (claim) is not UTF-8")

    def test_usable(self):
        """As they are: nothing is cut or repaired."""
        for name in GOOD:
            with self.subTest(name=name[:20]):
                self.assertEqual(self.relay(self.sign_in_as(name))["success"], "true")
                self.assertEqual(self.user(), name)


class LookUp(DeviceTest):
    def setUp(self):
        super().setUp()
        with open("/etc/passwd", encoding="utf-8") as file:
            self.passwd = file.read()
        self.addCleanup(self.write_passwd, self.passwd)
        os.makedirs(os.path.dirname(COMMAND), exist_ok=True)

    @staticmethod
    def write_passwd(text):
        with open("/etc/passwd", "w", encoding="utf-8") as file:
            file.write(text)

    def command(self, text):
        with open(COMMAND, "w", encoding="ascii") as file:
            file.write("#!/bin/sh\n" + text)
        os.chmod(COMMAND, 0o755)
        self.addCleanup(lambda: os.path.exists(COMMAND) and os.unlink(COMMAND))
        self.device.options(user_lookup=COMMAND, deadline=4)

    def test_switched_off(self):
        self.assertNotIn("\nalice:", self.passwd)
        self.assert_signed_in(self.sign_in(), "websphere")

    def test_name_service(self):
        self.device.options(user_lookup="nss")
        self.assert_refused(self.sign_in(), "unknown-user",
                            "user is not known to the name service: alice")
        self.write_passwd(self.passwd + "alice:x:4711:4711::/nonexistent:/bin/false\n")
        self.assert_signed_in(self.sign_in(), "websphere")

    def test_command(self):
        """It gets the name as its one argument, and nothing of the request; it is not root."""
        seen = "/run/stage/seen"
        self.command(f'{{ id -u; echo "$#:$1"; env; cat; }} >{seen} 2>&1\n[ "$1" = alice ]\n')
        with open(seen, "w", encoding="ascii"):
            os.chmod(seen, 0o666)
        self.assert_signed_in(self.sign_in(), "websphere")
        with open(seen, encoding="utf-8") as file:
            lines = [line for line in file.read().split("\n") if not line.startswith(("PWD=", "_="))]
        self.assertEqual(lines, ["33", "1:alice", "PATH=/usr/bin:/bin", ""])
        self.device.provider.script = Script(claims=lambda claims: {**claims, "sub": "a; b $(c)"})
        self.browser = self.new_browser()
        self.assert_refused(self.sign_in(), "unknown-user",
                            f"user is not known to {COMMAND}: a; b $(c)")

    def test_command_that_does_not_work(self):
        self.command("exit 1\n")
        for prepare in (lambda: os.chmod(COMMAND, 0o644), lambda: os.unlink(COMMAND)):
            prepare()
            self.assert_refused(self.sign_in(), "internal",
                                f"user_lookup: cannot be run: {COMMAND}")
        for value in ("", "winbnd", "NSS", "lookup"):
            self.device.options(user_lookup=value)
            self.assert_refused(self.sign_in(), "internal", f"user_lookup: cannot be run: {value}"
                                .rstrip())

    def test_command_that_hangs(self):
        self.command("exec sleep 60\n")
        self.assert_refused(self.sign_in(), "timeout", "provider did not answer in time")
        self.assertEqual(programs("sleep"), [])


class Sessions(DeviceTest):
    def setUp(self):
        super().setUp()
        for name in os.listdir(SESSIONS) if os.path.isdir(SESSIONS) else []:
            os.unlink(f"{SESSIONS}/{name}")

    def test_a_browser_has_one(self):
        for _ in range(3):
            self.assert_signed_in(self.sign_in(), "websphere")
            self.assertEqual(len(os.listdir(SESSIONS)), 1)

    def test_the_oldest_goes(self):
        self.device.options(max_sessions=3)
        browsers = [self.new_browser() for _ in range(5)]
        for number, self.browser in enumerate(browsers):
            self.sign_in()
            for name in os.listdir(SESSIONS):
                made = os.stat(f"{SESSIONS}/{name}").st_mtime
                os.utime(f"{SESSIONS}/{name}", (made - 10,) * 2)
            self.assertEqual(len(os.listdir(SESSIONS)), min(number + 1, 3))
        self.assertEqual([self.user(browser) for browser in browsers],
                         [None, None, "alice", "alice", "alice"])

    def test_lifetime(self):
        self.device.options(session_lifetime=100)
        self.sign_in()
        path = f"{SESSIONS}/{os.listdir(SESSIONS)[0]}"
        os.utime(path, (time.time() - 95,) * 2)
        self.assertEqual(self.user(), "alice")
        os.utime(path, (time.time() - 102,) * 2)
        self.assertIsNone(self.user())
        self.browser = self.new_browser()
        self.sign_in()
        self.assertFalse(os.path.exists(path), "an old session is kept")

    def test_a_file_that_was_cut_off(self):
        self.sign_in()
        path = f"{SESSIONS}/{os.listdir(SESSIONS)[0]}"
        for text in ("", "\n", "ali"):
            with open(path, "w", encoding="ascii") as file:
                file.write(text)
            self.assertIsNone(self.user())

    def test_expected_names(self):
        for profile in ("azure", "websphere"):
            self.device.choose(profile)
            self.assert_signed_in(self.sign_in(), profile)
            with open(f"{SESSIONS}/{os.listdir(SESSIONS)[0]}", encoding="utf-8") as file:
                self.assertEqual(file.read(), EXPECTED[profile] + "\n")


if __name__ == "__main__":
    unittest.main()
