"""The stage of the demo: everything around the device that is not the device.

Runs inside scripts/sandbox, as root. Gives the namespace names, a certificate authority that
libcurl trusts, a system log that can be read, the device's files, and its web server.
Nothing is written outside the namespace: all files live in file systems that end with it.
"""

import json
import os
import pwd
import shutil
import socket
import subprocess
import threading
import time

FOLDER = "/run/stage"
QOVA = "/usr/qova"
SETTINGS = QOVA + "/etc/ssoclient"
WWW = QOVA + "/www"
BUNDLE = "/etc/ssl/certs/ca-certificates.crt"
WEB_USER = "www-data"

# What RFC 5280 wants in certificates, and strict clients demand.
AUTHORITY = """[req]
distinguished_name = name
x509_extensions = authority
[name]
[authority]
basicConstraints = critical, CA:TRUE
keyUsage = critical, keyCertSign, cRLSign
subjectKeyIdentifier = hash
authorityKeyIdentifier = keyid:always
"""
SERVER = """[req]
distinguished_name = name
x509_extensions = server
[name]
[server]
subjectAltName = DNS:{name}
basicConstraints = critical, CA:FALSE
keyUsage = critical, digitalSignature
extendedKeyUsage = serverAuth
subjectKeyIdentifier = hash
authorityKeyIdentifier = keyid:always
"""
NEW_KEY = ("-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:P-256", "-nodes")


class StageError(Exception):
    """Something that the demo needs is not there; the message is for the person in front of it."""


def run(*command, timeout=60):
    """Runs a command to its end; its output is shown only when it fails."""
    done = subprocess.run(command, stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True,
                          timeout=timeout, check=False)
    if done.returncode != 0:
        raise StageError(f"{' '.join(command[:2])} failed: {done.stdout.strip()[-300:]}")
    return done.stdout


def write(path, text, mode=0o644):
    descriptor = os.open(path, os.O_WRONLY | os.O_CREAT | os.O_TRUNC, mode)
    with os.fdopen(descriptor, "w") as file:
        file.write(text)
    os.chmod(path, mode)


class SystemLog:
    """Reads /dev/log as a syslog daemon would and keeps the lines."""

    MARK = "<14>mark"

    def __init__(self, path="/dev/log"):
        self.lines = []
        self.heard = lambda line: None  # called with each line
        self._socket = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
        self._socket.bind(path)
        os.chmod(path, 0o666)
        self._path = path
        self._marked = threading.Event()
        threading.Thread(target=self._read, daemon=True).start()

    def _read(self):
        while True:
            line = self._socket.recv(65536).decode("utf-8", "replace").rstrip("\0\n")
            if line == self.MARK:
                self._marked.set()
            else:
                self.lines.append(line)
                self.heard(line)

    def catch_up(self):
        """Waits until all that was sent before is in `lines`."""
        self._marked.clear()
        with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as end:
            end.sendto(self.MARK.encode(), self._path)
        if not self._marked.wait(30):
            raise StageError("the system log is not read")


