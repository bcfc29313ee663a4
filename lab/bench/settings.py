"""The sandboxed device of the benchmark: settings, certificate authority, provider."""
import json
import os
import subprocess

CONFIGURATION = "/usr/qova/etc/ssoclient/"
BUNDLE = "/etc/ssl/certs/ca-certificates.crt"
PORT = 8443


def write_settings(base="https://login.example.net/9f8e7d6c-0000-4000-8000-0123456789ab"):
    settings = {
        "azure_sso_enable": True,
        "azure_client_id": "00000003-0000-0000-c000-000000000000",
        "azure_client_secret": "a client secret of ordinary length, 42 b.",
        "azure_tenant_id": "9f8e7d6c-0000-4000-8000-0123456789ab",
        "azure_wellknown": base + "/discovery",
        "azure_authorization_endpoint": base + "/oauth2/v2.0/authorize",
        "azure_token_endpoint": base + "/token",
        "azure_logout_endpoint": base + "/logout",
        "azure_redirect_uri": "https://device.example.net/webman/login.cgi",
    }
    profile = {"sso_enable": True, "sso_profile": "azure"}
    for name, value in (("azure", settings), ("profile", profile)):
        with open(CONFIGURATION + name + ".conf", "w") as file:
            json.dump(value, file, indent=2)


class Authority:
    """A certificate authority for "localhost", and what the system then trusts."""

    def __init__(self, folder):
        self.folder = folder
        with open(BUNDLE) as file:
            self.system = file.read()
        self._openssl("req", "-x509", "-newkey", "rsa:2048", "-nodes", "-days", "2", "-subj",
                      "/CN=Benchmark CA", "-keyout", "ca.key", "-out", "ca.pem")
        self._openssl("req", "-newkey", "rsa:2048", "-nodes", "-subj", "/CN=localhost", "-keyout",
                      "server.key", "-out", "server.csr")
        with open(self.path("extensions"), "w") as file:
            file.write("subjectAltName=DNS:localhost\n")
        self._openssl("x509", "-req", "-in", "server.csr", "-CA", "ca.pem", "-CAkey", "ca.key",
                      "-CAcreateserial", "-days", "2", "-extfile", "extensions", "-out",
                      "server.pem")
        subprocess.run(["mount", "--bind", self._write("bundle", ""), BUNDLE], check=True)

    def path(self, name):
        return os.path.join(self.folder, name)

    def trust(self, all_of_the_system):
        """Writes the bundle: this authority, with the system's own before it or not."""
        with open(self.path("ca.pem")) as file:
            own = file.read()
        self._write("bundle", (self.system if all_of_the_system else "") + own)

    def _write(self, name, text):
        with open(self.path(name), "w") as file:
            file.write(text)
        return self.path(name)

    def _openssl(self, *arguments):
        subprocess.run(["openssl"] + list(arguments), cwd=self.folder, check=True,
                       capture_output=True)


class Provider:
    def __init__(self, here, material, authority):
        self.process = subprocess.Popen(
            ["/usr/bin/python3", os.path.join(here, "cgi/provider.py"), material,
             authority.path("server.pem"), authority.path("server.key"), str(PORT)],
            stdout=subprocess.PIPE, text=True)
        if self.process.stdout.readline().strip() != "ready":
            raise RuntimeError("the provider does not start")

    def end(self):
        self.process.terminate()
        self.process.wait()


def urls():
    base = "https://localhost:%d" % PORT
    return [base + path for path in ("/token", "/discovery", "/keys")]
