"""The demo: a sign-in with each client, from the device's page to the signed-in user and out.

Runs inside scripts/sandbox; scripts/demo is what a person calls.
"""

import argparse
import dataclasses
import re
import secrets
import signal
import sys
import time
import urllib.parse

import forward
from browser import Browser, BrowserError
from providers.glewlwyd import Glewlwyd
from servers import Lighttpd
from stage import Stage, StageError

DEVICE, PROVIDER = "device.localhost", "provider.localhost"
STARTED = time.monotonic()


class StepError(Exception):
    """A step of the sign-in ended in another way than it should."""


@dataclasses.dataclass
class Person:
    account: str
    password: str
    email: str
    claims: dict


@dataclasses.dataclass
class Client:
    identity: str
    secret: str
    redirect_uri: str
    logout_uri: str


def say(text):
    print(f"[{time.monotonic() - STARTED:5.1f}s] {text}", flush=True)


def shown(url):
    """A URL for the eye: long values are cut, the code is not shown at all."""
    url = re.sub(r"([?&]code=)[^&]*", r"\1...", url)
    return re.sub(r"=([^&=#]{28})[^&#]{8,}", r"=\1...", url)


def values_of(url):
    parts = urllib.parse.urlsplit(url)
    return dict(urllib.parse.parse_qsl(parts.query or parts.fragment))


def settings_of(name, client, endpoints, person):
    """The content of a client's settings file."""
    azure = {"azure_sso_enable": True, "azure_tenant_id": person.claims["tid"]}
    # The library adds the way back to Azure's logout alone; for WebSphere it is configured.
    logout = endpoints["logout"] + ("" if name == "azure" else "?post_logout_redirect_uri=" +
                                    urllib.parse.quote(client.logout_uri, safe=""))
    return {
        f"{name}_wellknown": endpoints["wellknown"],
        f"{name}_client_id": client.identity,
        f"{name}_client_secret": client.secret,
        f"{name}_authorization_endpoint": endpoints["authorization"],
        f"{name}_token_endpoint": endpoints["token"],
        f"{name}_redirect_uri": client.redirect_uri,
        f"{name}_logout_endpoint": logout,
        **(azure if name == "azure" else {})}


class Demo:
    def __init__(self, stage):
        self.stage = stage
        self.person = Person("alice", secrets.token_urlsafe(9), "alice@plant7.example.net", {
            "tid": "3f2a8f6e-demo-tenant", "unique_name": "alice@plant7.example.net"})
        self.provider = Glewlwyd(stage, self.person)
        self.server = None
        self.expected = {"azure": "PLANT7.EXAMPLE.NET\\alice", "websphere": "alice"}

    def set_up(self, prefix, programs, pages):
        say("device: private names, certificate authority, system log")
        self.stage.build()
        say(f"device: library, login program (set-id root), web server on {self.stage.device}")
        self.stage.install(prefix, programs, pages)
        self.use_road("checked")
        say(f"provider: {self.provider.title} on {self.provider.url}")
        self.provider.start()
        self._clients()

    def _client(self, name):
        return Client(f"device-{name}", secrets.token_urlsafe(32),
                      self.stage.device + "/webman/login.cgi",
                      self.stage.device + "/webman/ssoclient/relay.html")

    def _clients(self):
        for name, add in (("azure", self.provider.add_azure),
                          ("websphere", self.provider.add_websphere)):
            client = self._client(name)
            self.stage.configure(name, settings_of(name, client, add(client), self.person))

    def choose(self, profile):
        self.stage.configure("profile", {"sso_enable": True, "sso_profile": profile}, 0o644)

    def use_road(self, road, **environment):
        """Plain: the login program calls OIDCLogin. Checked: it also compares the nonce."""
        if self.server is not None:
            self.server.stop()
        self.server = Lighttpd(self.stage)
        self.server.start({"SSO_LOGIN_ROAD": road, **environment})

    def run(self):
        """Signs in and out with each client, on each road; each step says what it saw."""
        for road in ("plain", "checked"):
            self.use_road(road)
            for profile in ("azure", "websphere"):
                self.choose(profile)
                SignIn(self, profile, road).run()


