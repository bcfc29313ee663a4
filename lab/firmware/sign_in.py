"""Signs a user in on the image, with each client: inside scripts/sandbox.

  sign_in.py IMAGE

The image is mounted read-only and its own start script runs in it. Around it is what a device
has outside of its image: names, certificate authorities, a system log, settings, something that
speaks TLS; and the provider.
"""

import os
import secrets
import shutil
import socket
import ssl
import sys
import threading

HERE = os.path.dirname(os.path.abspath(__file__))
sys.path.insert(0, os.path.join(HERE, "..", "..", "demo"))

from browser import Browser  # noqa: E402
from providers.scripted import Scripted  # noqa: E402
from scene import DEVICE, PROVIDER, Client, Person, settings_of, values_of  # noqa: E402
from servers import Busybox  # noqa: E402
from stage import BUNDLE, SETTINGS, Stage, StageError, run, write  # noqa: E402

EXPECTED = {"azure": "PLANT7.EXAMPLE.NET\\alice", "websphere": "alice"}
MOUNTED = "/mnt"


class Image(Busybox):
    """The web server in the image; its start script starts it."""
    PORT = 8080

    def start(self, environment):
        self.stage.spawn("busybox", [shutil.which("chroot"), MOUNTED, "/etc/init.d/rcS"],
                         environment={"PATH": "/bin", **environment})
        self.stage.wait_for("busybox", self.PORT)
        context = ssl.create_default_context(ssl.Purpose.CLIENT_AUTH)
        context.load_cert_chain(*self.stage.device_certificate)
        self._door = socket.create_server(("127.0.0.1", self.stage.device_port))
        threading.Thread(target=self._accept, args=(context, self.PORT), daemon=True).start()


def surround():
    for path in ("/etc/hosts", SETTINGS, "/dev"):
        run("mount", "--bind", path, MOUNTED + path)
    run("mount", "-t", "proc", "proc", MOUNTED + "/proc")
    # The authorities of a device are in its image; the test's own is in none.
    run("mount", "-t", "tmpfs", "authorities", MOUNTED + os.path.dirname(BUNDLE))
    with open(BUNDLE, encoding="ascii") as bundle:
        write(MOUNTED + BUNDLE, bundle.read())


def configure(stage, provider, person, login):
    for name, add in (("azure", provider.add_azure), ("websphere", provider.add_websphere)):
        client = Client("device-" + name, secrets.token_urlsafe(24), stage.device + login,
                        stage.device + "/webman/ssoclient/relay.html")
        stage.configure(name, settings_of(name, client, add(client), person))


def expect(what, good, seen):
    if not good:
        raise StageError(f"{what}: {seen}")
    print(f"  {what}", flush=True)


def sign_in(stage, provider, server, name):
    stage.configure("profile", {"sso_enable": True, "sso_profile": name}, 0o644)
    browser = Browser(stage.authority)
    relay = stage.device + "/webman/ssoclient/relay.html"
    page = browser.get(stage.device + server.login + "?action=start&origin=" + server.front)
    expect("redirected to the provider", (page.location or "").startswith(provider.url), page.text)
    page = provider.sign_in(browser, browser.get(page.location))
    expect("code and state", {"code", "state"} <= values_of(page.location).keys(), page.location)
    page = browser.get(page.location)
    expect("signed in", (page.location or "").startswith(relay) and
           values_of(page.location).get("success") == "true", page.location or page.text)
    text = browser.get(stage.device + server.front).text
    expect(f"user name {EXPECTED[name]}", f"Signed in as {EXPECTED[name]}." in text, text)


def main():
    # Before the stage is built: it has no loop devices.
    run("mount", "-o", "loop,ro", os.path.abspath(sys.argv[1]), MOUNTED)
    stage = Stage(DEVICE, PROVIDER, 8443, 8444)
    stage.build()
    person = Person("alice", secrets.token_urlsafe(9), "alice@plant7.example.net", {
        "tid": "tenant-7", "unique_name": "alice@plant7.example.net"})
    provider = Scripted(stage, person)
    server = Image(stage)
    try:
        surround()
        provider.start()
        server.start({})
        configure(stage, provider, person, server.login)
        for name in ("azure", "websphere"):
            print(name, flush=True)
            sign_in(stage, provider, server, name)
        return 0
    except StageError as error:
        print(f"sign_in: {error}", file=sys.stderr)
        for line in stage.log.lines[-10:]:
            print("   " + line, file=sys.stderr)
        return 1
    finally:
        stage.close()


if __name__ == "__main__":
    sys.exit(main())
