"""A device and twins of both providers, in order: a fault spoils one thing, and all is put back.

The sign-in is the library's own. The browser is not on the device: it reaches the twins by a call,
whatever the device's network does. The doctor runs as installed.
"""

import json
import os
import re
import secrets
import shutil
import subprocess
import sys
import time
import urllib.parse

HERE = os.path.dirname(os.path.abspath(__file__))
sys.path.insert(0, os.path.join(HERE, "..", "..", "demo"))

from providers.entra import Entra  # noqa: E402
from providers.liberty import Liberty  # noqa: E402
from providers.web import Request, Site, page  # noqa: E402
from servers import Lighttpd  # noqa: E402
from stage import BUNDLE, QOVA, SETTINGS, WWW, Stage, run, write  # noqa: E402

DEVICE, PROVIDER = "device.example.net", "login.example.net"
CALLBACK = f"https://{DEVICE}/webman/login.cgi"
RELAY = f"https://{DEVICE}/webman/ssoclient/relay.html"
TENANT = "3f2a8f6e-5b1c-4d7e-9a60-2c4e8d10b7f5"
OTHER_TENANT = "b7d1c0de-1111-4222-8333-944445555666"
CLIENT = "6731de76-14a6-49ae-97bc-6eba6914391e"
SECRET = "Zq8~wN3.vB6_kT1-xR5.hM9~pL2.cJ7_dF4-"       # of the form of Entra ID's
SECRET_ID = "0c9e8d7f-6a5b-4c3d-8e2f-1a0b9c8d7e6f"
LIBERTY_SECRET = "8f3b1c6e9a2d5f7048c1e3b6a9d2f5780b3c6e9f1a4d7025"
LOGIN, HELPER = WWW + "/webman/login.cgi", WWW + "/webman/sign_in"
DOCTOR = QOVA + "/bin/ssoclient-doctor"
WEB_USER = 33
HOSTS = {"device": "127.0.0.1", PROVIDER: "127.0.0.2"}
AZURE, WEBSPHERE, PROFILE = "azure.conf", "websphere.conf", "profile.conf"

ENTRA_URL, LIBERTY_URL = f"https://{PROVIDER}", f"https://{PROVIDER}:9443"


class Portal(Site):
    """Answers every request with one page, as firewalls and portals do."""

    def __init__(self, answer):
        super().__init__()
        self.given = answer

    def answer(self, request):
        self.seen.append((request.method, request.path, request.query, request.form))
        return self.given(request) if callable(self.given) else self.given


