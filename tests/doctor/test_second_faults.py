"""The doctor on each fault, beside the real sign-in; on set-ups in order; on servers that echo."""

import base64
import html
import json
import os
import re
import unittest
import urllib.parse

import faults_files
import faults_network
import faults_people
import faults_values
from faults_network import proxy
from faults_values import everywhere
from place import (AZURE, CALLBACK, CLIENT, LIBERTY_SECRET, LOGIN, PROFILE, SECRET, SETTINGS, TENANT,
                   Portal, place)
from providers.web import Answer
from row import all_of, put, replace, text, twin

INTERNALS = r"std::|sso_err_resp|sso_op_failed|invalid_argument|Json::"


def shown(finding):
    where = "; ".join(" ".join(one.values()) for one in finding["places"])
    return f"  {finding['grade']} {finding['id']}: {finding['cause']}\n    [{where}] -> " \
           f"{finding['action']}"


def whole(finding):
    places = " ".join(" ".join(one.values()) for one in finding["places"])
    return "\n".join((finding["cause"], places, finding["action"]))


def holds(patterns, content):
    return all(re.search(pattern, content, re.I) for pattern in patterns)


def fits(fault, finding):
    where = whole(finding)
    return (finding["grade"] in fault.grade and holds(fault.says, finding["cause"]) and
            holds(fault.at, where) and holds(fault.do, finding["action"]))


class DoctorTest(unittest.TestCase):
    longMessage = True

    def setUp(self):
        self.place = place()

    def findings(self, document):
        """What an administrator sees without asking for more."""
        return [one for one in document["findings"]
                if one["grade"] != "good" and not one["because"]]

    def check(self, good, what, expected=""):
        if not good:
            self.fail(f"{what}\n sign-in: {self.result[:200]!r}\n expected: {expected}\n"
                      f" got (status {self.status}):\n" +
                      "\n".join(shown(one) for one in self.seen))

    def assert_silent(self, secrets=()):
        """No secret, no internals, in nothing that was written."""
        for one in self.seen:
            self.assertNotRegex(whole(one), INTERNALS)
        for secret in (*secrets, SECRET, LIBERTY_SECRET):
            self.assertNotIn(secret, self.written)

    def run_doctor(self, *arguments):
        self.status, document = self.place.doctor(*arguments)
        self.written = json.dumps(document, ensure_ascii=False)
        self.seen = self.findings(document)
        return document


class FaultTest(DoctorTest):
    def run_fault(self, fault):
        self.place.reset(fault.base)
        self.addCleanup(self.place.reset, "v1")
        fault.set_up(self.place)
        self.result = self.place.run_program() if fault.program else self.place.sign_in(
            2 if fault.sign_in == "does not end" else 10)
        self.assertRegex(self.result, re.compile(fault.sign_in, re.I), "the sign-in itself")
        self.run_doctor(*fault.run)
        expected = f"{'/'.join(fault.grade)} says {fault.says} at {fault.at} do {fault.do}"
        failures = [one for one in self.seen if one["grade"] == "failure"]
        self.assert_silent()
        # The command has all of them here.
        self.assertNotIn("capabilities", self.written)
        for pattern in fault.never:
            self.assertNotIn(pattern, self.written)
        self.check(any(fits(fault, one) for one in self.seen), "not named", expected)
        if fault.grade == ("warning",):
            self.check(not failures, "a failure where a sign-in works", expected)
        self.check(len(failures) <= 1 + fault.more, "further failures", expected)
        self.check(self.status == (1 if failures else 3 if any(
            one["grade"] == "unchecked" for one in self.seen) else 0), "exit status")


class Files(FaultTest):
    module = faults_files


class Values(FaultTest):
    module = faults_values


class Network(FaultTest):
    module = faults_network


class People(FaultTest):
    module = faults_people


class Explained(DoctorTest):
    def run_paste(self, base, set_up, words, action):
        self.place.reset(base)
        self.addCleanup(self.place.reset, "v1")
        set_up(self.place)
        self.assertIn(words, self.place.explained, "the sign-in itself")
        status, document = self.place.doctor()
        found = [one for one in document.get("explanations", [])
                 if one["name"].lower() in words.lower() or words in one["name"]]
        self.assertEqual(status, 0, document)
        self.assertTrue(found, document)
        self.assertRegex(found[0]["meaning"] + " " + found[0]["action"], re.compile(action, re.I))
        self.assertTrue(found[0]["action"])
        written = json.dumps(document)
        for secret in (SECRET, LIBERTY_SECRET):
            self.assertNotIn(secret, written)


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
    made = place.certificate_for("login.example.net", issuer="+/O=Werk/CN=Werk Root CA")
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
    ("unknown keys", "v1", replace('"azure_tenant_id"', '"x_site": "Werk 7",\n  "azure_tenant_id"'),
     ()),
    ("link to root's file", "v1", linked, ()),
    ("comments", "v1", text(lambda content: "// device.example.net\n" + content), ()),
    ("Windows line ends", "v2", text(lambda content: content.replace("\n", "\r\n")), ()),
    ("read-only file", "v1", lambda place: os.chmod(f"{SETTINGS}/{AZURE}", 0o400), ()),
    ("one line", "v1", text(lambda content: json.dumps(json.loads(content))), ()),
    ("files of both providers", "v1", both_files, ()),
    ("unknown keys in profile.conf", "v1",
     lambda place: (place.values[PROFILE].update(site="werk"), place.save(PROFILE)), ()),
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