class Stage:
    def __init__(self, device_name, provider_name, device_port, provider_port):
        self.device = f"https://{device_name}:{device_port}"
        self.device_port = device_port
        self.provider_name = provider_name
        self.provider_port = provider_port
        # Where the servers listen; a relay in front of them may have the ports above (narrate.py).
        self.device_listens, self.provider_listens = device_port, provider_port
        self.folder = FOLDER
        self.authority = FOLDER + "/ca.pem"
        self.logs = FOLDER + "/logs"
        self.device_name = device_name
        self.device_certificate = None
        self._processes = {}
        self.log = None

    # -- the namespace ---------------------------------------------------------------------

    def build(self):
        """Prepares the namespace; refuses to touch a file system that is not private."""
        with open("/proc/self/mountinfo", encoding="utf-8") as mounts:
            if " device-usr " not in mounts.read():
                raise StageError("runs inside scripts/sandbox only")
        for folder in ("/run", "/var/cache"):
            run("mount", "-t", "tmpfs", "-o", "mode=755", "stage", folder)
        os.makedirs(self.logs)
        self._private_dev()
        self._private_etc()
        self.log = SystemLog()
        write("/etc/hosts", f"127.0.0.1 localhost {self.device_name} {self.provider_name}\n")
        self._authority()
        self.device_certificate = self.certificate(self.device_name)

    def _private_dev(self):
        """A /dev of the namespace's own: the host's must not get our log socket."""
        dev = FOLDER + "/dev"
        os.mkdir(dev)
        run("mount", "-t", "tmpfs", "-o", "mode=755", "dev", dev)
        for name in ("null", "zero", "full", "random", "urandom", "tty"):
            write(f"{dev}/{name}", "", 0o666)
            run("mount", "--bind", f"/dev/{name}", f"{dev}/{name}")
        os.mkdir(dev + "/shm", 0o1777)
        os.symlink("/proc/self/fd", dev + "/fd")
        run("mount", "--move", dev, "/dev")
        os.rmdir(dev)

    def _private_etc(self):
        """A copy of /etc: names, authorities and the loader's cache are changed in it alone."""
        run("cp", "-a", "/etc", FOLDER + "/etc")
        run("mount", "--bind", FOLDER + "/etc", "/etc")

    def _authority(self):
        write(FOLDER + "/ca.conf", AUTHORITY)
        run("openssl", "req", "-x509", "-config", FOLDER + "/ca.conf", *NEW_KEY, "-days", "30",
            "-subj", "/CN=ssoclient demo authority", "-keyout", FOLDER + "/ca.key",
            "-out", self.authority)
        # libcurl looks nowhere else for authorities.
        with open(self.authority, encoding="ascii") as own, open(BUNDLE, "a") as bundle:
            bundle.write(own.read())

    def certificate(self, name):
        """Issues a certificate for a name; returns the paths of certificate and key."""
        base = f"{FOLDER}/{name}"
        write(base + ".conf", SERVER.format(name=name))
        run("openssl", "req", "-config", base + ".conf", *NEW_KEY, "-subj", "/CN=" + name,
            "-keyout", base + ".key", "-out", base + ".csr")
        run("openssl", "x509", "-req", "-in", base + ".csr", "-CA", self.authority, "-CAkey",
            FOLDER + "/ca.key", "-CAcreateserial", "-days", "30", "-extfile", base + ".conf",
            "-extensions", "server", "-out", base + ".pem")
        return base + ".pem", base + ".key"

    def unknown_certificate(self, name):
        """A certificate for a name that no authority issued; returns the paths as certificate()."""
        base = f"{FOLDER}/{name}-unknown"
        write(base + ".conf", SERVER.format(name=name))
        run("openssl", "req", "-x509", "-config", base + ".conf", *NEW_KEY, "-days", "30",
            "-subj", "/CN=" + name, "-keyout", base + ".key", "-out", base + ".pem")
        return base + ".pem", base + ".key"

    # -- processes -------------------------------------------------------------------------

    def spawn(self, name, command, user=None, environment=None):
        """Starts a server of the stage; it ends with the stage."""
        identity = {}
        if user is not None:
            entry = pwd.getpwnam(user)
            identity = {"user": entry.pw_uid, "group": entry.pw_gid, "extra_groups": []}
        with open(f"{self.logs}/{name}.out", "ab") as out:
            self._processes[name] = subprocess.Popen(
                command, stdin=subprocess.DEVNULL, stdout=out, stderr=out, env=environment,
                start_new_session=True, **identity)

    def wait_for(self, name, port, seconds=20):
        """Waits until a server that was spawned takes connections."""
        end = time.monotonic() + seconds
        while time.monotonic() < end:
            status = self._processes[name].poll()
            if status is not None:
                raise StageError(f"{name} ended at once with status {status}: {self.tail(name)}")
            try:
                socket.create_connection(("127.0.0.1", port), 1).close()
                return
            except OSError:
                time.sleep(0.05)
        raise StageError(f"{name} does not listen on port {port}: {self.tail(name)}")

    def stop(self, name):
        process = self._processes.pop(name)
        process.terminate()
        try:
            process.wait(5)
        except subprocess.TimeoutExpired:
            process.kill()
            process.wait(5)

    def close(self):
        for name in list(self._processes):
            self.stop(name)

    def log_file(self, name, user):
        """An empty log file that a server of that user may write; returns its path."""
        path = f"{self.logs}/{name}.log"
        write(path, "", 0o600)
        os.chown(path, pwd.getpwnam(user).pw_uid, 0)
        return path

    def tail(self, name, lines=10):
        """The last lines that a server wrote."""
        text = []
        for path in (f"{self.logs}/{name}.out", f"{self.logs}/{name}.log"):
            if os.path.exists(path):
                with open(path, encoding="utf-8", errors="replace") as file:
                    text += file.read().splitlines()[-lines:]
        return " | ".join(text)

    # -- the device ------------------------------------------------------------------------

    def install(self, prefix, programs, pages):
        """Puts library, programs and pages where the device has them."""
        for folder in ("lib", "www/webman/ssoclient"):
            os.makedirs(f"{QOVA}/{folder}")
        for name in os.listdir(prefix + "/lib"):
            if name.startswith("libssoclient.so"):
                shutil.copy2(f"{prefix}/lib/{name}", QOVA + "/lib", follow_symlinks=False)
        self._loader()
        shutil.copy(programs + "/index.cgi", WWW)
        os.chmod(WWW + "/index.cgi", 0o755)
        for name in os.listdir(pages):
            shutil.copy(f"{pages}/{name}", WWW + "/webman/ssoclient")
        self.install_login(programs + "/login.cgi", WWW + "/webman/login.cgi", 0o4750)
        self.set_options()

    @staticmethod
    def install_login(source, target, mode):
        """Root's, and for the web server's group alone: nobody else can start it."""
        shutil.copy(source, target)
        os.chown(target, 0, pwd.getpwnam(WEB_USER).pw_gid)
        os.chmod(target, mode)

    @staticmethod
    def _loader():
        """Makes the device's library folder known: a set-id program has no LD_LIBRARY_PATH."""
        write("/etc/ld.so.conf.d/qova.conf", QOVA + "/lib\n")
        run("ldconfig", "-X")

    @staticmethod
    def set_options(**values):
        """Writes the login program's own settings; what is not given keeps its default."""
        write(SETTINGS + "/login.conf", "# Written by the demo.\n" + "".join(
            f"{key} = {value}\n" for key, value in values.items()))

    def configure(self, name, values, mode=0o600):
        """Writes one of the device's three settings files."""
        write(f"{SETTINGS}/{name}.conf", json.dumps(values, indent=2) + "\n", mode)