class Place:
    """Made once per process."""

    def __init__(self):
        self.stage = Stage(DEVICE, PROVIDER, 443, 443)
        self.stage.build()
        build = os.environ["SSOCLIENT_BUILD"]
        self.stage.install(build + "/demo/prefix", build + "/demo/device",
                           HERE + "/../../device/www")
        self.stage.install_login(build + "/doctor/sign_in", HELPER, 0o4750)
        os.makedirs(QOVA + "/bin", exist_ok=True)
        shutil.copy(build + "/doctor/doctor/ssoclient-doctor", DOCTOR)
        self.set_clock = build + "/doctor/set_clock.so"
        # A whole bundle takes libcurl longer than all else.
        shutil.copy(self.stage.authority, BUNDLE)
        self.certificate = self.stage.certificate(PROVIDER)
        Lighttpd(self.stage).start({})
        self.entra, self.liberty = Entra(), Liberty()
        for twin, url, port in ((self.entra, ENTRA_URL, 443), (self.liberty, LIBERTY_URL, 9443)):
            twin.url = url
            twin.prepare()
            twin.listen(port, self.certificate, HOSTS[PROVIDER])
        self._undo, self._cookies, self._seconds = [], {}, 10
        self.reset("v1")

    # -- as it should be -------------------------------------------------------------------

    def reset(self, base):
        """Everything as it should be, for v1.0 or v2.0 of Entra ID, or for Liberty."""
        while self._undo:
            self._undo.pop()()
        self.base = base
        self.twin = self.liberty if base == "liberty" else self.entra
        self.arguments, self.environment = [], {}
        self.token = self.explained = None
        self.timeout = 20  # of the doctor
        self._cookies = {}
        self.log_start = len(self.stage.log.lines)
        for twin in (self.entra, self.liberty):
            twin.settings = twin.settings_class()
            twin.codes.clear()
            twin.set(redirect_uris=[CALLBACK], logout_uris=[RELAY], password="right")
        self.entra.set(client_id=CLIENT, tenant_id=TENANT, client_secret=SECRET,
                       email_claim=base == "v2")
        self.liberty.set(client_secret=LIBERTY_SECRET)
        self.hosts()
        for name in os.listdir(SETTINGS):
            os.unlink(f"{SETTINGS}/{name}")
        self.values = {PROFILE: {"sso_enable": True, "sso_profile": "azure"},
                       AZURE: self._azure(base == "v2"), WEBSPHERE: self._websphere()}
        if base == "liberty":
            self.values[PROFILE]["sso_profile"] = "websphere"
            del self.values[AZURE]
        else:
            del self.values[WEBSPHERE]
        for name in self.values:
            self.save(name)

    @property
    def file(self):
        """The provider's settings file."""
        return WEBSPHERE if self.base == "liberty" else AZURE

    def _azure(self, v2):
        path, version = ("oauth2/v2.0", "/v2.0") if v2 else ("oauth2", "")
        base = f"{ENTRA_URL}/{TENANT}"
        return {"azure_sso_enable": True, "azure_client_id": CLIENT, "azure_client_secret": SECRET,
                "azure_tenant_id": TENANT,
                "azure_wellknown": f"{base}{version}/.well-known/openid-configuration",
                "azure_authorization_endpoint": f"{base}/{path}/authorize",
                "azure_token_endpoint": f"{base}/{path}/token",
                "azure_logout_endpoint": f"{base}/{path}/logout", "azure_redirect_uri": CALLBACK}

    def _websphere(self):
        base = self.liberty.issuer
        return {"websphere_client_id": "device", "websphere_client_secret": LIBERTY_SECRET,
                "websphere_wellknown": base + "/.well-known/openid-configuration",
                "websphere_authorization_endpoint": base + "/authorize",
                "websphere_token_endpoint": base + "/token",
                "websphere_logout_endpoint": base + "/end_session",
                "websphere_redirect_uri": CALLBACK}

    # -- what a fault changes --------------------------------------------------------------

    def later(self, undo):
        self._undo.append(undo)

    def save(self, name):
        self.write(name, json.dumps(self.values[name], indent=2, ensure_ascii=False) + "\n")

    def write(self, name, text):
        """The bytes of a settings file; str stands for UTF-8."""
        path = f"{SETTINGS}/{name}"
        data = text.encode("utf-8", "surrogateescape") if isinstance(text, str) else text
        with open(path, "wb") as file:
            file.write(data)
        os.chmod(path, 0o644 if name == PROFILE else 0o600)

    def read(self, name):
        with open(f"{SETTINGS}/{name}", encoding="utf-8") as file:
            return file.read()

    def hosts(self, **addresses):
        """The device's name service: login=ADDRESS for the provider, None for no such name."""
        login = addresses.get("login", HOSTS[PROVIDER])
        lines = ["127.0.0.1 localhost", "::1 localhost"]
        if addresses.get("device", True):
            lines.append("127.0.0.1 " + DEVICE)
        if login:
            lines.append(f"{login} {PROVIDER}")
        write("/etc/hosts", "\n".join(lines) + "\n")
        write("/etc/resolv.conf", "nameserver 127.0.0.99\noptions timeout:1 attempts:1\n")

    def served_by(self, site, address, certificate=None, port=443):
        """Another server behind the provider's name, as the device sees it."""
        site.listen(port, certificate or self.certificate, address)
        if site not in (self.entra, self.liberty):
            self.later(site.stop)
        self.hosts(login=address)

    def certificate_for(self, name, subject="/CN=" + PROVIDER, days=30, issuer=None, start=None):
        """A certificate; `issuer` is the name of an authority that the device does not know, or
        with "+" before it, does know. `days` below 0: expired. `start`: YYYYMMDDHHMMSSZ."""
        folder = f"{self.stage.folder}/made-{secrets.token_hex(4)}"
        os.mkdir(folder)
        write(folder + "/extensions", f"subjectAltName=DNS:{name}\n")
        run("openssl", "req", "-new", "-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:P-256",
            "-nodes", "-subj", subject, "-keyout", folder + "/key", "-out", folder + "/csr")
        authority = self.stage.authority, f"{self.stage.folder}/ca.key"
        if issuer:
            authority = folder + "/ca.pem", folder + "/ca.key"
            run("openssl", "req", "-x509", "-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:P-256",
                "-nodes", "-days", "30", "-subj", issuer.lstrip("+"), "-addext",
                "basicConstraints=critical,CA:TRUE", "-keyout", authority[1], "-out", authority[0])
            if issuer.startswith("+"):
                self.trust(authority[0])
        now = time.time()
        begin = start or time.strftime("%Y%m%d%H%M%SZ", time.gmtime(now - 86400 * 60))
        end = time.strftime("%Y%m%d%H%M%SZ", time.gmtime(now + 86400 * days))
        write(folder + "/index", "")
        write(folder + "/serial", secrets.token_hex(8) + "\n")
        write(folder + "/ca.conf", f"""[ca]
default_ca=ca
[ca]
database={folder}/index
serial={folder}/serial
new_certs_dir={folder}
default_md=sha256
policy=any
[any]
commonName=supplied
organizationName=optional
""")
        run("openssl", "ca", "-batch", "-config", folder + "/ca.conf", "-in", folder + "/csr",
            "-cert", authority[0], "-keyfile", authority[1], "-startdate", begin, "-enddate", end,
            "-extfile", folder + "/extensions", "-notext", "-out", folder + "/pem")
        return folder + "/pem", folder + "/key"

    def trust(self, authority):
        """A further authority in the device's bundle."""
        with open(BUNDLE, encoding="ascii") as file:
            before = file.read()
        with open(authority, encoding="ascii") as file:
            write(BUNDLE, before + file.read())
        self.later(lambda: write(BUNDLE, before))

    def device_clock(self, moment):
        """The clock of every program of the device."""
        shutil.copy(self.set_clock, QOVA + "/lib/set_clock.so")
        write("/etc/ld.so.preload", QOVA + "/lib/set_clock.so\n")
        self.later(lambda: os.unlink("/etc/ld.so.preload"))
        self.environment["CLOCK_AT"] = str(int(moment))

    # -- a sign-in -------------------------------------------------------------------------

    def sign_in(self, seconds=30):
        """Signs the user in; returns what came of it: the user, or where it ended and with which
        texts."""
        self._seconds = seconds
        url = self._helper("url")
        if not self._at_the_twin(url):
            return f"the browser is sent to {url}"
        back = self._at_the_provider(url)
        if not back.startswith(CALLBACK + "?"):
            return back
        values = dict(urllib.parse.parse_qsl(back.split("?", 1)[1]))
        if "code" not in values:
            return "came back with " + back.split("?", 1)[1]
        return self._helper("user", values["code"])

    def _at_the_twin(self, url):
        try:
            parts, twin = urllib.parse.urlsplit(url), urllib.parse.urlsplit(self.twin.url)
            return (parts.scheme, parts.hostname, parts.port or 443) == (
                twin.scheme, twin.hostname, twin.port or 443)
        except ValueError:  # no URL at all
            return False

    def _helper(self, *arguments, program=HELPER):
        begin = len(self.stage.log.lines)
        try:
            done = subprocess.run(
                [program, *arguments], stdout=subprocess.PIPE, timeout=self._seconds, check=False,
                user=WEB_USER, group=WEB_USER, extra_groups=[], env=self.environment)
        except subprocess.TimeoutExpired:
            return "does not end"
        except OSError as error:
            return f"does not start: {error}"
        if done.returncode < 0:
            return f"killed by signal {-done.returncode}"
        text = done.stdout.decode("utf-8", "replace").strip()
        if not text.startswith("http"):
            time.sleep(0.02)
            text += "\nlog: " + "\nlog: ".join(
                line.split(": ", 1)[-1] for line in self.stage.log.lines[begin:]
                if "WARNING: setres" not in line)
        return text

    def run_program(self, environment=None):
        """What the login program itself answers to the start of a login."""
        values = {"REQUEST_METHOD": "GET", "QUERY_STRING": "action=start&origin=/index.cgi",
                  **self.environment, **(environment or {})}
        try:
            done = subprocess.run([LOGIN], stdout=subprocess.PIPE, stderr=subprocess.STDOUT,
                                  timeout=5, check=False, user=WEB_USER, group=WEB_USER,
                                  extra_groups=[], env=values)
        except OSError as error:
            return f"does not start: {error}"
        return done.stdout.decode("utf-8", "replace") or f"ended with status {done.returncode}"

    def _at_the_provider(self, url):
        """The person's part, from the authorization URL to the device's address or a page."""
        answer = self._ask("GET", url)
        for _ in range(6):
            target = answer.headers.get("Location")
            if target is not None and not self._at_the_twin(target):
                return target
            if target is not None:
                answer = self._ask("GET", target)
                continue
            form = re.search(r'id="login" method="post" action="([^"]*)"', answer.body)
            if form is None or "Wrong" in answer.body or "AADSTS" in answer.body:
                return f"the provider's page ({answer.status}): {answer.body or 'empty'}"
            action = urllib.parse.urljoin(self.twin.url, form[1].replace("&amp;", "&"))
            name, password = (field.split("=")[1].rstrip("]") for field in self.twin.fields)
            answer = self._ask("POST", action, {name: self.twin.login_name, password: "right"})
        return "too many steps at the provider"

    def _ask(self, method, url, form=None):
        parts = urllib.parse.urlsplit(url)
        query = dict(urllib.parse.parse_qsl(parts.query, keep_blank_values=True))
        headers = {"Cookie": "; ".join(f"{key}={value}" for key, value in self._cookies.items())}
        answer = self.twin.answer(Request(method, parts.path, query, form, b"", headers))
        if "Set-Cookie" in answer.headers:
            key, _, value = answer.headers["Set-Cookie"].partition(";")[0].partition("=")
            self._cookies[key] = value
        return answer

    # -- the doctor ------------------------------------------------------------------------

    def doctor(self, *arguments, json_wanted=True, program=LOGIN):
        """Runs the doctor as an administrator does; returns status and document, or the text."""
        if self.explained is not None:
            command = [DOCTOR, "--explain", self.explained]
        else:
            command = [DOCTOR, "--user", "www-data", "--program", program, "--timeout", str(self.timeout)]
        if self.token is not None:
            command.append("--token")
        command += [*self.arguments, *arguments] + (["--json"] if json_wanted else [])
        done = subprocess.run(command, input=(self.token or "").encode(), capture_output=True,
                              timeout=120, check=False,
                              env={"PATH": "/usr/bin:/bin", **self.environment})
        out = done.stdout.decode("utf-8", "replace")
        if not json_wanted:
            return done.returncode, out + done.stderr.decode("utf-8", "replace")
        return done.returncode, json.loads(out)



_place = None


def place():
    global _place
    if _place is None:
        _place = Place()
    return _place
