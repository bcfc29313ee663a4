"""Glewlwyd as the OpenID provider of the demo, set up through its own interface.

Two realms with one client each: "azure" signs its ID tokens RS256, publishes the key and adds
the claims of a tenant; "websphere" signs HS256 under the client's secret.
"""

import os
import pwd
import secrets
import shutil
import sqlite3
import urllib.parse

from browser import Browser, BrowserError
from providers import BOTH
from stage import run, write

SCHEMA = "/usr/share/dbconfig-common/data/glewlwyd/install/sqlite3"
WEBAPP = "/usr/share/glewlwyd/webapp"
PAGE_SETTINGS = "/usr/share/glewlwyd/templates/config.json"
USER = "glewlwyd"
# Its end-session endpoint does nothing without an ID token. This page of its web interface ends
# the session; the last parameter takes what the device appends.
LOGOUT = "/login.html?prompt=single_logout&from=device"

CONFIG = """
port = {port}
bind_address = "127.0.0.1"
external_url = "{url}"
login_url = "login.html"
api_prefix = "api"
static_files_path = "{folder}/webapp/"
cookie_secure = 1
log_mode = "file"
log_level = "INFO"
log_file = "{log}"
admin_scope = "g_admin"
profile_scope = "g_profile"
user_module_path = "/usr/lib/glewlwyd/user"
client_module_path = "/usr/lib/glewlwyd/client"
user_auth_scheme_module_path = "/usr/lib/glewlwyd/scheme"
plugin_module_path = "/usr/lib/glewlwyd/plugin"
use_secure_connection = true
secure_connection_key_file = "{folder}/tls.key"
secure_connection_pem_file = "{certificate}"
secure_connection_ca_file = "{authority}"
hash_algorithm = "SHA512"
database = {{ type = "sqlite3" path = "{folder}/glewlwyd.db" }}
static_files_mime_types = ({types})
"""

TYPES = {
    ".html": "text/html", ".css": "text/css", ".js": "application/javascript",
    ".json": "application/json", ".png": "image/png", ".ico": "image/x-icon",
    ".ttf": "font/ttf", ".woff": "font/woff", ".woff2": "font/woff2",
}

REALM = {
    "access-token-duration": 3600, "refresh-token-duration": 3600, "code-duration": 600,
    "refresh-token-rolling": True, "allow-non-oidc": False, "auth-type-code-enabled": True,
    "auth-type-refresh-enabled": True, "subject-type": "public", "jwks-show": True,
    "allowed-scope": ["openid", "profile", "email"], "name-claim": "no",
    "session-management-allowed": True, "session-cookie-name": "GLEWLWYD2_OIDC_SID",
    "session-cookie-expiration": 3600,
    "client-jwks-parameter": "jwks", "client-jwks_uri-parameter": "jwks_uri",
}


