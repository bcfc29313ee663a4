"""Keys and signed tokens, made with the openssl command."""

import base64
import hashlib
import hmac
import json
import ssl
import subprocess

from stage import run

DIGESTS = {"256": "sha256", "384": "sha384", "512": "sha512"}


def base64url(data):
    return base64.urlsafe_b64encode(data).rstrip(b"=").decode()


def signing_input(header, claims):
    return ".".join(base64url(json.dumps(part).encode()) for part in (header, claims))


def token(header, claims, sign):
    signed = signing_input(header, claims)
    return signed + "." + base64url(sign(signed.encode()))


def half_hash(text, algorithm):
    """The claim at_hash of an access token."""
    digest = hashlib.new(DIGESTS[algorithm[2:]], text.encode()).digest()
    return base64url(digest[:len(digest) // 2])


def hmac_signer(secret, algorithm="HS256"):
    return lambda data: hmac.new(secret.encode(), data, DIGESTS[algorithm[2:]]).digest()


class RsaKey:
    """An RSA key with a certificate that it signed itself, in two files below `path`."""

    def __init__(self, path, title="provider"):
        self._path = path + ".key"
        run("openssl", "req", "-x509", "-newkey", "rsa:2048", "-nodes", "-days", "30", "-subj",
            "/CN=" + title, "-keyout", self._path, "-out", path + ".crt")
        with open(path + ".crt", encoding="ascii") as file:
            self._certificate = ssl.PEM_cert_to_DER_cert(file.read())
        modulus = run("openssl", "x509", "-in", path + ".crt", "-noout", "-modulus")
        self._modulus = bytes.fromhex(modulus.split("=")[1].strip())

    def sign(self, data, algorithm="RS256"):
        return subprocess.run(
            ["openssl", "dgst", "-" + DIGESTS[algorithm[2:]], "-sign", self._path], input=data,
            stdout=subprocess.PIPE, check=True, timeout=30).stdout

    def public(self, identity):
        return {"kty": "RSA", "kid": identity, "n": base64url(self._modulus), "e": "AQAB"}

    @property
    def thumbprint(self):
        return base64url(hashlib.sha1(self._certificate).digest())

    @property
    def chain(self):
        return [base64.b64encode(self._certificate).decode()]
