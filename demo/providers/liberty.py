"""A twin of WebSphere Liberty as an OpenID Connect provider: one provider, one client, one user.

It follows IBM's documentation of WebSphere Liberty, read in November 2026: "OpenID Connect endpoint
URLs", "Configuring an OpenID Connect Provider in Liberty", "Invoking the Token Endpoint",
"Configuring the OpenID Connect Provider to enable RP-initiated logout", and the messages CWOAU and
CWWKS. What those leave open (statuses, which member an error comes with, the header and claims of a
token) is as the project Open Liberty records it in the expectations of its public tests and in its
issues; comments say where. Descriptions of errors are in our own words, with the same values in
them.
"""

import base64
import dataclasses
import html
import os
import secrets
import sys

if not __package__:  # started as a program
    sys.path.insert(0, os.path.dirname(os.path.dirname(os.path.abspath(__file__))))

from providers.jose import RsaKey, base64url, half_hash, hmac_signer, token  # noqa: E402
from providers.twin import Common, Twin, run_alone  # noqa: E402
from providers.web import (Answer, as_json, login_page, page, redirect,  # noqa: E402
                           with_query)

LOGIN, CHECK = "/oidc/login.jsp", "/oidc/j_security_check"
LOGGED_OUT, LOGOUT_ERROR = "/oidc/end_session_logout.html", "/oidc/end_session_error.html"
LIFETIME = 7200

PAGE = """<!DOCTYPE html>
<html lang="en"><head><meta charset="utf-8"><title>{title}</title></head>
<body><main><p id="message">{text}</p></main></body></html>"""

# Code: status and "error" at the token endpoint, and what the message says. The pages' codes have
# no "error". 0025 with unsupported_grant_type, 0029 and 0032 with invalid_grant, 0033 and 1406 for
# a missing client ID with invalid_request, all 400, and 401 for 1406 with wrong credentials: tests
# of Open Liberty's token endpoint. 1455 is recorded with 400; its "error" is our reading.
FAULTS = {
    "CWOAU0025E": (400, "unsupported_grant_type", "The parameter grant_type is not valid: {grant}"),
    "CWOAU0027E": (400, "unsupported_response_type",
                   "The parameter response_type is not valid: {type}"),
    "CWOAU0029E": (400, "invalid_grant", "The token cache has no token with key: {code} type: "
                   "authorization_grant subType: authorization_code"),
    "CWOAU0032E": (400, "invalid_grant", "The received redirect URI: {redirect} does not match "
                   "that of the grant: {asked}"),
    "CWOAU0033E": (400, "invalid_request", "A required parameter is missing: {field}"),
    "CWOAU0035E": (400, "invalid_client", "A public client used the token endpoint, which is "
                   "closed to public clients. The client_id is: {client}"),
    "CWOAU0058E": (400, "invalid_grant", "The token with key: [{code}], type: "
                   "[authorization_grant], and subType: [authorization_code] is expired."),
    "CWOAU0061E": (400, "", "The client was not found, because the client name is not valid. "
                   "Ask the system administrator."),
    "CWOAU0062E": (400, "", "The request cannot be redirected, because the redirect URI is not "
                   "valid. Ask the system administrator."),
    "CWOAU0071E": (401, "invalid_client", "A public client used the {endpoint} endpoint with the "
                   "grant type {grant}, which is for confidential clients. The client_id is: "
                   "{client}"),
    "CWWKS1405E": (400, "invalid_request", "The {endpoint} request lacks the parameter token."),
    "CWWKS1406E": (401, "invalid_client", "The {endpoint} request had an invalid client "
                   "credential. The request URI was {uri}."),
    "CWWKS1455E": (400, "server_error", "There is no signing key. The signature algorithm is "
                   "[{algorithm}]. The shared key has {length} bytes, {least} are needed."),
    "CWWKS1636E": (302, "", "The post logout redirect URI [{redirect}] does not match one of "
                   "client [{client}]."),
}


class Refused(Exception):
    def __init__(self, message, status=None, error=None, **values):
        super().__init__(message)
        self.message, self.values = message, values
        self.status, self.error, _ = FAULTS[message]
        self.status, self.error = status or self.status, error or self.error

    @property
    def text(self):
        return f"{self.message}: {FAULTS[self.message][2].format(**self.values)}"


