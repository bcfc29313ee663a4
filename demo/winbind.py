"""The demo's sign-in with a real directory behind the user's name.

Runs inside scripts/check winbind, with a library that was built for winbind.
"""

import argparse
import subprocess
import sys
import time

from browser import BrowserError
from directory import Directory
from scene import DEVICE, PROVIDER, Scene, StepError, say, show_logs
from sign_in import SignIn
from stage import Stage, StageError

# The NetBIOS name is not the first label of the DNS name: nothing but the directory knows it.
DNS, NETBIOS = "ad.werk.example.net", "PLANT7"
REFUSAL = "QOVAWinsUserNameFqdn2Netbios failed."

# What the library may ask for, and what must come of it; None is a failure.
CONVERSIONS = (
    ("AD.WERK.EXAMPLE.NET\\alice", "PLANT7\\alice"),
    ("ad.werk.example.net\\alice", "PLANT7\\alice"),
    ("Ad.Werk.Example.Net\\Alice Smith", "PLANT7\\Alice Smith"),
    ("AD.WERK.EXAMPLE.NET\\nobody-there", "PLANT7\\nobody-there"),
    ("PLANT7\\alice", None),
    ("AD\\alice", None),
    ("WERK.EXAMPLE.NET\\alice", None),
    ("PLANT7.EXAMPLE.NET\\alice", None),
    ("BUILTIN\\alice", None),
    ("\\alice", None),
    ("alice", None),
)


class CheckError(Exception):
    pass


# Whatever a step may fail with; anything else is a mistake in here.
FAILURES = (CheckError, StageError, BrowserError, StepError, subprocess.TimeoutExpired)


class Checks:
    def __init__(self, scene, directory, convert):
        self.scene, self.directory, self.convert = scene, directory, convert
        self.passed = self.failed = 0

    def check(self, what, action, *arguments):
        try:
            action(*arguments)
        except FAILURES as error:
            self.failed += 1
            say(f"NOT OK  {what}: {error}")
            self.show_logs()
        else:
            self.passed += 1
            say(f"ok      {what}")

    def show_logs(self):
        show_logs(self.scene.stage)
        print("-- samba\n   " + self.scene.stage.tail("samba"), file=sys.stderr)

    # -- the conversion alone --------------------------------------------------------------

    def converts(self, name, expected, size=1023):
        done = subprocess.run([self.convert, name, str(size)], capture_output=True, text=True,
                              timeout=60, check=False)
        wanted = (1, "") if expected is None else (0, expected + "\n")
        if (done.returncode, done.stdout) != wanted:
            raise CheckError(f"status {done.returncode}, {done.stdout!r} {done.stderr!r}")

    def conversions(self):
        for name, expected in CONVERSIONS:
            self.check(f"{name} becomes {expected or 'nothing'}", self.converts, name, expected)
        name, expected = CONVERSIONS[0]
        self.check("a result that just fits", self.converts, name, expected, len(expected) + 1)
        self.check("a result that does not fit", self.converts, name, None, len(expected))

    # -- the whole sign-in -----------------------------------------------------------------

    def signs_in(self):
        SignIn(self.scene, "azure").run()

    def refused(self, principal, code="unknown-user", text=REFUSAL):
        self.scene.provider.change_claim("unique_name", principal)
        logged = len(self.scene.stage.log.lines)
        attempt = SignIn(self.scene, "azure")
        try:
            attempt.run()
        except StepError as error:
            if "the device says: " + code + "." not in str(error):
                raise
        else:
            raise CheckError("signed in")
        self._expect_logged(text, logged)
        page = attempt.browser.get(self.scene.stage.device + "/index.cgi")
        if 'id="sign-in"' not in page.body:
            raise CheckError("the device page says: " + page.text)

    def _expect_logged(self, text, first):
        """The log is read by its own thread, which may be behind."""
        end = time.monotonic() + 10
        while not any(text in line for line in self.scene.stage.log.lines[first:]):
            if time.monotonic() > end:
                raise CheckError("nothing in the system log")
            time.sleep(0.05)

    def given_up(self, principal):
        """Winbind is there and does not answer: the login program's own limit counts."""
        self.scene.stage.set_options(deadline=2)
        self.directory.freeze()
        try:
            self.refused(principal, "timeout", "provider did not answer in time")
        finally:
            self.directory.thaw()
            self.scene.stage.set_options()

    def known(self):
        if not self.directory.knows_user(self.scene.users["azure"]):
            raise CheckError("unknown")
        if self.directory.knows_user(f"{NETBIOS}\\nobody-there"):
            raise CheckError("it knows everyone")

    def run(self):
        principal = f"alice@{DNS}"
        self.check("winbind is not there: refused", self.refused, principal)
        say(f"directory: {self.directory.title} of {DNS}, NetBIOS name {NETBIOS}")
        self.directory.start("alice")
        self.conversions()
        self.check("the NetBIOS name for the domain: refused", self.refused, f"alice@{NETBIOS}")
        self.check("a domain that nobody knows: refused", self.refused, "alice@plant7.example.net")
        self.scene.provider.change_claim("unique_name", principal)
        self.check(f"{principal} signs in as {NETBIOS}\\alice", self.signs_in)
        self.scene.stage.set_options(user_lookup="nss")
        self.check("the same, and the device looks the name up", self.signs_in)
        self.scene.stage.set_options()
        self.check("the directory knows this user by that name", self.known)
        self.check("winbind hangs: given up", self.given_up, principal)
        self.check("winbind answers again", self.signs_in)
        self.directory.stop()
        self.check("winbind is gone: refused", self.refused, principal)


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("--prefix", required=True)
    parser.add_argument("--programs", required=True)
    parser.add_argument("--pages", required=True)
    parser.add_argument("--convert", required=True)
    options = parser.parse_args()

    stage = Stage(DEVICE, PROVIDER, 8443, 8444)
    scene = Scene(stage)
    scene.users["azure"] = f"{NETBIOS}\\alice"
    directory = Directory(stage, DNS, NETBIOS)
    checks = Checks(scene, directory, options.convert)
    try:
        scene.set_up(options.prefix, options.programs, options.pages)
        scene.choose("azure")
        directory.begin()
        checks.run()
    except FAILURES as error:
        checks.show_logs()
        print(f"test-winbind: {error}", file=sys.stderr)
        checks.failed += 1
    finally:
        stage.close()
    print(f"{checks.passed} passed, {checks.failed} failed")
    return 0 if checks.failed == 0 and checks.passed > 0 else 1


if __name__ == "__main__":
    sys.exit(main())
