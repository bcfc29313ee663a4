"""The scene: the device, its clients at a provider, and a person who is known there."""

import dataclasses
import os
import re
import secrets
import sys
import time
import urllib.parse

from providers.glewlwyd import Glewlwyd
from servers import Lighttpd

DEVICE, PROVIDER = "device.localhost", "provider.localhost"
# One clock for the run: the scripts pass on when it began.
STARTED = float(os.environ.get("SSOCLIENT_STARTED", time.time()))


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
    print(f"[{time.time() - STARTED:5.1f}s] {text}", flush=True)


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
    return {
        f"{name}_wellknown": endpoints["wellknown"],
        f"{name}_client_id": client.identity,
        f"{name}_client_secret": client.secret,
        f"{name}_authorization_endpoint": endpoints["authorization"],
        f"{name}_token_endpoint": endpoints["token"],
        f"{name}_redirect_uri": client.redirect_uri,
        f"{name}_logout_endpoint": endpoints["logout"],
        **(azure if name == "azure" else {})}


class Scene:
    def __init__(self, stage, provider=Glewlwyd):
        self.stage = stage
        self.person = Person("alice", secrets.token_urlsafe(9), "alice@plant7.example.net", {
            "tid": "3f2a8f6e-5b1c-4d7e-9a60-2c4e8d10b7f5",
            "unique_name": "alice@plant7.example.net"})
        self.provider = provider(stage, self.person)
        self.server = None
        self.settings = {}
        self.users = {"azure": "PLANT7.EXAMPLE.NET\\alice", "websphere": "alice"}

    def set_up(self, prefix, programs, pages, narrator=None):
        say("device: private names, certificate authority, system log")
        self.stage.build()
        if narrator is not None:
            narrator.set_up()
        say(f"device: library, login program (set-id root), web server on {self.stage.device}")
        self.stage.install(prefix, programs, pages)
        self.server = Lighttpd(self.stage)
        self.server.start({})
        say(f"provider: {self.provider.title} on {self.provider.url}")
        self.provider.start()
        self._clients()

    def _client(self, name):
        return Client(f"device-{name}", secrets.token_urlsafe(32),
                      self.stage.device + "/webman/login.cgi",
                      self.stage.device + "/webman/ssoclient/relay.html")

    def _clients(self):
        """Registers one client per profile, and keeps the settings of each sign-in."""
        clients = {}
        for title, (profile, add) in self.provider.setups.items():
            client = clients.setdefault(profile, self._client(profile))
            endpoints = getattr(self.provider, add)(client)
            self.settings[title] = settings_of(profile, client, endpoints, self.person)

    def choose(self, title):
        """Sets the device up for one of the provider's sign-ins."""
        profile = self.provider.setups[title][0]
        self.stage.configure(profile, self.settings[title])
        self.stage.configure("profile", {"sso_enable": True, "sso_profile": profile}, 0o644)

    def expected(self, title):
        """The name under which the user is then signed in on the device."""
        return self.users[self.provider.setups[title][0]]


def show_logs(stage):
    print("-- system log", file=sys.stderr)
    for line in (stage.log.lines if stage.log else [])[-20:]:
        print("   " + line, file=sys.stderr)
    for name in ("lighttpd", "glewlwyd", "lemonldap"):
        print(f"-- {name}\n   " + stage.tail(name).replace(" | ", "\n   "), file=sys.stderr)
