"""Set-ups in order: no failure, no warning, exit status 0."""

import json
import os
import re

from diagnosis import DoctorTest, add
from faults_network import proxy
from faults_values import everywhere
from place import (AZURE, CALLBACK, CLIENT, LIBERTY_SECRET, LOGIN, PROFILE, SETTINGS, TENANT,
                   Portal)
from row import all_of, put, replace, text, twin


def linked(place):
    os.rename(f"{SETTINGS}/{AZURE}", "/usr/qova/etc/azure-of-site.json")
    os.symlink("/usr/qova/etc/azure-of-site.json", f"{SETTINGS}/{AZURE}")
    place.later(lambda: os.unlink("/usr/qova/etc/azure-of-site.json"))


def ipv6_only(place):
    place.twin.listen(443, place.certificate, "::1")
    place.hosts(login="::1")


def both_files(place):
    place.values["websphere.conf"] = place._websphere()
    place.save("websphere.conf")


def private_authority(place):
    made = place.certificate_for("login.example.net",
                                 issuer="+/O=Example Net/CN=Example Net Root CA")
    place.served_by(Portal(place.twin.answer), "127.0.0.5", made)


def long_secret(place):
    secret = LIBERTY_SECRET + LIBERTY_SECRET
    put(client_secret=secret)(place)
    place.twin.set(client_secret=secret, algorithm="HS512")


def liberty_id(place):
    place.twin.set(provider="device-op")
    replace("/OP/", "/device-op/")(place)


def appid(place):
    place.twin.set(app_key="own")
    put(wellknown=lambda url: url + "?appid=" + CLIENT)(place)


def program_behind_a_link(place):
    os.rename(LOGIN, "/usr/qova/login-program")
    os.symlink("/usr/qova/login-program", LOGIN)
    place.later(lambda: os.replace("/usr/qova/login-program", LOGIN))


NOTHING = all_of()
# Name, base, set-up, further arguments.
HEALTHY = [
    ("v1.0", "v1", NOTHING, ()),
    ("v1.0, with the secret", "v1", NOTHING, ("--try-secret",)),
    ("v2.0", "v2", NOTHING, ()),
    ("v2.0, with the secret", "v2", NOTHING, ("--try-secret",)),
    ("Liberty", "liberty", NOTHING, ()),
    ("Liberty, with the secret", "liberty", NOTHING, ("--try-secret",)),
    ("private authority", "v2", private_authority, ("--try-secret",)),
    ("proxy", "v1", proxy(""), ("--try-secret",)),
    ("IPv6 only", "v1", ipv6_only, ("--try-secret",)),
    ("unknown keys", "v1", replace("{", '{\n  "x_site": "building 7",'), ()),
    ("link to root's file", "v1", linked, ()),
    ("comments", "v1", text(lambda content: "// device.example.net\n" + content), ()),
    ("Windows line ends", "v2", text(lambda content: content.replace("\n", "\r\n")), ()),
    ("read-only file", "v1", lambda place: os.chmod(f"{SETTINGS}/{AZURE}", 0o400), ()),
    ("one line", "v1", text(lambda content: json.dumps(json.loads(content))), ()),
    ("files of both providers", "v1", both_files, ()),
    ("unknown keys in profile.conf", "v1",
     lambda place: (place.values[PROFILE].update(site="building 7"), place.save(PROFILE)), ()),
    ("signing key of the application", "v1", appid, ("--try-secret",)),
    ("eight keys in the set", "v2", all_of(twin(keys=8), lambda place: place.twin.prepare()), ()),
    ("a v1.0 token", "v1", lambda place: setattr(place, "token", place.twin.id_token(False)), ()),
    ("a v2.0 token", "v2", lambda place: setattr(place, "token", place.twin.id_token(True)), ()),
    ("a token of Liberty", "liberty", lambda place: setattr(place, "token", place.twin.id_token()),
     ()),
    ("HS512 with a long secret", "liberty", long_secret, ("--try-secret",)),
    ("another id of Liberty's provider", "liberty", liberty_id, ("--try-secret",)),
    ("tenant's domain in the URLs", "v1", everywhere(TENANT, "ad.example.net"), ()),
    ("tenant's domain in the URLs of v2.0", "v2", everywhere(TENANT, "ad.example.net"),
     ("--try-secret",)),
    ("host in upper case", "v1", everywhere("login.example.net", "LOGIN.example.net"), ()),
    ("port 443 in the URLs", "v1", everywhere("login.example.net", "login.example.net:443"), ()),
    ("discovery document of v2.0, endpoints of v1.0", "v1", put(
        wellknown=lambda url: url.replace("/.well", "/v2.0/.well")), ()),
    ("escaped slashes", "v1", replace("/", "\\/"), ()),
    ("login program behind a link", "v1", program_behind_a_link, ()),
    ("a token over several lines", "v1", lambda place: setattr(
        place, "token", "\n".join(re.findall(".{1,76}", place.twin.id_token(False)))), ()),
    ("redirect URIs of other devices too", "v1", twin(redirect_uris=[
        "https://other.example.org/cb", CALLBACK]), ()),
    ("error answers in the form of 2018", "v1", twin(era=2018), ("--try-secret",)),
    ("the provider's clock 20 seconds apart", "v1", twin(clock_skew=20), ()),
]


class Healthy(DoctorTest):
    def run_healthy(self, base, set_up, arguments):
        self.place.reset(base)
        self.addCleanup(self.place.reset, "v1")
        set_up(self.place)
        self.result = self.place.sign_in()
        self.assertIn("signed in", self.result)
        self.run_doctor(*arguments)
        self.check(not self.seen, "findings on a set-up in order")
        self.assertEqual(self.status, 0)
        self.assert_silent()


for name, *setup in HEALTHY:
    add(Healthy, name, lambda self, setup=setup: self.run_healthy(*setup))