@dataclasses.dataclass
class Settings(Common):
    provider: str = "OP"              # in the paths
    realm: str = "BasicRealm"
    algorithm: str = "HS256"          # signatureAlgorithm; also HS384, HS512, RS256
    auth_method: str = "post"         # registered for the client: "post", "basic", or "any"
    public_client: bool = False       # the client is registered without a secret
    public_clients: bool = False      # allowPublicClients
    grant_types: list = dataclasses.field(default_factory=lambda: [
        "authorization_code", "client_credentials", "implicit", "refresh_token"])
    secret_length_checked: bool = True  # newer versions want a secret as long as the digest
    session_claim: bool = True          # "sid"


class Liberty(Twin):
    title = "twin of WebSphere Liberty"
    fields = "input[name=j_username]", "input[name=j_password]"  # of the login page
    comes_back = True  # after a logout: the login program sends the ID token along
    goodbye = "You are logged out."
    settings_class = Settings
    session_cookie = "LtpaToken2"
    setups = {"websphere": ("websphere", "add_websphere")}

    def __init__(self, *arguments):
        super().__init__(*arguments)
        self._key = None
        self._access_tokens = {}

    @property
    def base(self):
        return f"/oidc/endpoint/{self.settings.provider}"

    @property
    def issuer(self):
        return self.url + self.base

    # -- requests --------------------------------------------------------------------------

    def serve(self, request):
        if request.path == LOGIN:
            return self._login_page()
        if request.path == CHECK and request.form is not None:
            return self._log_in(request)
        if request.path in (LOGGED_OUT, LOGOUT_ERROR):
            return self._logout_page(request.path)
        if not request.path.startswith(self.base + "/"):
            return Answer(404)
        what = request.path.removeprefix(self.base + "/")
        endpoints = {".well-known/openid-configuration": self._discovery, "jwk": self._key_set,
                     "authorize": self._authorize, "token": self._token,
                     "introspect": self._introspect, "end_session": self._end_session}
        if what not in endpoints:
            return Answer(404)
        try:
            if what in self.settings.fail:
                raise self._forced(self.settings.fail[what], request, what)
            return endpoints[what](request)
        except Refused as refusal:
            self.log.append(refusal.text)
            if what == "authorize":
                return self._page("OAuth error", refusal.text, self.settings.page_status)
            return self._error(refusal, request)

    def _forced(self, code, request, what):
        values = dict.fromkeys(("grant", "type", "code", "redirect", "asked", "field", "algorithm",
                                "length", "least"), "")
        return Refused(code, client=self.settings.client_id, endpoint=what, uri=request.path,
                       **values)

    def _error(self, refusal, request):
        """A client that sent its credentials in a header is also answered in one."""
        headers = {"Cache-Control": "no-store", "Pragma": "no-cache"}
        if refusal.status == 401 and request.headers.get("Authorization", "").startswith("Basic"):
            headers["WWW-Authenticate"] = (f'Basic error="{refusal.error}", '
                                           f'error_description="{refusal.text}", realm=""')
        value = {"error_description": refusal.text, "error": refusal.error}
        return as_json(value, refusal.status, **headers)

    @staticmethod
    def _page(title, text, status=200):
        return page(PAGE.format(title=title, text=html.escape(text)), status)

    # -- documents -------------------------------------------------------------------------

    def _discovery(self, _):
        issuer = self.issuer
        return as_json({
            "introspection_endpoint": issuer + "/introspect",
            "coverage_map_endpoint": issuer + "/coverage_map", "issuer": issuer,
            "authorization_endpoint": issuer + "/authorize", "token_endpoint": issuer + "/token",
            "jwks_uri": issuer + "/jwk", "end_session_endpoint": issuer + "/end_session",
            "revocation_endpoint": issuer + "/revoke", "userinfo_endpoint": issuer + "/userinfo",
            "check_session_iframe": issuer + "/check_session_iframe",
            "response_types_supported": ["code", "token", "id_token token"],
            "subject_types_supported": ["public"],
            "id_token_signing_alg_values_supported": [self.settings.algorithm],
            "scopes_supported": ["openid", "general", "profile", "email", "address", "phone"],
            "claims_supported": ["sub", "groupIds", "name", "preferred_username", "picture",
                                 "locale", "email", "profile"],
            "response_modes_supported": ["query", "fragment", "form_post"],
            "grant_types_supported": self.settings.grant_types,
            "token_endpoint_auth_methods_supported": ["client_secret_post", "client_secret_basic"],
            "claim_types_supported": ["normal"], "claims_parameter_supported": False,
            "request_parameter_supported": False, "request_uri_parameter_supported": False,
            "require_request_uri_registration": False})

    def _key_set(self, _):
        """Empty where the client's secret signs."""
        if self.settings.algorithm[0] == "H":
            return as_json({"keys": []})
        key = self._rsa_key()
        return as_json({"keys": [{"alg": self.settings.algorithm, "use": "sig",
                                  **key.public(key.thumbprint)}]})

    def _rsa_key(self):
        if self._key is None:
            self._key = RsaKey(self.folder + "/liberty")
        return self._key

    def rotate(self):
        self._key = None

    # -- the authorization endpoint --------------------------------------------------------

    def _authorize(self, request):
        """A client or redirect URI that is not known gets a page, with the status of a success
        (expectations of Open Liberty's tests); what is wrong with the rest goes back."""
        query, settings = request.query, self.settings
        if not query.get("client_id"):
            raise Refused("CWOAU0033E", field="client_id")
        if query["client_id"] != settings.client_id:
            raise Refused("CWOAU0061E")
        if query.get("redirect_uri") not in settings.redirect_uris:
            raise Refused("CWOAU0062E")
        kind = query.get("response_type")
        if not kind:
            return self._back(query, Refused("CWOAU0033E", field="response_type"))
        if kind != "code":
            return self._back(query, Refused("CWOAU0027E", type=kind))
        if self.user(request) is None:
            return redirect(self.url + LOGIN, **{"Set-Cookie": _remember(
                with_query(self.url + request.path, query))})
        code = secrets.token_urlsafe(22)[:30]
        self.issue(code, query)
        return redirect(with_query(query["redirect_uri"], {
            "code": code, "state": query.get("state", "")}))

    def _back(self, query, refusal):
        self.log.append(refusal.text)
        return redirect(with_query(query["redirect_uri"], {
            "error": refusal.error, "error_description": refusal.text,
            "state": query.get("state", "")}))

    @staticmethod
    def _login_page(hint=""):
        return login_page(CHECK, hint, "j_username", "j_password", "Login")

    def _log_in(self, request):
        """Form login: back to the request that the cookie remembers."""
        form, settings = request.form, self.settings
        if (form.get("j_username"), form.get("j_password")) != \
                (settings.account, settings.password):
            return self._login_page("Wrong user name or password.")
        there = _plain(request.cookie("WASReqURL") or "")
        headers = self.open_session(settings.account)
        if not there.startswith(self.issuer + "/"):
            return dataclasses.replace(self._page("Login", "You are logged in."), headers=headers)
        return redirect(there, **headers)

    # -- the token endpoint ----------------------------------------------------------------

    def _token(self, request):
        form = request.form or {}
        client = self._authenticate(request, "token")
        grant = form.get("grant_type", "")
        if grant not in self.settings.grant_types:
            raise Refused("CWOAU0025E", grant=grant)
        if grant == "client_credentials":
            return as_json(self._access_token(client, grant))
        if grant != "authorization_code":
            raise Refused("CWOAU0033E", field="refresh_token")
        return self._for_a_code(form)

    def _credentials(self, request):
        """Client ID, secret, and where they are: "basic" in a header, "post" in the body."""
        kind, _, value = request.headers.get("Authorization", "").partition(" ")
        if kind == "Basic":
            name, _, secret = _plain(value).partition(":")
            return name, secret, "basic"
        form = request.form or {}
        return form.get("client_id"), form.get("client_secret"), "post"

    def _authenticate(self, request, endpoint):
        """Who the client is. Without any client ID the request itself is refused, before all else
        with wrong ones, whatever the grant."""
        settings = self.settings
        client, secret, method = self._credentials(request)
        values = {"endpoint": endpoint, "uri": request.path}
        if not client and method == "post":
            raise Refused("CWWKS1406E", 400, "invalid_request", **values)
        if client == settings.client_id and settings.public_client and not secret:
            grant = (request.form or {}).get("grant_type")
            if not settings.public_clients:
                raise Refused("CWOAU0035E", client=client)
            if grant == "client_credentials":
                raise Refused("CWOAU0071E", client=client, endpoint=endpoint, grant=grant)
            return client
        if settings.auth_method not in (method, "any") or \
                (client, secret) != (settings.client_id, settings.client_secret):
            self.log.append(f"CWOAU0038E: The client {client} could not be verified.")
            raise Refused("CWWKS1406E", **values)
        return client

    def _for_a_code(self, form):
        for field in ("code", "redirect_uri"):
            if not form.get(field):
                raise Refused("CWOAU0033E", field=field)
        code = self.codes.get(form["code"])
        if code is None or code.redeemed:
            raise Refused("CWOAU0029E", code=form["code"])
        if self.expired(code):
            raise Refused("CWOAU0058E", code=form["code"])
        asked = code.query["redirect_uri"]
        if form["redirect_uri"] != asked:
            raise Refused("CWOAU0032E", redirect=form["redirect_uri"], asked=asked)
        code.redeemed = True
        answer = self._access_token(self.settings.account, "authorization_code",
                                    code.query.get("scope", ""))
        answer["id_token"] = self.id_token(code.query.get("nonce"), answer["access_token"])
        return as_json(answer, **{"Cache-Control": "no-store", "Pragma": "no-cache"})

    def _access_token(self, subject, grant, scope=""):
        key = secrets.token_urlsafe(30)[:40]
        self._access_tokens[key] = (subject, grant, scope, self.now())
        return {"access_token": key, "token_type": "Bearer", "expires_in": LIFETIME - 1,
                "scope": scope}

    def _introspect(self, request):
        """Members: recorded in Open Liberty's documentation of app passwords."""
        client = self._authenticate(request, "introspect")
        key = (request.form or {}).get("token")
        if not key:
            raise Refused("CWWKS1405E", endpoint="introspect")
        if key not in self._access_tokens:
            return as_json({"active": False})
        subject, grant, scope, issued = self._access_tokens[key]
        return as_json({
            "sub": subject, "grant_type": grant, "realmName": self.settings.realm, "scope": scope,
            "uniqueSecurityName": subject, "iss": self.issuer, "active": True,
            "exp": issued + LIFETIME, "token_type": "Bearer", "iat": issued, "client_id": client})

    # -- ID tokens -------------------------------------------------------------------------

    def id_token(self, nonce=None, access_token=""):
        """Header and claims: recorded in tests of Open Liberty. Under a secret the header is "alg"
        alone."""
        settings, now = self.settings, self.now()
        header = {"alg": settings.algorithm}
        if settings.algorithm[0] == "H":
            self._check_length()
        else:
            header["kid"] = self._rsa_key().thumbprint
        claims = {"iss": self.issuer, "iat": now, "sub": settings.account, "exp": now + LIFETIME,
                  "aud": settings.client_id, "realmName": settings.realm,
                  "uniqueSecurityName": settings.account,
                  "at_hash": half_hash(access_token, settings.algorithm)}
        if settings.session_claim:
            claims["sid"] = secrets.token_urlsafe(16)
        if nonce is not None:
            claims["nonce"] = nonce
        return token(header, claims, self._signer())

    def _signer(self):
        if self.settings.algorithm[0] == "H":
            return hmac_signer(self.settings.client_secret, self.settings.algorithm)
        return self._rsa_key().sign

    def _check_length(self):
        settings = self.settings
        length = len(settings.client_secret.encode())
        least = int(settings.algorithm[2:]) // 8 if settings.secret_length_checked else 1
        if length < least:
            raise Refused("CWWKS1455E", algorithm=settings.algorithm, length=length, least=least)

    # -- logout ----------------------------------------------------------------------------

    def _end_session(self, request):
        """The session ends in any case. Only an ID token says which client asks: without one, no
        post_logout_redirect_uri is that client's, and the user stays on the provider's page."""
        parameters = {**request.query, **(request.form or {})}
        headers = self.close_session(request)
        hint = parameters.get("id_token_hint")
        target = parameters.get("post_logout_redirect_uri")
        if hint and not self._own(hint):
            return redirect(self.url + LOGOUT_ERROR, **headers)
        if target and hint and target in self.settings.logout_uris:
            return redirect(target, **headers)
        if target:
            client = self.settings.client_id if hint else "null"
            self.log.append(Refused("CWWKS1636E", redirect=target, client=client).text)
        return redirect(self.url + LOGGED_OUT, **headers)

    def _own(self, id_token):
        """Whether it is an ID token of this provider, expired or not."""
        signed, _, signature = id_token.rpartition(".")
        return secrets.compare_digest(signature.encode(),
                                      base64url(self._signer()(signed.encode())).encode())

    def _logout_page(self, path):
        good = path == LOGGED_OUT
        return self._page("Logout", "You are logged out." if good else
                          "The logout failed: the ID token is not valid.")

    # -- on the stage ----------------------------------------------------------------------

    def add_websphere(self, client):
        self.register(client)
        return {"wellknown": self.issuer + "/.well-known/openid-configuration",
                "authorization": self.issuer + "/authorize", "token": self.issuer + "/token",
                "logout": self.issuer + "/end_session"}


def _plain(text):
    """What is behind base64; nothing behind any other text."""
    try:
        return base64.b64decode(text, validate=True).decode()
    except ValueError:
        return ""


def _remember(url):
    value = base64.b64encode(url.encode()).decode()
    return f"WASReqURL={value}; Path=/; Secure; HttpOnly"


if __name__ == "__main__":
    run_alone(Liberty)
