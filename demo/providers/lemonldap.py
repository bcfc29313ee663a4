"""LemonLDAP::NG as the OpenID provider: another maker, another language, other habits.

One portal with two clients: "azure" gets ID tokens signed RS256 with the published key and the
claims of a tenant; "websphere" gets them signed HS256 under its secret. All configuration is made
here, in the stage's own folder.
"""

import json
import os
import pwd
import secrets
import shutil
import sqlite3

from providers import BOTH
from stage import WEB_USER, run, write

SHARE = "/usr/share/lemonldap-ng/portal"
HERE = os.path.dirname(os.path.abspath(__file__))

# What the portal reads first: where its configuration is, and what is not part of it.
INI = """
[all]
logLevel = warn
[configuration]
type = File
dirName = {folder}/conf
localStorage = Cache::FileCache
localStorageOptions = {{ 'namespace' => 'configuration', 'default_expires_in' => 600, \
'directory_umask' => '007', 'cache_root' => '{folder}/cache', 'cache_depth' => 3 }}
[portal]
staticPrefix = /static
templateDir = {share}/templates
languages = en
"""

SERVER = """
server.modules = ("mod_openssl", "mod_alias", "mod_fastcgi")
server.bind = "127.0.0.1"
server.port = {port}
server.username = "{user}"
server.groupname = "{user}"
server.document-root = "{share}/htdocs"
server.errorlog = "{log}"
server.breakagelog = "{log}"
mimetype.assign = (".css" => "text/css", ".js" => "text/javascript", ".png" => "image/png",
                   ".svg" => "image/svg+xml", ".ico" => "image/x-icon", ".json" => "application/json",
                   ".woff2" => "font/woff2")
ssl.engine = "enable"
ssl.pemfile = "{certificate}"
ssl.privkey = "{key}"
alias.url = ("/static/" => "{share}/htdocs/static/", "/javascript/" => "/usr/share/javascript/")
$HTTP["url"] !~ "^/(static|javascript)/" {{
  fastcgi.server = ("/" => ((
    "bin-path" => "{share}/htdocs/index.fcgi", "socket" => "{folder}/portal.socket",
    "bin-environment" => ("PERL5LIB" => "{here}", "LLNG_DEFAULTCONFFILE" => "{folder}/portal.ini"),
    "max-procs" => 1, "check-local" => "disable", "fix-root-scriptname" => "enable")))
}}
"""


def _client(client, algorithm, claims):
    """A relying party, as the portal calls it."""
    option = "oidcRPMetaDataOptions"
    return {option + "ClientID": client.identity, option + "ClientSecret": client.secret,
            option + "DisplayName": "Device", option + "IDTokenSignAlg": algorithm,
            option + "UserIDAttr": "uid", option + "IDTokenForceClaims": 1,
            option + "RedirectUris": client.redirect_uri,
            option + "PostLogoutRedirectUris": client.logout_uri,
            # After a consent the portal's logout would end on the portal's own page.
            option + "BypassConsent": 1,
            "claims": {name: name for name in claims}}


