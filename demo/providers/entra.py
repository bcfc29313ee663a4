"""A twin of Entra ID (Azure AD): one tenant, one registered application, one user.

It follows these documents of Microsoft Learn, read in November 2026: "OpenID Connect on the
Microsoft identity platform", "ID token claims reference", "Optional claims reference", "Signing
key rollover", "Access tokens" (key sets, ?appid=), "OAuth 2.0 authorization code flow", "OAuth 2.0
client credentials flow" and "Microsoft Entra authentication and authorization error codes". Where
those leave something open, a comment names what the twin does. Unlike the real one it asks for
name and password on one page, and never for a second factor.
"""

import dataclasses
import html
import json
import os
import re
import secrets
import sys
import uuid

if not __package__:  # started as a program
    sys.path.insert(0, os.path.dirname(os.path.dirname(os.path.abspath(__file__))))

from providers import entra_codes  # noqa: E402
from providers.jose import RsaKey, token  # noqa: E402
from providers.twin import Common, Twin, run_alone  # noqa: E402
from providers.web import (Answer, as_json, login_page, page, redirect,  # noqa: E402
                           with_query)

# Tenants that are not one directory; "consumers" is the directory of personal accounts.
SHARED = ("common", "organizations")
CONSUMERS = "9188040d-6c67-4c5b-b112-36a304b66dad"
GRAPH = "00000003-0000-0000-c000-000000000000"

# The form of a code: a version, a dot, and two long base64url parts.
CODE = re.compile(r"[01]\.A[\w-]{20,}\.[\w-]{40,}")
PATH = re.compile(r"/(?P<tenant>[^/]+)/(?P<rest>.+)")
DOMAIN = re.compile(r"[0-9a-fA-F-]{36}|[\w-]+(\.[\w-]+)+")

ERROR_PAGE = """<!DOCTYPE html>
<html lang="en"><head><meta charset="utf-8"><title>Sign in to your account</title>
<script>//<![CDATA[
$Config={config};
//]]></script></head><body><main><h1>Sign in</h1>
<p>The sign-in failed.</p><p id="error">{text}</p></main></body></html>"""
CONSENT_PAGE = """<!DOCTYPE html>
<html lang="en"><head><meta charset="utf-8"><title>Permissions requested</title></head><body><main>
<h1>Permissions requested</h1><form id="consent" method="post" action="{action}">
<button name="consent" value="accept">Accept</button>
<button name="consent" value="cancel">Cancel</button></form></main></body></html>"""
SIGNED_OUT_PAGE = """<!DOCTYPE html>
<html lang="en"><head><meta charset="utf-8"><title>Sign out</title></head><body><main>
<p>You signed out of your account</p></main></body></html>"""


class Refused(Exception):
    """A request that ends in a code."""

    def __init__(self, code, **values):
        super().__init__(code)
        self.code, self.values = code, values


@dataclasses.dataclass
class Settings(Common):
    client_id: str = "6731de76-14a6-49ae-97bc-6eba6914391e"
    tenant_id: str = "3f2a8f6e-5b1c-4d7e-9a60-2c4e8d10b7f5"
    tenant_domain: str = "ad.example.net"    # may replace the tenant ID in paths
    other_tenants: list = dataclasses.field(default_factory=list)  # without the application
    upn: str = "alice@ad.example.net"        # the user principal name, and what the user types
    guest: bool = False           # the user is of another directory
    external_name: bool = False   # a guest's name as the tenant stores it, with #EXT#
    email_claim: bool = False     # the optional claim "email" is configured
    multi_tenant: bool = False    # sign-ins from any directory (common, organizations)
    public_client: bool = False   # "allow public client flows", or a redirect URI of that type
    secret_expired: bool = False
    assigned: bool = True         # with "assignment required"
    consent: str = "given"        # "given", "asked" of the user, or "missing"
    policy: str = ""              # conditional access: "block", "block at token", "mfa at token"
    id_token_flow: bool = False   # response_type=id_token is enabled
    app_key: str = ""             # "": the tenant's keys; "own"; or "missing" (claims mapping)
    keys: int = 5                 # how many the key set has
    rollover: int = 0             # a new key signs after so many key sets were fetched
    mixed_versions: int = 0       # answer to a code of the other version's endpoint; 0: tokens (the
                                  # documents are silent about it)
    era: int = 2024               # the year's form of error answers: 2018, 2020 or 2024


