"""The login program as installed, tokens and names, and what the provider says of a person."""

import json
import os
import shutil
import time

from place import CLIENT, HELPER, LOGIN, OTHER_TENANT, QOVA, RELAY, SETTINGS, TENANT, WWW
from providers.jose import base64url, token
from row import EITHER, Fault, all_of, put, twin
from stage import run, write

# -- the login program ---------------------------------------------------------------------


def both(change):
    """Changes the login program and the sign-in of the test in the same way."""
    def do(place):
        for program in (LOGIN, HELPER):
            copy = program + ".kept"
            shutil.copy2(program, copy)
            status = os.stat(program)

            def undo(program=program, copy=copy, status=status):
                if os.path.lexists(program):
                    os.unlink(program)
                shutil.move(copy, program)
                os.chown(program, status.st_uid, status.st_gid)
                os.chmod(program, status.st_mode & 0o7777)
            place.later(undo)
            change(program)
    return do


def mode(bits):
    return both(lambda program: os.chmod(program, bits))


def owner(user, group, bits):
    def change(program):
        os.chown(program, user, group)
        os.chmod(program, bits)
    return both(change)


def rewritten(change):
    """Other bytes; owner and mode stay."""
    def do(program):
        with open(program, "rb") as file:
            data = file.read()
        with open(program, "wb") as file:
            file.write(change(data))
        os.chown(program, 0, 33)
        os.chmod(program, 0o4750)
    return both(do)


def other_machine(data):
    """e_machine of an ELF file: AArch64."""
    return data[:18] + b"\xb7\x00" + data[20:]


def nosuid(place):
    folder = WWW + "/webman"
    kept = "/run/kept-webman"
    shutil.copytree(folder, kept)
    for name in ("login.cgi", "sign_in"):
        os.chown(f"{kept}/{name}", 0, 33)
        os.chmod(f"{kept}/{name}", 0o4750)
    run("mount", "-t", "tmpfs", "-o", "mode=755,nosuid", "stage", folder)
    for name in os.listdir(kept):
        if os.path.isfile(f"{kept}/{name}"):
            shutil.copy2(f"{kept}/{name}", folder)
            os.chown(f"{folder}/{name}", 0, 33)
            os.chmod(f"{folder}/{name}", 0o4750)
    place.later(lambda: (run("umount", folder), shutil.rmtree(kept)))


def closed_parent(place):
    os.chmod(WWW + "/webman", 0o700)
    place.later(lambda: os.chmod(WWW + "/webman", 0o755))


def no_library(place):
    os.rename(QOVA + "/lib", QOVA + "/lib.away")
    run("ldconfig", "-X")
    place.environment["LD_LIBRARY_PATH"] = QOVA + "/lib.away"  # for the doctor; set-id ignores it

    def undo():
        os.rename(QOVA + "/lib.away", QOVA + "/lib")
        run("ldconfig", "-X")
    place.later(undo)


def writable_library(place):
    os.chown(QOVA + "/lib", 33, 33)
    place.later(lambda: os.chown(QOVA + "/lib", 0, 0))


def launcher_alone(place):
    """The launcher in the login program's place, without its target."""
    both(lambda _: None)(place)
    build = os.environ["SSOCLIENT_BUILD"]
    place.stage.install_login(build + "/demo/device/launcher.cgi", LOGIN, 0o4750)


STORE_FOLDER = "/run/ssoclient"


def old_store(place):
    """As an older login program had it."""
    os.makedirs(STORE_FOLDER, exist_ok=True)
    os.chown(STORE_FOLDER, 33, 33)
    place.later(lambda: os.chown(STORE_FOLDER, 0, 33))


def store_is_a_file(place):
    shutil.rmtree(STORE_FOLDER, ignore_errors=True)
    write(STORE_FOLDER, "")
    place.later(lambda: os.unlink(STORE_FOLDER))


def open_login_conf(place):
    write(f"{SETTINGS}/login.conf", "deadline = 20\n", 0o666)


def writable_parent(place):
    os.chown(WWW + "/webman", 33, 33)
    place.later(lambda: os.chown(WWW + "/webman", 0, 0))


# -- tokens and names ----------------------------------------------------------------------


def pasted(change=lambda text: text, v2=False):
    """An ID token of the twin, as it would come now, changed by the person who pastes it."""
    def do(place):
        given = place.twin.id_token() if place.base == "liberty" else place.twin.id_token(v2)
        place.token = change(given)
    return do