class Echo(DoctorTest):
    """Servers that return what they were sent, and the secret in particular."""

    FORMS = {
        "as it is": lambda secret: secret,
        "percent": lambda secret: urllib.parse.quote(secret, safe=""),
        "percent, lower case": lambda secret: re.sub(
            "%..", lambda match: match[0].lower(), urllib.parse.quote(secret, safe="")),
        "percent, every byte": lambda secret: "".join(f"%{ord(c):02x}" for c in secret),
        "percent, twice": lambda secret: urllib.parse.quote(
            urllib.parse.quote(secret, safe=""), safe=""),
        "form": urllib.parse.quote_plus,
        "HTML": html.escape,
        "HTML, numbers": lambda secret: "".join(f"&#{ord(c)};" for c in secret),
        "HTML, hexadecimal": lambda secret: "".join(f"&#x{ord(c):X};" for c in secret),
        "JSON": lambda secret: "".join(f"\\u{ord(c):04x}" for c in secret),
        "base64": lambda secret: base64.b64encode(secret.encode()).decode(),
        "base64url": lambda secret: base64.urlsafe_b64encode(secret.encode()).decode().rstrip("="),
        "base64 within a pair": lambda secret: base64.b64encode(
            f"device:{secret}".encode()).decode(),
        "upper case": str.upper,
    }
    SECRET = "Kd7&x+<y>/Q=%'~" + "vB6_kT1-xR5.hM9"

    def parts(self, form):
        """The runs of eight characters of the secret, and of its written form."""
        given = self.FORMS[form](self.SECRET)
        if form.startswith("base64"):
            given = given.rstrip("=")[10 if "pair" in form else 0:]
        return {one[start:start + 8] for one in (self.SECRET, given)
                for start in range(len(one) - 7)}

    def run_echo(self, form, offset):
        self.place.reset("v1")
        self.addCleanup(self.place.reset, "v1")
        put(client_secret=self.SECRET)(self.place)
        self.place.twin.set(client_secret=self.SECRET)
        given = self.FORMS[form](self.SECRET)
        filler = "Lorem ipsum dolor " * 30

        def answer(request):
            if "token" not in request.path and "authorize" not in request.path:
                return self.place.twin.answer(request)
            words = filler[:offset] + given + " " + filler[:40]
            if form == "JSON":
                return Answer(401, '{"error": "invalid_client", "error_description": "' + words +
                              '"}', {"Content-Type": "application/json"})
            body = json.dumps({"error": "invalid_client", "error_description": words})
            return Answer(401, body if offset % 2 else f"<html><title>{words}</title>{words}",
                          {"Content-Type": "application/json" if offset % 2 else "text/html"})
        self.place.served_by(Portal(answer), "127.0.0.5")
        for arguments in (("--try-secret", "--verbose"), ("--try-secret",)):
            _, out = self.place.doctor(*arguments, json_wanted=len(arguments) == 1)
            out = out if isinstance(out, str) else json.dumps(out, ensure_ascii=False)
            joined = re.sub(r"\s+", " ", out)
            unwrapped = re.sub(r"\n\s*", "", out)
            leaked = [part for part in self.parts(form)
                      if part in out or part in joined or part in unwrapped]
            self.assertEqual(leaked, [], f"{form} at {offset}:\n{out}")


def add(test_class, name, function):
    name = "test_" + re.sub(r"\W+", "_", name).strip("_")
    assert not hasattr(test_class, name), name
    setattr(test_class, name, function)


def add_all():
    for test_class in (Files, Values, Network, People):
        for fault in test_class.module.FAULTS:
            add(test_class, fault.name, lambda self, fault=fault: self.run_fault(fault))
    for name, base, set_up, words, action in faults_people.EXPLAINED:
        add(Explained, name, lambda self, row=(base, set_up, words, action): self.run_paste(*row))
    for name, *row in HEALTHY:
        add(Healthy, name, lambda self, row=row: self.run_healthy(*row))
    for number, form in enumerate(Echo.FORMS):
        for offset in (number, 60 + 7 * number, 183 + 2 * number):
            add(Echo, f"{form} at {offset}",
                lambda self, form=form, offset=offset: self.run_echo(form, offset))


add_all()