class SignIn:
    EXCHANGE = {"plain": "OIDCLogin", "checked": "login with nonce check"}

    def __init__(self, demo, profile, road):
        self.demo, self.profile = demo, profile
        self.name = f"{profile}/{road}"
        self.steps = ("device page", "start of the login", "provider's login page",
                      "name and password", "consent", "code and state",
                      self.EXCHANGE[road] + ", relay page", "signed in", "sign out")
        self.browser = Browser(demo.stage.authority)
        self.step = 0

    def run(self):
        try:
            self._road()
        except (BrowserError, StepError, KeyError) as error:
            step = self.steps[self.step - 1]
            raise StepError(f"{self.name}: step {self.step} ({step}) failed: {error}") from error

    def _done(self, text):
        say(f"{self.name} {self.step}/{len(self.steps)} {self.steps[self.step - 1]}: {text}")

    def _redirect(self, page, prefix):
        """Where a page sends the browser, which must be below `prefix`."""
        if page.location is None:
            raise StepError(f"no redirect but status {page.status}: {page.text[:200]}")
        if not page.location.startswith(prefix):
            raise StepError(f"redirected to {shown(page.location)}, expected {prefix}...")
        return page.location

    def _road(self):
        device, provider = self.demo.stage.device, self.demo.provider
        relay = device + "/webman/ssoclient/relay.html"

        self.step = 1
        page = self.browser.get(device + "/index.cgi")
        start = page.link("sign-in")
        self._done(page.text)

        self.step = 2
        url = self._redirect(self.browser.get(start), provider.url)
        self._done(shown(url))

        self.step = 3
        page = self.browser.get(self._redirect(self.browser.get(url), provider.url))
        self._done(f"{shown(page.url)} (status {page.status})")

        self.step = 4
        values = provider.sign_in(self.browser, page)
        self._done(f"{self.demo.person.account} is known to {provider.title}")

        self.step = 5
        page = provider.consent(self.browser, values)
        self._done("granted: " + values["scope"])

        self.step = 6
        url = self._redirect(page, device + "/webman/login.cgi?")
        if not {"code", "state"} <= values_of(url).keys():
            raise StepError(f"no code or no state in {shown(url)}")
        self._done(shown(url))

        self.step = 7
        url = self._redirect(self.browser.get(url), relay + "#")
        if values_of(url).get("success") != "true":
            raise StepError("the device says: " + values_of(url).get("reason", "(no reason)"))
        self.browser.get(url)
        self._done(url)

        self.step = 8
        page = self.browser.get(device + values_of(url)["origin"])
        expected = self.demo.expected[self.profile]
        if f"Signed in as {expected}." not in page.text:
            raise StepError(f"expected user {expected}, the device page says: {page.text}")
        self._done(page.text)

        self.step = 9
        url = self._redirect(self.browser.submit(page, "sign-out"), provider.url)
        if self.profile == "azure" and values_of(url).get("post_logout_redirect_uri") != relay:
            raise StepError(f"the logout URL does not lead back to the device: {url}")
        if "Nobody is signed in" not in self.browser.get(device + "/index.cgi").text:
            raise StepError("the device still has a session")
        self._done(f"{shown(url)} (status {self.browser.get(url).status})")
        say(f"{self.name}: user name {expected}")


def serve(demo, profile, sockets):
    demo.choose(profile)
    forward.start(sockets)
    person = demo.person
    print(f"""
The demo is running; profile "{profile}".
  Open        {demo.stage.device}/
  Name        {person.account}
  Password    {person.password}
Both servers' certificates come from an authority made for this run: your browser will warn,
once for the device and once for the provider ({demo.provider.url}/).
Browsers find names below ".localhost" by themselves. If yours does not, add to the hosts file
of the machine where it runs:
  127.0.0.1 {DEVICE} {PROVIDER}
Only this machine is listened to. From another one, let ssh carry both ports:
  ssh -L {demo.stage.device_port}:127.0.0.1:{demo.stage.device_port} \
-L {demo.stage.provider_port}:127.0.0.1:{demo.stage.provider_port} USER@THIS-MACHINE
Ctrl-C ends it.
""", flush=True)
    while True:
        signal.pause()


def show_logs(stage):
    print("-- system log", file=sys.stderr)
    for line in (stage.log.lines if stage.log else [])[-20:]:
        print("   " + line, file=sys.stderr)
    for name in ("lighttpd", "glewlwyd"):
        print(f"-- {name}\n   " + stage.tail(name).replace(" | ", "\n   "), file=sys.stderr)


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("--prefix", required=True)
    parser.add_argument("--programs", required=True)
    parser.add_argument("--pages", required=True)
    parser.add_argument("--port", type=int, required=True)
    parser.add_argument("--serve", choices=("azure", "websphere"))
    parser.add_argument("--sockets", type=int, nargs=2)
    options = parser.parse_args()

    # The first process of a namespace gets no signal that it does not handle.
    for number in (signal.SIGINT, signal.SIGTERM, signal.SIGHUP):
        signal.signal(number, signal.default_int_handler)

    stage = Stage(DEVICE, PROVIDER, options.port, options.port + 1)
    demo = Demo(stage)
    try:
        demo.set_up(options.prefix, options.programs, options.pages)
        if options.serve:
            serve(demo, options.serve, options.sockets)
            return 0
        demo.run()
        say("all sign-ins succeeded")
        return 0
    except (StageError, BrowserError, StepError) as error:
        show_logs(stage)
        print(f"demo: {error}", file=sys.stderr)
        return 1
    except KeyboardInterrupt:
        return 130
    finally:
        stage.close()


if __name__ == "__main__":
    sys.exit(main())