def with_claims(**claims):
    """A token with other claims, signed by the provider."""
    def do(place):
        entra = place.twin
        key = entra._signing_keys()[0]
        now = int(time.time())
        value = {"aud": CLIENT, "tid": TENANT, "exp": now + 3600,
                 "iss": f"https://sts.windows.net/{TENANT}/",
                 "unique_name": "alice@ad.example.net", **claims}
        value = {name: one for name, one in value.items() if one is not None}
        header = {"alg": "RS256", "kid": key.thumbprint}
        place.token = token(header, value, key.sign)
    return do


def encrypted(place):
    header = {"alg": "RSA-OAEP", "enc": "A256GCM"}
    place.token = ".".join([base64url(json.dumps(header).encode())] + [base64url(b"x" * 40)] * 4)


def old_key(place):
    place.token = place.twin.id_token(False)
    place.twin.set(keys=1)
    place.twin.rotate()


# -- what is explained ---------------------------------------------------------------------


def explained(**settings):
    """A sign-in that the provider refuses; its words are pasted."""
    def do(place):
        place.twin.set(**settings)
        place.explained = place.sign_in()
        place.twin.codes.clear()
    return do


def from_the_log(**settings):
    """The same with the provider's own log."""
    def do(place):
        place.twin.set(**settings)
        place.sign_in()
        place.explained = "\n".join(place.twin.log)
    return do


def message(value):
    def do(place):
        place.explained = value
    return do


FINE = "signed in"

PROGRAM = [
    Fault("login program without set-id", mode(0o750), "client_id=&",
          ("set-id|set-user-id|setuid|root",), at=("login.cgi",), do=("chmod|4750|u\\+s",)),
    Fault("set-id bit lost by chown", owner(0, 33, 0o755), "client_id=&",
          ("set-id|set-user-id|setuid|root",), at=("login.cgi",), do=("chmod",)),
    Fault("login program is the web server's", owner(33, 33, 0o4750), "client_id=&", ("own|root",),
          at=("login.cgi",), do=("chown",)),
    Fault("login program not executable for the web server", mode(0o4700), "does not start",
          ("start|execut|run|permission",), at=("login.cgi",),
          do=("chmod|chgrp|chown|permission",)),
    Fault("login program of another group", owner(0, 0, 0o4750), "does not start",
          ("start|execut|run|permission",), at=("login.cgi",), do=("chmod|chgrp|chown|group",)),
    Fault("login program without x", mode(0o4640), "does not start",
          ("start|execut|run|permission",), at=("login.cgi",), do=("chmod",)),
    Fault("login program below a closed folder", closed_parent, "does not start",
          ("folder|directory|start|execut|run|permission",), at=("webman",),
          do=("chmod|permission|open",)),
    Fault("file system with nosuid", nosuid, "client_id=&", ("nosuid",), at=("login.cgi|webman",),
          do=("mount|nosuid",)),
    Fault("login program for another processor", rewritten(other_machine), "does not start",
          ("start|processor|architecture|format|built",), at=("login.cgi",)),
    Fault("login program cut off by a full disk", rewritten(lambda data: data[:3000]),
          "does not start|killed|^\nlog|^$", ("start|damaged|crash|run|killed|signal|format",),
          at=("login.cgi",)),
    Fault("login program is empty", rewritten(lambda data: b""), "does not start|^",
          ("start|empty|run|format|answer",), at=("login.cgi",)),
    Fault("script with Windows line ends",
          rewritten(lambda data: b"#!/bin/sh\r\nexec /bin/true\r\n"), "does not start",
          ("start|line|interpreter|script|not found",), at=("login.cgi",)),
    Fault("login program is missing", both(os.unlink), "does not start",
          ("missing|does not exist|not found|no such",), at=("login.cgi",)),
    Fault("library is not in the loader's folders", no_library, "^$|^\nlog|log: $",
          ("librar|libssoclient",), at=("libssoclient|login.cgi",), do=("ldconfig|ld.so|library",)),
    Fault("login program writable by others", mode(0o4777), FINE, ("writ|replace|change",),
          at=("login.cgi",), do=("chmod",), grade=EITHER),
    Fault("library folder is the web server's", writable_library, FINE, ("librar|folder|writ",),
          at=("/usr/qova/lib",), do=("chown|chmod",), grade=EITHER),
    Fault("launcher without its target", launcher_alone, "success=false",
          ("launcher|target|start|ssoclient-login|librar|answer|login program",),
          at=("login.cgi|ssoclient-login",), program=True),
]