class LemonLDAP:
    title = "LemonLDAP::NG"
    fields = "input[name=user]", "input[name=password]"  # of the login page
    comes_back = True  # after a logout
    setups = BOTH

    def __init__(self, stage, person):
        self.url = f"https://{stage.provider_name}:{stage.provider_port}"
        self._stage = stage
        self._person = person
        self._folder = stage.folder + "/lemonldap"
        self._clients = {}
        self._number = 0

    def start(self):
        folder = self._folder
        for name in ("conf", "cache", "sessions/lock", "persistent/lock"):
            os.makedirs(f"{folder}/{name}")
        shutil.copy(HERE + "/SingleAudience.pm", folder)
        write(folder + "/portal.ini", INI.format(folder=folder, share=SHARE))
        self._add_person(folder + "/people.db")
        self._key = run("openssl", "genpkey", "-algorithm", "RSA")
        write(folder + "/key.pem", self._key, 0o600)
        self._public = run("openssl", "pkey", "-in", folder + "/key.pem", "-pubout")
        self._configure()

    def stop(self):
        self._stage.stop("lemonldap")

    def _add_person(self, path):
        person = self._person
        row = {"uid": person.account, "password": person.password, "email": person.email,
               **person.claims}
        with sqlite3.connect(path) as database:
            database.execute(f"CREATE TABLE people ({', '.join(name + ' TEXT' for name in row)})")
            database.execute(f"INSERT INTO people VALUES ({', '.join('?' * len(row))})",
                             list(row.values()))
        database.close()

    def add_azure(self, client):
        """The Azure client; returns the URLs of its endpoints."""
        return self._add("azure", _client(client, "RS256", [*self._person.claims, "email"]))

    def add_websphere(self, client):
        """The WebSphere client; returns the URLs of its endpoints."""
        return self._add("websphere", _client(client, "HS256", []))

    def _add(self, name, client):
        self._clients[name] = client
        self._configure()
        return {"wellknown": self.url + "/.well-known/openid-configuration",
                "authorization": self.url + "/oauth2/authorize",
                "token": self.url + "/oauth2/token", "logout": self.url + "/oauth2/logout"}

    def _configure(self):
        """Writes the portal's configuration as it is now, and starts the portal with it."""
        if self._number:
            self.stop()
        self._number += 1
        write(f"{self._folder}/conf/lmConf-{self._number}.json", json.dumps(self._values()), 0o600)
        certificate, key = self._stage.certificate(self._stage.provider_name)
        path = self._folder + "/lighttpd.conf"
        write(path, SERVER.format(
            port=self._stage.provider_listens, user=WEB_USER, share=SHARE, folder=self._folder,
            here=self._folder, certificate=certificate, key=key,
            log=self._stage.log_file("lemonldap", WEB_USER)))
        run("chown", "-R", WEB_USER, self._folder)
        shutil.rmtree(self._folder + "/cache")
        os.mkdir(self._folder + "/cache")
        os.chown(self._folder + "/cache", pwd.getpwnam(WEB_USER).pw_uid, 0)
        self._stage.spawn("lemonldap", ["lighttpd", "-D", "-f", path])
        self._stage.wait_for("lemonldap", self._stage.provider_listens)

    def _values(self):
        def storage(name):
            return {"Directory": f"{self._folder}/{name}", "LockDirectory":
                    f"{self._folder}/{name}/lock", "generateModule":
                    "Lemonldap::NG::Common::Apache::Session::Generate::SHA256"}
        database = "dbi:SQLite:dbname=" + self._folder + "/people.db"
        exported = {name: name for name in ("uid", "email", *self._person.claims)}
        return {
            "cfgNum": self._number, "cfgAuthor": "stage", "cfgDate": 1, "cfgVersion": "2.16.1",
            "portal": self.url + "/", "domain": self._stage.provider_name, "securedCookie": 1,
            "key": secrets.token_hex(16), "whatToTrace": "_user",
            "globalStorage": "Apache::Session::File", "globalStorageOptions": storage("sessions"),
            "persistentStorage": "Apache::Session::File",
            "persistentStorageOptions": storage("persistent"),
            "localSessionStorage": "Cache::FileCache", "localSessionStorageOptions": {
                "namespace": "sessions", "default_expires_in": 600, "directory_umask": "007",
                "cache_root": self._folder + "/cache", "cache_depth": 3},
            "authentication": "DBI", "userDB": "Same", "passwordDB": "Null",
            "registerDB": "Null", "portalDisplayRegister": 0, "portalDisplayResetPassword": 0,
            "portalCheckLogins": 0,
            "dbiAuthChain": database, "dbiUserChain": database, "dbiAuthUser": "",
            "dbiAuthTable": "people", "dbiUserTable": "people", "dbiAuthLoginCol": "uid",
            "dbiAuthPasswordCol": "password", "dbiPasswordMailCol": "email",
            "dbiExportedVars": exported, "exportedVars": {}, "locationRules": {}, "macros": {},
            "groups": {}, "exportedHeaders": {}, "applicationList": {},
            # A captcha's module is loaded even where none is wanted, and asks for a library that
            # draws: our plugin takes its place.
            "captcha": "SingleAudience",
            "issuerDBOpenIDConnectActivation": 1,
            "oidcServicePrivateKeySig": self._key, "oidcServicePublicKeySig": self._public,
            "oidcServiceKeyIdSig": "portal-key-1",
            # The Azure client asks for the scope "openid" alone.
            "oidcServiceIgnoreScopeForClaims": 1,
            "oidcRPMetaDataOptions": {
                name: {key: value for key, value in client.items() if key != "claims"}
                for name, client in self._clients.items()},
            "oidcRPMetaDataExportedVars": {
                name: client["claims"] for name, client in self._clients.items()}}

    # -- a person in front of the pages ----------------------------------------------------

    @property
    def login_name(self):
        return self._person.account

    def agree(self, tab):
        """Asks nothing after name and password."""

    @staticmethod
    def agree_to_leave(tab):
        """Confirms the logout: anybody could have sent the person to that page."""
        tab.click("button.positive")
