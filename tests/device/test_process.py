"""What the login program makes of the process that it was given, and what bounds it."""

import os
import re
import resource
import signal
import socket
import subprocess
import threading
import time
import unittest
import urllib.parse

from device import (BUILD, HERE, LOGIN, DeviceTest, Launched, SetId, device, programs,
                    wait_until)
from providers.scripted import Script

DEADLINE = 4  # seconds
GRACE = 5     # that the program has beyond it
SANITIZED = "sanitized" in BUILD
MOST_MEMORY = 96 << 20
MOST_SENT = 1 << 36  # a flood ends there if nobody ends it


def fields_of(pid, name="status"):
    with open(f"/proc/{pid}/{name}", encoding="ascii") as file:
        return dict(re.split(r":\s*|  +", line.strip(), maxsplit=1) for line in file
                    if re.search(r":|  ", line))


class Process:
    """As it is while the provider is asked, in both processes."""

    def test_state(self):
        with self.exchanging(self.callback_url()) as (parent, child):
            for pid in (parent, child):
                status = fields_of(pid)
                saved = "0" if pid == parent else "33"  # the child gives root up
                self.assertEqual(status["Uid"].split()[:3], ["33", "33", saved])
                self.assertEqual(status["Gid"].split()[:3], ["33", "33", saved])
                self.assertEqual(int(status["SigBlk"], 16), 0)
                # libcurl ignores SIGPIPE during a transfer.
                self.assertEqual(int(status["SigIgn"], 16) & ~(1 << signal.SIGPIPE - 1), 0)
                self.assertEqual(status["Umask"], "0077")
                self.assertRegex(fields_of(pid, "limits")["Max core file size"], "^0 +0 ")
                # Not dumpable: the process's own files belong to root.
                self.assertEqual(os.stat(f"/proc/{pid}/mem").st_uid, 0)

    def test_state_that_others_chose(self):
        """Signals blocked and ignored, descriptors closed and open, another mask, another limit."""
        files = [os.open("/dev/null", os.O_RDONLY) for _ in range(5)]
        high = 900

        def spoil():
            for name in files:
                os.dup2(name, name, inheritable=True)
            os.dup2(files[0], high, inheritable=True)
            for number in range(1, 32):
                if number not in (signal.SIGKILL, signal.SIGSTOP):
                    signal.signal(number, signal.SIG_IGN)
            signal.pthread_sigmask(signal.SIG_BLOCK, range(1, 65))
            os.umask(0)
            resource.setrlimit(resource.RLIMIT_CORE, (1 << 20, 1 << 20))
            os.close(0)

        self.device.provider.script = Script(silent=("token",))
        query = urllib.parse.urlsplit(self.callback_url()).query
        cookie = self.cookie_header()["Cookie"]
        self.device.options(deadline=2)
        outcome = []
        thread = threading.Thread(target=lambda: outcome.append(
            self.run_raw(query, cookie, before=spoil)))
        thread.start()
        try:
            wait_until(lambda: len(programs(self.program)) == 2)
            for pid in programs(self.program):
                status = fields_of(pid)
                self.assertEqual(int(status["SigBlk"], 16), 0)
                self.assertEqual(int(status["SigIgn"], 16) & ~(1 << signal.SIGPIPE - 1), 0)
                self.assertEqual(status["Umask"], "0077")
                self.assertRegex(fields_of(pid, "limits")["Max core file size"], "^0 +0 ")
                opened = {int(name) for name in os.listdir(f"/proc/{pid}/fd")}
                self.assertTrue({0, 1, 2} <= opened, opened)
                self.assertLess(max(opened), 16)
        finally:
            thread.join(30)
            for name in files:
                os.close(name)
        self.assertIn(b"#reason=timeout.", outcome[0].stdout)

    def test_nobody_looks_inside(self):
        """Not even another program of the web server's user."""
        with self.exchanging(self.callback_url()) as pids:
            for pid in pids:
                for name in ("mem", "environ", "fd/1", "maps"):
                    done = subprocess.run(["head", "-c1", f"/proc/{pid}/{name}"], user=33, group=33,
                                          extra_groups=[], capture_output=True, check=False)
                    self.assertIn(b"Permission denied", done.stderr, name)

    @unittest.skipIf(SANITIZED, "the address check needs terabytes of address space")
    def test_limits_of_the_child(self):
        with self.exchanging(self.callback_url()) as (_, child):
            limits = fields_of(child, "limits")
            for name, most in (("Max cpu time", 20), ("Max file size", 1 << 20),
                               ("Max address space", 400 << 20)):
                soft, hard = limits[name].split()[:2]
                self.assertEqual(soft, hard)
                self.assertLessEqual(int(hard), most, name)
            self.assertLess(int(limits["Max address space"].split()[0]),
                            int(fields_of(child)["VmSize"].split()[0]) * 1024 + (65 << 20))

    def test_child_ends_with_its_parent(self):
        """Also when signals are blocked: nothing but the kernel is asked."""
        with self.exchanging(self.callback_url()) as (parent, child):
            begun = time.monotonic()
            os.kill(parent, signal.SIGKILL)
            wait_until(lambda: child not in programs(self.program), 2)
            self.assertLess(time.monotonic() - begun, 2)

    def test_silent_provider(self):
        self.device.options(deadline=DEADLINE)
        for silent in ("token", "wellknown", "keys"):
            self.device.choose("azure")
            self.device.provider.script = Script(silent=(silent,))
            url = self.callback_url()
            begun = time.monotonic()
            page = self.browser.get(url)
            took = time.monotonic() - begun
            self.assert_refused(page, "timeout", "provider did not answer in time")
            self.assertTrue(DEADLINE - 0.5 < took < DEADLINE + GRACE, f"it took {took:.1f} s")
            self.assertEqual(programs(self.program), [], "a process is left behind")

    def test_full_system_log(self):
        """Nothing reads the log, and its socket is full: syslog() never returns."""
        self.device.options(deadline=1)
        query = urllib.parse.urlsplit(self.callback_url()).query
        cookie = self.cookie_header()["Cookie"]
        os.rename("/dev/log", "/dev/log-away")
        try:
            with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as log, \
                    socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as other:
                log.bind("/dev/log")
                os.chmod("/dev/log", 0o666)
                other.setblocking(False)
                with self.assertRaises(BlockingIOError):
                    for _ in range(100000):
                        other.sendto(b"x", "/dev/log")
                for asked in (query, "action=start", "action=other"):
                    begun = time.monotonic()
                    done = self.run_raw(asked, cookie, before=lambda: signal.pthread_sigmask(
                        signal.SIG_BLOCK, range(1, 65)))
                    self.assertLess(time.monotonic() - begun, 1 + GRACE + 3)
                    self.assertRegex(done.stdout.decode(), "^Status: 302 Found\n.*\nLocation: "
                                     "[^\n]*#reason=timeout[.][2-9A-Z]{8}&success=false\n\n$")
                    self.assertEqual(done.returncode, 1)
                os.unlink("/dev/log")
        finally:
            os.rename("/dev/log-away", "/dev/log")
        self.assertEqual(programs(self.program), [])