STORE = [
    Fault("store folder is the web server's", old_store, "success=false",
          ("store|folder|login program",), at=("/run/ssoclient|login.cgi",), program=True),
    Fault("a file where the store folder should be", store_is_a_file, "success=false",
          ("store|folder|login program",), at=("/run/ssoclient|login.cgi",), program=True),
    Fault("login.conf writable by all", open_login_conf, "success=false",
          ("login.conf|login program",), at=("login.conf|login.cgi",), program=True),
    Fault("program's folder is the web server's", writable_parent, FINE,
          ("folder|replace|writ|directory",), at=("webman",), do=("chown|chmod",), grade=EITHER),
]

TOKENS = [
    Fault("token response instead of the token", all_of(pasted(lambda given: json.dumps(
          {"token_type": "Bearer", "access_token": "opaque", "id_token": given}))), FINE,
          ("json|response|id_token|segment|form|three",), do=("id_token|id token|token",)),
    Fault("access token of another resource",
          with_claims(aud="00000003-0000-0000-c000-000000000000"), FINE, ("aud|client|audience",),
          do=("id token|client|access|azure_client_id",)),
    Fault("expired only by the device's clock", all_of(twin(clock_skew=-7200), pasted()),
          "id_token expired", ("expired|clock",), do=("clock|time",), more=1),
    Fault("name with two at signs", with_claims(unique_name="alice@ad@example.net"), FINE,
          ("@|name",)),
    Fault("token without any name", with_claims(unique_name=None), FINE,
          ("name|unique_name|email",), do=("email|unique_name|v1",)),
    Fault("v2.0 token without email", all_of(twin(email_claim=False), pasted(v2=True)),
          "cannot find the user name", ("unique_name|email|name",), do=("email|optional|v1",),
          base="v2"),
    Fault("guest with an external name",
          all_of(twin(guest=True, external_name=True, upn="bob@other.example.org"), pasted()), FINE,
          ("guest|#EXT#",), grade=EITHER),
    Fault("token expired", with_claims(exp=int(time.time()) - 4000), FINE, ("expired",),
          do=("clock|new|sign",)),
    Fault("token of another client", with_claims(aud=OTHER_TENANT), FINE, ("aud|client|audience",),
          do=("azure_client_id|client",)),
    Fault("token with api:// as audience", with_claims(aud="api://" + CLIENT), FINE,
          ("aud|client|audience",), do=("id token|access|client|azure_client_id",)),
    Fault("token of another tenant", with_claims(tid=OTHER_TENANT), FINE, ("tid|tenant",),
          do=("azure_tenant_id|tenant",)),
    Fault("name without a domain", with_claims(unique_name="alice"), FINE, ("name|@|form",)),
    Fault("live.com name", with_claims(unique_name="live.com#alice@other.example.org"), FINE,
          ("guest|live.com|personal|#|other",), grade=EITHER),
    Fault("key of the application", all_of(twin(app_key="own"), pasted()), "kid does not exist",
          ("key|kid",), do=("appid",)),
    Fault("token from before the key rollover", old_key, FINE, ("key|kid",)),
    Fault("token cut off", pasted(lambda given: given[:-60]), FINE,
          ("signature|cut|token|incomplete",), do=("whole|again|copy|token|paste",)),
    Fault("only part of the token", pasted(lambda given: given.rsplit(".", 1)[0]), FINE,
          ("part|segment|form|token|dot",)),
    Fault("the code instead of the token", all_of(pasted(lambda _: "1.AXkAbcdefgh." + "x" * 300)),
          FINE, ("code|token|form|part",)),
    Fault("encrypted token", encrypted, FINE, ("encrypt|five|part",)),
    Fault("RS256 at Liberty", all_of(twin(algorithm="RS256"), pasted()), "RS256 algorithm is not",
          ("RS256",), do=("HS256|signatureAlgorithm",), base="liberty", more=1),
    Fault("token signed with another secret", all_of(put(client_secret="y" * 48), pasted()),
          "we cannot find key", ("signature|secret",), do=("websphere_client_secret|secret",),
          base="liberty"),
    Fault("name option without a domain", lambda place: place.arguments.extend(["--name", "alice"]),
          FINE, ("alice|@|form|name",), grade=EITHER),
    Fault("name option with a backslash",
          lambda place: place.arguments.extend(["--name", "AD\\alice"]), FINE, ("@|form|name",),
          grade=EITHER),
]

