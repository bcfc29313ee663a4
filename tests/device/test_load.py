"""Many requests: nobody is locked out, and the device keeps little. The numbers are printed.

SSOCLIENT_LOAD=full takes the full numbers: 10,000 starts a minute for five minutes, and 5,000
sign-ins in a row. Otherwise a thirtieth of it.
"""

import http.client
import os
import ssl
import threading
import time
import unittest
import urllib.parse

from device import STORE, DeviceTest, values_of
from providers.scripted import Script

FULL = os.environ.get("SSOCLIENT_LOAD") == "full"
SECONDS, RATE = (300, 10000 / 60) if FULL else (10, 10000 / 60)
SIGN_INS, MOST_SESSIONS = (5000, 1000) if FULL else (80, 50)
CLIENTS = 4  # connections of the one client
MOST_DISK = 1 << 20


def disk_use():
    total = 0
    for folder, _, names in os.walk(STORE):
        total += sum(os.lstat(os.path.join(folder, name)).st_blocks * 512 for name in names)
    return total


class Flood(threading.Thread):
    """One connection that asks the device at a steady rate until it is stopped."""

    def __init__(self, stage, path, rate):
        super().__init__(daemon=True)
        self._context = ssl.create_default_context(cafile=stage.authority)
        self._host = urllib.parse.urlsplit(stage.device).netloc
        self._path, self._pause = path, 1 / rate
        self.asked, self.bad, self.stopped = 0, [], threading.Event()

    def run(self):
        connection = http.client.HTTPSConnection(self._host, context=self._context, timeout=60)
        due = time.monotonic()
        while not self.stopped.is_set():
            try:
                connection.request("GET", self._path)
                answer = connection.getresponse()
                answer.read()
            except (OSError, http.client.HTTPException):  # the server ends a connection at times
                connection.close()
                continue
            self.asked += 1
            if "/authorization?" not in answer.getheader("Location", ""):
                self.bad.append((answer.status, answer.getheader("Location")))
            due += self._pause
            time.sleep(max(0.0, due - time.monotonic()))
        connection.close()


class Load(DeviceTest):
    def setUp(self):
        super().setUp()
        for name in os.listdir(STORE + "/sessions") if os.path.isdir(STORE + "/sessions") else []:
            os.unlink(f"{STORE}/sessions/{name}")

    def check_person(self, when, table):
        begun = time.monotonic()
        self.browser = self.new_browser()
        self.assert_signed_in(self.sign_in(), "websphere")
        table.append(f"     a person signs in {when}: {time.monotonic() - begun:.2f} s, "
                     f"{disk_use() / 1024:.0f} KB on disk")
        self.assertLess(disk_use(), MOST_DISK)

    def test_anonymous_starts(self):
        table = []
        self.check_person("before", table)
        before = disk_use()
        path = "/webman/login.cgi?action=start&origin=/index.cgi"
        floods = [Flood(self.device.stage, path, RATE / CLIENTS) for _ in range(CLIENTS)]
        begun = time.monotonic()
        for flood in floods:
            flood.start()
        for part in range(5):
            time.sleep(max(0.0, begun + SECONDS * (part + 0.5) / 5 - time.monotonic()))
            self.check_person("during", table)
        time.sleep(max(0.0, begun + SECONDS - time.monotonic()))
        for flood in floods:
            flood.stopped.set()
        for flood in floods:
            flood.join(60)
        took = time.monotonic() - begun
        self.check_person("after", table)
        asked = sum(flood.asked for flood in floods)
        print(f"     {asked} starts in {took:.0f} s: {asked / took * 60:.0f} a minute; "
              f"{before / 1024:.0f} KB on disk before, {disk_use() / 1024:.0f} KB after")
        print("\n".join(table))
        self.assertEqual([bad for flood in floods for bad in flood.bad], [])
        self.assertGreater(asked, SECONDS * 10)

    def test_callbacks_with_wrong_codes(self):
        """The worst that one can leave on the device without a user name: tickets used up."""
        count = SIGN_INS
        for _ in range(count):
            browser = self.new_browser()
            state = values_of(self.start(browser).location)["state"]
            browser.get(self.device.login_url + "?" +
                        urllib.parse.urlencode({"code": "wrong", "state": state}))
        print(f"     {count} callbacks with a wrong code: {disk_use() / 1024:.0f} KB on disk")
        self.assertLessEqual(os.stat(STORE + "/redeemed").st_size, 512 << 10)
        self.check_person("after", [])

    def test_sign_ins_in_a_row(self):
        self.device.options(max_sessions=MOST_SESSIONS)
        for many in (False, True):
            begun = time.monotonic()
            for number in range(SIGN_INS):
                name = f"user-{number}" if many else "alice"
                self.device.provider.script = Script(
                    claims=lambda claims, n=name: {**claims, "sub": n})
                if many:
                    self.browser = self.new_browser()
                self.assertEqual(self.relay(self.sign_in())["success"], "true", number)
            sessions = len(os.listdir(STORE + "/sessions"))
            print(f"     {SIGN_INS} sign-ins of {'as many users' if many else 'one user'}: "
                  f"{(time.monotonic() - begun) / SIGN_INS * 1000:.0f} ms each, "
                  f"{sessions} sessions")
            self.assertLessEqual(sessions, MOST_SESSIONS)
            self.assertEqual(self.user(), name)


if __name__ == "__main__":
    unittest.main()
