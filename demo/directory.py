"""A Windows domain for the stage: a Samba domain controller, and its winbind.

It lives in the namespaces of scripts/check winbind and listens on their loopback interface alone.
"""

import glob
import os
import shutil
import signal
import socket
import subprocess
import time

from stage import StageError, run, write

HOST = "dc1"
STATE = ("/var/lib/samba", "/var/log/samba", "/var/cache/samba")
PATIENCE = 300  # most of it is for machines that are busy


class Directory:
    title = "Samba domain controller"

    def __init__(self, stage, dns_domain, netbios_domain):
        self.dns_domain, self.netbios_domain = dns_domain, netbios_domain
        self._stage = stage
        self._provision = None

    def begin(self):
        """Begins to make the domain, which takes a while. The stage must be built."""
        if socket.gethostname() != HOST:
            raise StageError("a domain controller runs inside scripts/check winbind only")
        for folder in STATE:
            os.makedirs(folder, exist_ok=True)
            run("mount", "-t", "tmpfs", "-o", "mode=755", "directory", folder)
        for folder in ("/run/samba", "/var/lib/samba/private"):
            os.mkdir(folder)
        self._names()
        with open(self._stage.logs + "/provision.out", "wb") as out:
            self._provision = subprocess.Popen([
                "samba-tool", "domain", "provision", "--server-role=dc",
                "--dns-backend=SAMBA_INTERNAL", "--realm=" + self.dns_domain.upper(),
                "--domain=" + self.netbios_domain, "--host-name=" + HOST, "--host-ip=127.0.0.1",
                "--option=interfaces=lo", "--option=bind interfaces only=yes",
                "--option=dns forwarder=", "--option=tls enabled=no",
                # No file server; and no updates of a name service that nobody asks.
                "--option=server services=-s3fs -dnsupdate"], stdout=out, stderr=out,
                stdin=subprocess.DEVNULL)

    def _names(self):
        """All of it in the stage's own copy of /etc."""
        if os.path.exists("/etc/samba"):
            shutil.rmtree("/etc/samba")
        os.mkdir("/etc/samba")
        if os.path.lexists("/etc/resolv.conf"):
            os.unlink("/etc/resolv.conf")
        write("/etc/resolv.conf", "nameserver 127.0.0.1\n")
        with open("/etc/hosts", "a", encoding="ascii") as hosts:
            hosts.write(f"127.0.0.1 {HOST}.{self.dns_domain} {HOST}\n")

    def start(self, account):
        """Waits until the domain is made, adds a user, and starts the controller."""
        try:
            status = self._provision.wait(PATIENCE)
        except subprocess.TimeoutExpired:
            self._provision.kill()
            status = "none: it took too long"
        if status != 0:
            raise StageError(f"no domain, status {status}: {self._stage.tail('provision')}")
        run("samba-tool", "user", "add", account, "--random-password", timeout=PATIENCE)
        self._stage.spawn("samba", ["samba", "-i", "-M", "single"])
        self._wait()

    def _wait(self):
        end = time.monotonic() + PATIENCE
        while not self.knows_domain(self.dns_domain):
            if time.monotonic() > end:
                raise StageError(f"winbind does not answer: {self._stage.tail('samba')}")
            time.sleep(0.1)

    def stop(self):
        self._stage.stop("samba")

    def freeze(self):
        """From here on winbind takes questions and does not answer them."""
        self._signal(signal.SIGSTOP)

    def thaw(self):
        self._signal(signal.SIGCONT)

    @staticmethod
    def _signal(number):
        """To every winbind process; there are no others than ours in this namespace."""
        for path in glob.glob("/proc/[0-9]*/comm"):
            with open(path, encoding="ascii") as comm:
                if comm.read().strip() == "winbindd":
                    os.kill(int(path.split("/")[2]), number)

    @staticmethod
    def _asks(*question):
        return subprocess.run(["wbinfo", *question], capture_output=True, timeout=PATIENCE,
                              check=False).returncode == 0

    def knows_domain(self, name):
        return self._asks("--domain-info", name)

    def knows_user(self, name):
        return self._asks("--name-to-sid", name)