class ProcessSetId(Process, SetId, DeviceTest):
    pass


class ProcessLaunched(Process, Launched, DeviceTest):
    pass


def flood(head, part, tail=b""):
    """Writes a head, then one part again and again."""
    def write(file):
        file.write(b"HTTP/1.1 200 OK\r\nContent-Type: application/json\r\n" + head)
        for _ in range(MOST_SENT // len(part)):
            file.write(part)
        file.write(tail)
    return write


TEXT = b"x" * 65536
CHUNK = b"10000\r\n" + TEXT + b"\r\n"
LINE = b"X-Padding: " + b"y" * 4000 + b"\r\n"
FLOODS = {
    "body": flood(b'Connection: close\r\n\r\n{"id_token":"', TEXT),
    "chunks": flood(b"Transfer-Encoding: chunked\r\n\r\n", CHUNK),
    "zero bytes": flood(b"Connection: close\r\n\r\n", bytes(65536)),
    "chunk extension": flood(b"Transfer-Encoding: chunked\r\n\r\n1;", TEXT),
    "headers": flood(b"", LINE),
    "one header": flood(b"X-Long: ", TEXT),
    "trailers": flood(b"Transfer-Encoding: chunked\r\n\r\n2\r\n{}\r\n0\r\n", LINE),
}


def small_values(file):
    """A whole JSON document that takes a hundred times its text when it is parsed."""
    body = b"[" + b"[]," * 4000000 + b"0]"
    file.write(b"HTTP/1.1 200 OK\r\nContent-Length: %d\r\n\r\n" % len(body) + body)


FLOODS["small values"] = small_values


@unittest.skipIf(SANITIZED, "the address check needs terabytes of address space")
class Floods(DeviceTest):
    """A provider that does not stop, at each of its endpoints."""

    def measure(self, profile, path, write):
        """Signs in; returns the largest process in bytes, and the seconds."""
        self.device.choose(profile)
        self.device.provider.script = Script(flood={path: write})
        url = self.callback_url()
        begun = time.monotonic()
        process = subprocess.Popen(
            [LOGIN], stdout=subprocess.PIPE, user=33, group=33, extra_groups=[],
            env={"REQUEST_METHOD": "GET", "QUERY_STRING": urllib.parse.urlsplit(url).query,
                 "HTTP_COOKIE": self.cookie_header()["Cookie"]})
        out = process.stdout.read().decode()
        process.stdout.close()
        _, status, usage = os.wait4(process.pid, 0)
        process.returncode = status
        self.assertRegex(out, "#reason=(timeout|provider-error|unreachable|not-verified|internal)")
        self.browser = self.new_browser()
        return usage.ru_maxrss * 1024, time.monotonic() - begun

    def test_stop_within_memory_and_time(self):
        self.device.options(deadline=DEADLINE)
        table = []
        for name, write in FLOODS.items():
            for profile, path in (("websphere", "token"), ("azure", "wellknown"),
                                  ("azure", "keys")):
                memory, seconds = self.measure(profile, path, write)
                table.append(f"     {name + ', ' + path:28} {memory / 2**20:6.1f} MB {seconds:5.1f} s")
                with self.subTest(flood=name, path=path):
                    self.assertLess(memory, MOST_MEMORY)
                    self.assertLess(seconds, DEADLINE + GRACE)
        print("\n".join(table))
        self.device.options()
        self.device.provider.script = Script()
        self.device.choose("websphere")
        self.assert_signed_in(self.sign_in(), "websphere")


class Slots(DeviceTest):
    """At most so many exchanges at once."""

    def posts(self):
        return [path for _, path, _, _ in self.device.provider.seen if path.endswith("/token")]

    def start_all(self, urls):
        """Sends all callbacks at once; the pages that came back at once, and a function that
        waits for the rest."""
        pages = {}

        def send(number):
            pages[number] = urls[number][0].get(urls[number][1])

        threads = [threading.Thread(target=send, args=(number,)) for number in range(len(urls))]
        for thread in threads:
            thread.start()

        def finish():
            for thread in threads:
                thread.join(60)
        return pages, finish

    def test_sixty_callbacks(self):
        self.device.options(deadline=30, max_exchanges=5)
        urls = [(browser, self.callback_url(browser))
                for browser in (self.new_browser() for _ in range(60))]
        self.device.provider.seen.clear()
        self.device.provider.script = Script(silent=("token",))
        pages, finish = self.start_all(urls)
        wait_until(lambda: len(pages) == 55, 60)
        wait_until(lambda: len(self.posts()) >= 5, 60)
        time.sleep(0.5)
        self.assertEqual(len(self.posts()), 5)
        for page in pages.values():
            self.reference(page, "busy", "/index.cgi")
        refused = [number for number, page in pages.items()]
        self.device.provider.script = Script()
        self.device.provider.release()
        finish()
        self.assertEqual(len(pages), 60)
        # Nothing was used up by the refusal.
        browser, url = urls[refused[0]]
        self.assertEqual(self.relay(browser.get(url))["success"], "true")

    def test_slots_are_free_again(self):
        self.device.options(deadline=1, max_exchanges=1)
        self.device.provider.script = Script(silent=("token",))
        for _ in range(3):
            self.assert_refused(self.sign_in(), "timeout", "provider did not answer in time")
        # Also after both processes were killed.
        self.device.options(deadline=30, max_exchanges=1)
        with self.exchanging(self.callback_url()) as (parent, _):
            os.kill(parent, signal.SIGKILL)
        self.device.provider.script = Script()
        self.assert_signed_in(self.sign_in(), "websphere")


class Interference(DeviceTest):
    """System calls that fail."""

    @classmethod
    def setUpClass(cls):
        super().setUpClass()
        device()
        subprocess.run(["g++", "-std=c++17", "-shared", "-fPIC", HERE + "/interfere.cpp", "-o",
                        "/run/stage/interfere.so", "-ldl"], check=True)

    def setUp(self):
        super().setUp()
        with open("/etc/ld.so.preload", "w", encoding="ascii") as file:
            file.write("/run/stage/interfere.so\n")
        self.addCleanup(os.unlink, "/etc/ld.so.preload")

    def break_call(self, name, number=1):
        path = "/run/stage/" + name
        with open(path, "w", encoding="ascii") as file:
            file.write(str(number))
        self.addCleanup(lambda: os.path.exists(path) and os.unlink(path))

    def test_no_getrandom(self):
        self.break_call("no-getrandom")
        self.assert_signed_in(self.sign_in(), "websphere")

    def test_ids_that_stay_raised(self):
        """Each time that the library or the program gives root back, it fails: the program ends
        at once. Nothing is asked, no user is signed in, and nothing more is logged."""
        for query, cookie in (("action=start", ""), self._callback()):
            number = 0
            while True:
                number += 1
                self.break_call("stay-root", number)
                self.forget_log()
                self.device.provider.seen.clear()
                done = self.run_raw(query, cookie)
                if done.returncode == 0 and b"#reason=" not in done.stdout:
                    break
                with self.subTest(query=query[:12], number=number):
                    self.assertIn(b"#reason=internal.", done.stdout)
                    self.assertEqual(self.device.provider.seen, [])
                    self.assertIn("the effective ids were not put back",
                                  "".join(line for line in self.log() if "sign-in failed" in line))
                if query != "action=start":
                    query, cookie = self._callback()
            os.unlink("/run/stage/stay-root")
            self.assertGreater(number, 4)

    def _callback(self):
        if os.path.exists("/run/stage/stay-root"):
            os.unlink("/run/stage/stay-root")
        self.browser = self.new_browser()
        query = urllib.parse.urlsplit(self.callback_url()).query
        return query, self.cookie_header()["Cookie"]


if __name__ == "__main__":
    unittest.main()
