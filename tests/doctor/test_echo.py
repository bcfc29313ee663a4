"""Servers that return what they were sent, the secret in particular."""

import base64
import html
import json
import re
import urllib.parse

from diagnosis import DoctorTest, add
from place import Portal
from providers.web import Answer
from row import put


class Echo(DoctorTest):
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
        "its first 20 bytes": lambda secret: secret[:20],
        "its last 20 bytes": lambda secret: secret[-20:],
        "line feed within": lambda secret: secret[:15] + "\n" + secret[15:],
        "mark-up within": lambda secret: secret[:15] + "<wbr>" + secret[15:],
        "every second byte as percent": lambda secret: "".join(
            f"%{ord(c):02X}" if at % 2 else c for at, c in enumerate(secret)),
        "JSON, twice": lambda secret: json.dumps(json.dumps(secret))[1:-1],
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
            if offset % 3 == 0:
                return Answer(401, f"<html><title>{words}</title>{words}")
            if offset % 3 == 1:
                place = "https://other.example.org/" + words.replace("\n", "%0A").replace(" ", "+")
                return Answer(302, "", {"Location": place})
            body = json.dumps({"error": "invalid_client", "error_description": words})
            return Answer(401, body, {"Content-Type": "application/json"})
        self.place.served_by(Portal(answer), "127.0.0.5")
        for arguments in (("--try-secret", "--verbose"), ("--try-secret",)):
            _, out = self.place.doctor(*arguments, json_wanted=len(arguments) == 1)
            out = out if isinstance(out, str) else json.dumps(out, ensure_ascii=False)
            joined = re.sub(r"\s+", " ", out)
            unwrapped = re.sub(r"\n\s*", "", out)
            leaked = [part for part in self.parts(form)
                      if part in out or part in joined or part in unwrapped]
            self.assertEqual(leaked, [], f"{form} at {offset}:\n{out}")


for number, kind in enumerate(Echo.FORMS):
    for at in (number, 61 + 7 * number, 182 + 4 * number):
        add(Echo, f"{kind} at {at}", lambda self, kind=kind, at=at: self.run_echo(kind, at))