LIBERTY = [
    Fault("Liberty signs with RS256", twin(algorithm="RS256"), "RS256 algorithm is not supported",
          ("RS256|algorithm",), do=("HS256|signatureAlgorithm",), base="liberty"),
    Fault("secret too short for HS256",
          all_of(twin(client_secret="short-secret-16b"), put(client_secret="short-secret-16b")),
          "we cannot find key", ("secret", "32|short|16"), at=("websphere_client_secret",),
          do=("32|longer",), grade=EITHER, base="liberty"),
    Fault("secret too short for HS512", twin(algorithm="HS512"), "we cannot find key",
          ("secret|HS512", "64|short|48|HS512"), at=("websphere_client_secret",), grade=EITHER,
          base="liberty"),
    Fault("client registered for basic only", twin(auth_method="basic"), "we cannot find key",
          ("secret|authenticat|method|basic",), do=("client_secret_post|basic|secret",),
          run=("--try-secret",), base="liberty"),
    Fault("token endpoint broken", twin(fail={"token": "CWWKS1455E"}), "we cannot find key",
          ("secret|key|sign|server_error|CWWKS1455E",), grade=EITHER, run=("--try-secret",),
          base="liberty"),
]


EXPLAINED = [
    ("user not assigned", "v1", explained(assigned=False), "AADSTS50105", "assign|group|user"),
    ("conditional access at sign-in", "v1", explained(policy="block"), "AADSTS53003",
     "conditional access|policy|policies"),
    ("conditional access at the token endpoint", "v1", explained(policy="block at token"),
     "AADSTS53003", "conditional access|policy|policies"),
    ("second factor at the token endpoint", "v2", explained(policy="mfa at token"), "AADSTS50076",
     "factor|mfa|authentication"),
    ("no consent", "v1", explained(consent="missing"), "AADSTS65001", "consent"),
    ("signing key of the application missing", "v1", explained(app_key="missing"), "AADSTS50146",
     "key|certificate|claims"),
    ("code too old", "v1", explained(code_seconds=0), "AADSTS70008", "code|clock|again|expire"),
    ("redirect URI not registered", "v1", explained(redirect_uris=[RELAY]), "AADSTS50011",
     "redirect"),
    ("answers in the form of 2018", "v1", explained(secret_expired=True, era=2018),
     "AADSTS7000222", "secret"),
    ("application unknown", "v1", explained(client_id=OTHER_TENANT), "AADSTS700016",
     "application|client|tenant"),
    ("key of the application", "v1", explained(app_key="own"),
     "kid does not exist in Azure verified kyes", "appid|key"),
    ("no name in the token", "v2", explained(email_claim=False), "cannot find the user name!",
     "email|optional claim"),
    ("consent declined, from the browser's address", "v1", message(
        "https://device.example.net/webman/login.cgi?error=access_denied&error_description="
        "AADSTS65004%3a+User+declined+to+consent&error_uri=https%3a%2f%2flogin.example.net"),
     "AADSTS65004", "consent|declin"),
    ("source of an error page", "v1", message(
        "$Config={&quot;strServiceExceptionMessage&quot;:&quot;AADSTS50020: User account "
        "&#39;bob@other.example.org&#39; from identity provider does not exist in tenant"),
     "AADSTS50020", "guest|tenant|account|directory"),
    ("code in lower case among other words", "v1", message(
        "nov 22 device: sign-in failed: aadsts7000218: the request body must contain"),
     "aadsts7000218", "secret"),
    ("Liberty: client unknown", "liberty", explained(client_id="other"), "CWOAU0061E", "client"),
    ("Liberty: redirect URI", "liberty", explained(redirect_uris=[RELAY]), "CWOAU0062E",
     "redirect"),
    ("Liberty: short secret, from its log", "liberty", from_the_log(algorithm="HS512"),
     "CWWKS1455E", "secret|key|32|64"),
    ("Liberty: refused, the library's message", "liberty", explained(auth_method="basic"),
     "we cannot find key 'id_token' in response!", "log|secret|provider|post"),
    ("Liberty: code too old, from its log", "liberty", from_the_log(code_seconds=0), "CWOAU0058E",
     "code|expire|clock|again"),
]

FAULTS = PROGRAM + STORE + TOKENS + LIBERTY