class Entra(Twin):
    title = "twin of Entra ID"
    fields = "input[name=loginfmt]", "input[name=passwd]"  # of the login page
    comes_back = True  # after a logout, to a registered URI
    settings_class = Settings
    session_cookie = "ESTSAUTH"
    setups = {"azure v1.0": ("azure", "add_v1"), "azure v2.0": ("azure", "add_v2")}

    def __init__(self, *arguments):
        super().__init__(*arguments)
        self._made_keys = 0
        self._keys, self._app_key = [], None
        self._fetched = 0

    # -- keys ------------------------------------------------------------------------------

    def prepare(self):
        self._signing_keys()

    def _new_key(self):
        self._made_keys += 1
        return RsaKey(f"{self.folder}/entra-{self._made_keys}")

    def _signing_keys(self):
        """The tenant's keys; the first one signs."""
        while len(self._keys) < self.settings.keys:
            self._keys.append(self._new_key())
        return self._keys[:self.settings.keys]

    def rotate(self):
        """A new key signs, the others stay in the set, but for the oldest."""
        self._keys = [self._new_key(), *self._signing_keys()][:max(self.settings.keys, 1)]

    def _signer(self):
        if self.settings.app_key != "own":
            return self._signing_keys()[0]
        if self._app_key is None:
            self._app_key = self._new_key()
        return self._app_key

    def _key_set(self, tenant, v2, query):
        """Both sets have x5t and x5c, that of v2.0 an issuer too. A key of the application is
        in the set with its ?appid= alone."""
        keys = self._signing_keys()
        if self.settings.app_key == "own" and query.get("appid") == self.settings.client_id:
            keys = [self._signer()]
        answer = as_json({"keys": [
            {"use": "sig", "x5t": key.thumbprint, "x5c": key.chain, **key.public(key.thumbprint),
             **({"issuer": self._issuer(tenant, True)} if v2 else {})} for key in keys]})
        self._fetched += 1
        if self.settings.rollover and self._fetched % self.settings.rollover == 0:
            self.rotate()
        return answer

    # -- documents -------------------------------------------------------------------------

    def _issuer(self, tenant, v2):
        tenant = "{tenantid}" if tenant in SHARED else tenant
        return f"{self.url}/{tenant}/v2.0" if v2 else f"https://sts.windows.net/{tenant}/"

    def _discovery(self, tenant, v2, query):
        path = "oauth2/v2.0" if v2 else "oauth2"
        appid = "?appid=" + query["appid"] if "appid" in query else ""
        # Without an application the v1.0 document names the key set of "common".
        keys = f"{tenant}/discovery/v2.0/keys" if v2 else \
            f"{tenant if appid else 'common'}/discovery/keys"
        return as_json({
            "token_endpoint": f"{self.url}/{tenant}/{path}/token",
            "token_endpoint_auth_methods_supported": [
                "client_secret_post", "private_key_jwt", "client_secret_basic"],
            "jwks_uri": f"{self.url}/{keys}{appid}",
            "response_modes_supported": ["query", "fragment", "form_post"],
            "subject_types_supported": ["pairwise"],
            "id_token_signing_alg_values_supported": ["RS256"],
            "response_types_supported": ["code", "id_token", "code id_token"] + (
                ["id_token token"] if v2 else ["token id_token", "token"]),
            "scopes_supported": ["openid"] + (
                ["profile", "email", "offline_access"] if v2 else []),
            "issuer": self._issuer(tenant, v2), "request_uri_parameter_supported": False,
            "authorization_endpoint": f"{self.url}/{tenant}/{path}/authorize",
            "http_logout_supported": True, "frontchannel_logout_supported": True,
            "end_session_endpoint": f"{self.url}/{tenant}/{path}/logout",
            "claims_supported": ["sub", "iss", "aud", "exp", "iat", "nonce", "name", "tid",
                                 "ver", "email"] + (["preferred_username"] if v2 else ["upn"]),
            "tenant_region_scope": None if tenant in SHARED else "EU"})

    # -- requests --------------------------------------------------------------------------

    def serve(self, request):
        match = PATH.fullmatch(request.path)
        if match is None:
            return Answer(404)
        tenant, rest = self._directory(match["tenant"]), match["rest"]
        v2 = "v2.0/" in rest
        try:
            what = rest.replace("v2.0/", "").removeprefix("oauth2/")
            if what == ".well-known/openid-configuration":
                self._check("discovery", tenant)
                return self._discovery(tenant, v2, request.query)
            if what == "discovery/keys":
                self._check("keys", tenant)
                return self._key_set(tenant, v2, request.query)
            if what == "token":
                return self._token(tenant, v2, request)
            if what == "authorize":
                return self._authorize(tenant, v2, request)
            if what == "logout":
                return self._logout(request)
        except Refused as refusal:
            return self._error(refusal, what)
        return Answer(404)

    def _directory(self, tenant):
        """The tenant ID for its other names; shared tenants, and unknown ones, as they are."""
        tenant = tenant.lower()
        return {self.settings.tenant_domain: self.settings.tenant_id,
                "consumers": CONSUMERS}.get(tenant, tenant)

    def _check(self, endpoint, tenant):
        if endpoint in self.settings.fail:
            raise Refused(self.settings.fail[endpoint])
        if tenant in (*SHARED, CONSUMERS, self.settings.tenant_id, *self.settings.other_tenants):
            return
        raise Refused(90002 if DOMAIN.fullmatch(tenant) else 900023, tenant=tenant)

    def _values(self, values):
        settings = self.settings
        home = "https://sts.windows.net/" + CONSUMERS + "/"
        return {"client": settings.client_id, "tenant": settings.tenant_id, "user": settings.upn,
                "redirect": "", "asked": "", "field": "", "grant": "", "scope": "", "home": home,
                **values}

    def _error(self, refusal, endpoint):
        code, values = refusal.code, self._values(refusal.values)
        if endpoint in ("authorize", "logout") or code == 900561:
            return self._error_page(code, values)
        value = entra_codes.document(code, values, self.url, self.settings.era)
        if code == 90002 and endpoint == ".well-known/openid-configuration":
            value["error"] = "invalid_tenant"
        return as_json(value, entra_codes.FAULTS[code].status)

    def _error_page(self, code, values):
        """Its own page: the code is in the visible text and in the script's $Config object, as
        clients that read the page find it (strServiceExceptionMessage, iErrorCode)."""
        text = entra_codes.description(code, values, self.settings.era)["error_description"]
        config = json.dumps({"iErrorCode": code, "sErrorCode": str(code),
                             "strMainMessage": "", "strServiceExceptionMessage": text})
        return page(ERROR_PAGE.format(config=config.replace("</", "<\\/"), text=html.escape(text)),
                    self.settings.page_status)

    # -- the authorization endpoint --------------------------------------------------------

    def _authorize(self, tenant, v2, request):
        query = request.query or request.form or {}
        self._check("authorize", tenant)
        if not query.get("client_id"):
            raise Refused(900144, field="client_id")
        self._check_client(query["client_id"], tenant)
        if query.get("redirect_uri") not in self.settings.redirect_uris:
            raise Refused(50011, redirect=query.get("redirect_uri", ""))
        if not query.get("response_type"):
            raise Refused(900144, field="response_type")
        if "id_token" in query["response_type"].split() and not self.settings.id_token_flow:
            return self._back(query, 700054)
        if v2 and not query.get("scope"):
            return self._back(query, 900144, field="scope")
        return self._sign_in(tenant, v2, request, query)

    def _check_client(self, client, tenant):
        if client != self.settings.client_id or tenant not in (*SHARED, self.settings.tenant_id):
            raise Refused(700016, client=client, tenant=tenant)
        if tenant in SHARED and not self.settings.multi_tenant:
            raise Refused(50194, tenant=tenant)

    def _sign_in(self, tenant, v2, request, query):
        settings, form = self.settings, request.form or {}
        headers = {}
        user = None if query.get("prompt") == "login" else self.user(request)
        if user is None and query.get("prompt") == "none":
            return self._back(query, 50058)
        if user is None and "loginfmt" in form:
            refusal = self._check_password(request, tenant)
            if refusal is not None:
                return refusal
            headers = self.open_session(settings.upn)
        elif user is None:
            return self._login_page(request)
        if not settings.assigned:
            raise Refused(50105)
        if settings.policy == "block":
            raise Refused(53003)
        return self._consented(v2, request, query, headers)

    def _login_page(self, request, hint=""):
        query = request.query or {name: value for name, value in request.form.items()
                                  if name not in ("loginfmt", "passwd")}
        return login_page(html.escape(with_query(request.path, query)), html.escape(hint),
                          "loginfmt", "passwd", "Sign in to your account")

    def _check_password(self, request, tenant):
        """What the login page answers to a wrong entry, None to the right one. Accounts of
        another directory get a page, all others the form again."""
        typed, settings = request.form["loginfmt"], self.settings
        if typed.lower() == settings.upn.lower():
            if request.form.get("passwd") == settings.password:
                return None
            code = 50126
        elif not typed.lower().endswith("@" + settings.tenant_domain):
            raise Refused(50020, user=typed)
        else:
            code = 50034
        values = self._values({"user": typed, "tenant": tenant})
        return self._login_page(request, entra_codes.description(
            code, values, settings.era)["error_description"])

    def _consented(self, v2, request, query, headers):
        answer = (request.form or {}).get("consent")
        if self.settings.consent == "missing" and query.get("prompt") == "none":
            return self._back(query, 65001)
        if self.settings.consent == "asked" and answer is None:
            action = html.escape(with_query(request.path, query))
            return dataclasses.replace(page(CONSENT_PAGE.format(action=action)), headers=headers)
        if answer == "cancel":
            return self._back(query, 65004)
        code = f"1.A{secrets.token_urlsafe(24)}.{secrets.token_urlsafe(180)}"
        self.issue(code, query, "v2.0" if v2 else "v1.0")
        values = {"code": code, "state": query.get("state", ""), "session_state": uuid.uuid4()}
        return redirect(with_query(query["redirect_uri"], values), **headers)

    def _back(self, query, code, **values):
        """The errors that the client gets: in the query, or where the client wanted a token
        from here, in the fragment. A missing consent is called interaction_required here."""
        era = self.settings.era
        answer = entra_codes.description(code, self._values(values), era)
        error = "interaction_required" if code == 65001 else answer["error"]
        back = {"error": error, "error_description": answer["error_description"],
                **({"error_subcode": "cancel"} if code == 65004 else {}),
                **({"error_uri": f"{self.url}/error?code={code}"} if era >= 2020 else {}),
                "state": query.get("state", "")}
        url = with_query(query["redirect_uri"], back)
        fragment = "id_token" in query.get("response_type", "").split()
        return redirect(url.replace("?", "#", 1) if fragment else url)

    # -- the token endpoint ----------------------------------------------------------------

    def _token(self, tenant, v2, request):
        if request.form is None:
            raise Refused(900561)
        form = request.form
        if not form.get("grant_type"):
            raise Refused(900144, field="grant_type")
        if not form.get("client_id"):
            raise Refused(900144, field="client_id")
        if form["grant_type"] == "client_credentials":
            return self._for_the_client(tenant, v2, form)
        if form["grant_type"] != "authorization_code":
            raise Refused(70003, grant=form["grant_type"])
        return self._for_a_code(tenant, v2, form)

    def _for_a_code(self, tenant, v2, form):
        """The order is: parameters, tenant, form of the code, client, redirect URI, redemption,
        policies."""
        for field in ("code", "redirect_uri"):
            if field not in form:
                raise Refused(900144, field=field)
            if not form[field]:
                raise Refused(90014, field=field)
        self._check("token", tenant)
        if not CODE.fullmatch(form["code"]):
            raise Refused(9002313)
        self._authenticate(tenant, form, 7000218)
        code = self._redeemed(form)
        settings = self.settings
        if settings.mixed_versions and code.edition != ("v2.0" if v2 else "v1.0"):
            raise Refused(settings.mixed_versions)
        if settings.policy in ("block at token", "mfa at token"):
            raise Refused(53003 if settings.policy == "block at token" else 50076)
        if settings.consent == "missing":
            raise Refused(65001)
        if settings.app_key == "missing":
            raise Refused(50146)
        return self._tokens(v2, code)

    def _authenticate(self, tenant, form, missing):
        settings, secret = self.settings, form.get("client_secret")
        self._check_client(form["client_id"], tenant)
        if settings.public_client:
            if secret is not None:
                raise Refused(700025)
        elif not secret:
            raise Refused(missing)
        elif secret != settings.client_secret:
            raise Refused(7000215)
        elif settings.secret_expired:
            raise Refused(7000222)

    def _redeemed(self, form):
        code = self.codes.get(form["code"])
        asked = code.query["redirect_uri"] if code else None
        if code is not None and form["redirect_uri"] != asked:
            raise Refused(500112, redirect=form["redirect_uri"], asked=asked)
        if form["redirect_uri"] not in self.settings.redirect_uris:
            raise Refused(50011, redirect=form["redirect_uri"])
        if code is None:
            raise Refused(70000)
        if self.expired(code):
            raise Refused(70008)
        if code.redeemed:
            raise Refused(54005)
        code.redeemed = True
        return code

    def _for_the_client(self, tenant, v2, form):
        """The grant has no user: what it answers is about tenant, client and secret alone. v2.0
        wants a scope that ends in /.default, v1.0 a resource, for which it has a default."""
        if v2 and not form.get("scope"):
            raise Refused(900144, field="scope")
        self._check("token", tenant)
        if tenant in SHARED:
            raise Refused(50059)
        self._authenticate(tenant, form, 7000216)
        if v2 and not form["scope"].endswith("/.default"):
            raise Refused(1002012, scope=form["scope"])
        return as_json(self._lifetime(v2, form.get("resource", GRAPH)))

    def _lifetime(self, v2, resource):
        """v1.0 writes its numbers as strings, and names the resource."""
        tokens = {"token_type": "Bearer", "access_token": secrets.token_urlsafe(300)}
        if v2:
            return {**tokens, "expires_in": 3599, "ext_expires_in": 3599}
        now = self.now()
        return {**tokens, "expires_in": "3599", "ext_expires_in": "3599", "resource": resource,
                "expires_on": str(now + 3599), "not_before": str(now - 300)}

    def _tokens(self, v2, code):
        scopes = code.query.get("scope", "openid").split()
        answer = {**self._lifetime(v2, GRAPH), "scope": " ".join(scopes)}
        if "openid" in scopes:
            answer["id_token"] = self.id_token(v2, code.query.get("nonce"), scopes)
        return as_json(answer)

    # -- ID tokens -------------------------------------------------------------------------

    def id_token(self, v2, nonce=None, scopes=("openid",)):
        key = self._signer()
        header = {"typ": "JWT", "alg": "RS256", **({} if v2 else {"x5t": key.thumbprint}),
                  "kid": key.thumbprint}
        now, settings = self.now(), self.settings
        claims = {"aud": settings.client_id, "iss": self._issuer(settings.tenant_id, v2),
                  "iat": now - 300, "nbf": now - 300, "exp": now + 3600}
        if nonce is not None:
            claims["nonce"] = nonce
        claims |= self._names(v2, scopes)
        claims |= {"rh": "1." + secrets.token_urlsafe(20), "sub": "pairwise-" + settings.client_id,
                   "tid": settings.tenant_id, "uti": secrets.token_urlsafe(16),
                   "ver": "2.0" if v2 else "1.0"}
        return token(header, claims, key.sign)

    def _names(self, v2, scopes):
        """Who the user is. v1.0 always has unique_name; v2.0 has preferred_username with the scope
        "profile" only. "email" is for guests, or configured as an optional claim, or asked for by
        the scope of v2.0."""
        settings = self.settings
        name = settings.upn
        if settings.guest and settings.external_name:
            name = settings.upn.replace("@", "_") + "#EXT#@" + settings.tenant_domain
        claims = {}
        if settings.guest or settings.email_claim or (v2 and "email" in scopes):
            claims["email"] = settings.email
        if settings.guest:
            claims["idp"] = "https://sts.windows.net/" + CONSUMERS + "/"
        if not v2:
            return {"amr": ["pwd"], "ipaddr": "127.0.0.1", "name": settings.name,
                    "unique_name": name, "upn": name, **claims}
        if "profile" in scopes:
            claims |= {"name": settings.name, "preferred_username": name,
                       "oid": str(uuid.uuid5(uuid.NAMESPACE_URL, settings.upn))}
        return claims

    # -- logout ----------------------------------------------------------------------------

    def _logout(self, request):
        """Comes back to a registered URI only; otherwise the user stays on its page."""
        headers = self.close_session(request)
        target = request.query.get("post_logout_redirect_uri")
        known = [*self.settings.redirect_uris, *self.settings.logout_uris]
        if target in known:
            return redirect(target, **headers)
        return dataclasses.replace(page(SIGNED_OUT_PAGE), headers=headers)

    # -- on the stage ----------------------------------------------------------------------

    def on_stage(self, stage, person):
        super().on_stage(stage, person)
        name = person.claims["unique_name"]
        # The optional claim: a token of v2.0 names the user to the device by it alone.
        self.set(tenant_id=person.claims["tid"], upn=name, tenant_domain=name.split("@")[1],
                 email_claim=True)

    @property
    def login_name(self):
        return self.settings.upn

    def add_v1(self, client):
        self.register(client)
        return self.endpoints(False)

    def add_v2(self, client):
        self.register(client)
        return self.endpoints(True)

    def endpoints(self, v2):
        base, path = f"{self.url}/{self.settings.tenant_id}", "oauth2/v2.0" if v2 else "oauth2"
        return {"wellknown": f"{base}{'/v2.0' if v2 else ''}/.well-known/openid-configuration",
                "authorization": f"{base}/{path}/authorize", "token": f"{base}/{path}/token",
                "logout": f"{base}/{path}/logout"}


if __name__ == "__main__":
    run_alone(Entra)