class Glewlwyd:
    title = "Glewlwyd"
    fields = "#username", "#password"  # of the login page
    comes_back = False  # after a logout
    goodbye = "Session closed"
    why_not_back = "it closes the session and does not redirect"
    setups = BOTH

    def __init__(self, stage, person):
        self.url = f"https://{stage.provider_name}:{stage.provider_port}"
        self._stage = stage
        self._person = person
        self._folder = stage.folder + "/glewlwyd"
        self._administrator = None

    # -- set-up ----------------------------------------------------------------------------

    def start(self):
        self._files()
        self._stage.spawn("glewlwyd", ["glewlwyd", "-c", self._folder + "/glewlwyd.conf"], USER)
        self._stage.wait_for("glewlwyd", self._stage.provider_listens)
        self._take_over()
        self._add_person()

    def stop(self):
        self._stage.stop("glewlwyd")

    def _files(self):
        folder, owner = self._folder, pwd.getpwnam(USER).pw_uid
        os.mkdir(folder, 0o700)
        shutil.copytree(WEBAPP, folder + "/webapp", ignore=shutil.ignore_patterns("config.json"))
        # The packaged page's settings are a link to a folder: the page would wait for ever.
        shutil.copy(PAGE_SETTINGS, folder + "/webapp/config.json")
        self._database(folder + "/glewlwyd.db")
        certificate, key = self._stage.certificate(self._stage.provider_name)
        shutil.copy(key, folder + "/tls.key")
        log = self._stage.log_file("glewlwyd", USER)
        types = ", ".join(f'{{ extension = "{extension}" mime_type = "{kind}" }}'
                          for extension, kind in TYPES.items())
        write(folder + "/glewlwyd.conf", CONFIG.format(
            port=self._stage.provider_listens, url=self.url, folder=folder, types=types, log=log,
            certificate=certificate, authority=self._stage.authority))
        for path in (folder, folder + "/glewlwyd.db", folder + "/tls.key"):
            os.chown(path, owner, 0)

    def _database(self, path):
        database = sqlite3.connect(path)
        with open(SCHEMA, encoding="utf-8") as schema:
            database.executescript(schema.read())
        # Left to itself it makes up a random "sub", which is the user's name for WebSphere.
        database.execute("INSERT INTO gpo_subject_identifier (gposi_plugin_name, gposi_username,"
                         " gposi_sub) VALUES ('websphere', ?, ?)",
                         (self._person.account, self._person.account))
        database.commit()
        database.close()

    def _api(self, method, path, value=None):
        return self._administrator.call(method, f"{self.url}/api/{path}", value)

    def _take_over(self):
        """The packaged database has a known administrator: gives it its own password."""
        self._administrator = Browser(self._stage.authority)
        self._api("POST", "auth/", {"username": "admin", "password": "password"})
        self._api("PUT", "profile/password", {"old_password": "password",
                                              "password": secrets.token_urlsafe(24)})

    def _add_person(self):
        person = self._person
        backend = self._api("GET", "mod/user/database")
        for name in person.claims:
            backend["parameters"]["data-format"][name] = {
                "multiple": False, "read": True, "write": True,
                "profile-read": True, "profile-write": False}
        self._api("PUT", "mod/user/database", backend)
        self._api("PUT", "mod/user/database/reset")
        for scope in ("profile", "email"):
            self._api("POST", "scope/", {"name": scope, "display_name": scope,
                                         "password_required": False, "scheme": {}})
        self._api("POST", "user/", self._user())

    def _user(self):
        person = self._person
        return {"username": person.account, "password": person.password, "name": person.account,
                "email": person.email, "enabled": True, **person.claims,
                "scope": ["openid", "profile", "email", "g_profile"]}

    def change_claim(self, name, value):
        """Gives a claim of the person another value."""
        self._person.claims[name] = value
        self._api("PUT", "user/" + self._person.account, self._user())

    def add_azure(self, client):
        """The realm of the Azure client; returns the URLs of its endpoints."""
        key = run("openssl", "genpkey", "-algorithm", "RSA")
        write(self._folder + "/azure.key", key, 0o600)
        public = run("openssl", "pkey", "-in", self._folder + "/azure.key", "-pubout")
        return self._add_realm("azure", client, {"jwt-type": "rsa", "key": key, "cert": public},
                               self._person.claims)

    def add_websphere(self, client):
        """The realm of the WebSphere client; returns the URLs of its endpoints."""
        return self._add_realm("websphere", client, {"jwt-type": "sha", "key": client.secret}, [])

    def _add_realm(self, name, client, signature, claims):
        self._api("POST", "mod/plugin/", {
            "module": "oidc", "name": name, "display_name": name, "enabled": True,
            "order_rank": 0,
            "parameters": {
                **REALM, **signature, "jwt-key-size": "256", "iss": f"{self.url}/api/{name}",
                "email-claim": "mandatory" if claims else "no",
                "claims": [{"name": claim, "user-property": claim, "type": "string",
                            "mandatory": True, "on-demand": False, "scope": []}
                           for claim in claims]}})
        self._api("POST", "client/", {
            "client_id": client.identity, "name": "Device", "confidential": True,
            "enabled": True, "client_secret": client.secret,
            "redirect_uri": [client.redirect_uri],
            "post_logout_redirect_uri": client.logout_uri, "authorization_type": ["code"],
            "token_endpoint_auth_method": ["client_secret_post"], "scope": []})
        return {part: f"{self.url}/api/{name}/{path}" for part, path in (
            ("wellknown", ".well-known/openid-configuration"), ("authorization", "auth"),
            ("token", "token"))} | {"logout": self.url + LOGOUT}

    # -- a person in front of the login page -----------------------------------------------

    @property
    def login_name(self):
        return self._person.account

    def sign_in(self, browser, page):
        """Does what the login page's script does with name and password; returns its answer."""
        values = dict(urllib.parse.parse_qsl(urllib.parse.urlsplit(page.url).query))
        if "callback_url" not in values:
            raise BrowserError(f"this is not the provider's login page: {page.url}")
        browser.call("POST", self.url + "/api/auth/", {
            "username": self._person.account, "password": self._person.password})
        return values

    def consent(self, browser, values):
        """Grants the client what it asked for, where it is not granted; returns the next page."""
        grant = f"{self.url}/api/auth/grant/{values['client_id']}/"
        scopes = browser.call("GET", grant + urllib.parse.quote(values["scope"]))["scope"]
        if not all(scope["granted"] for scope in scopes):
            browser.call("PUT", grant, {"scope": values["scope"]})
        return browser.get(values["callback_url"] + "&g_continue")

    @staticmethod
    def agree(tab):
        """Ticks what the client asks for, where that is not granted yet, and goes on."""
        tab.find("button.btn-success")
        boxes = [box for box in tab.all(".form-check-input") if box.is_enabled()]
        for box in boxes:
            box.click()
        if boxes:
            tab.click("button.btn-primary")
            tab.wait(lambda: not tab.all(".form-check-input"), "the grant")
        tab.click("button.btn-success")

    @staticmethod
    def agree_to_leave(tab):
        """Confirms the logout."""
        tab.click("button.btn-danger")
