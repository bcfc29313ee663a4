"""The errors of Entra ID: code, HTTP status, "error", and what the description says.

Codes and meanings: "Microsoft Entra authentication and authorization error codes" (Microsoft
Learn). Statuses and the member "error": answers that people recorded in public issue trackers,
named per line where there is one. Descriptions are in our own words, with the same values in them.
"""

import dataclasses
import time
import uuid


@dataclasses.dataclass
class Fault:
    status: int
    error: str
    text: str
    more: dict = dataclasses.field(default_factory=dict)


# Conditional access names the demand in "claims": recorded in
# AzureAD/microsoft-authentication-library-for-js issue 5491.
CLAIMS = '{"access_token":{"capolids":{"essential":true,"values":["7d1d1c2e-0000-4000-8000-1"]}}}'

FAULTS = {
    # The request. 900144 and 9002313 are recorded with status 400; 9002313 comes as invalid_grant
    # for a code of the wrong form (MicrosoftDocs/azure-docs issue 63819).
    900144: Fault(400, "invalid_request", "The request lacks the parameter '{field}'."),
    90014: Fault(400, "invalid_request",
                 "The required field '{field}' of the credential is empty."),
    9002313: Fault(400, "invalid_grant", "The request is malformed or invalid."),
    900561: Fault(400, "invalid_request", "The endpoint takes POST requests only."),
    70003: Fault(400, "unsupported_grant_type", "The grant type '{grant}' is not supported."),
    1002012: Fault(400, "invalid_scope",
                   "Scope '{scope}' is not valid: client credentials want a '/.default' scope."),
    # The tenant. The discovery document answers invalid_tenant (Azure/azure-cli issue 22145), the
    # token endpoint invalid_request (microsoft/azure-tools-for-java issue 3900).
    90002: Fault(400, "invalid_request",
                 "Tenant '{tenant}' not found: check the tenant ID and the cloud."),
    900023: Fault(400, "invalid_request",
                  "Tenant identifier '{tenant}' is neither a DNS name nor a known domain."),
    50194: Fault(400, "invalid_request", "Application '{client}' is not a multi-tenant one; "
                 "'{tenant}' is not for it."),
    50059: Fault(400, "invalid_request", "The request names no tenant, nor does a credential."),
    # The client. 401 for the secret's codes (OfficeDev/microsoft-365-agents-toolkit issue 8621,
    # microsoft/botframework-sdk issue 6221, Azure-Samples/active-directory-dotnet-native-aspnetcore
    # issue 22); 700016 is unauthorized_client (12Knocksinna/Office365itpros issue 23).
    700016: Fault(400, "unauthorized_client",
                  "Application '{client}' was not found in the directory '{tenant}'."),
    7000215: Fault(401, "invalid_client", "Invalid client secret for application '{client}': send "
                   "the secret's value, not its ID."),
    7000222: Fault(401, "invalid_client",
                   "The client secret keys of application '{client}' have expired."),
    7000218: Fault(401, "invalid_client",
                   "The request must contain 'client_assertion' or 'client_secret'."),
    7000216: Fault(401, "invalid_client", "'client_assertion', 'client_secret' or 'request' is "
                   "required for the grant 'client_credentials'."),
    700025: Fault(401, "invalid_client", "The client is public: neither 'client_assertion' nor "
                  "'client_secret' may be sent."),
    # The redirect URI. 50011 stays on the provider's page; 500112 is the token endpoint's.
    50011: Fault(400, "invalid_request",
                 "The redirect URI '{redirect}' does not match those of application '{client}'."),
    500112: Fault(401, "invalid_client", "The reply address '{redirect}' does not match '{asked}' "
                  "of the authorization request."),
    # The code. 54005: dnn.azureadprovider issue 17; 70000: QuePort/passport-azure-oauth issue 6.
    70000: Fault(400, "invalid_grant", "The provided grant is invalid or malformed."),
    70008: Fault(400, "invalid_grant", "The provided authorization code has expired."),
    54005: Fault(400, "invalid_grant", "The authorization code was already redeemed."),
    # What the directory's policies say.
    53003: Fault(400, "invalid_grant", "Access is blocked by conditional access policies.",
                 {"suberror": "message_only", "claims": CLAIMS}),
    50076: Fault(400, "invalid_grant", "Multi-factor authentication is required to access "
                 "'{client}'.", {"suberror": "basic_action", "claims": CLAIMS}),
    65001: Fault(400, "invalid_grant", "No consent was given to application '{client}'.",
                 {"suberror": "consent_required"}),
    # sunilbandla/vue-msal-sample issue 8.
    50146: Fault(400, "invalid_request", "The application needs its own signing key: there is "
                 "none, or it is expired or not yet valid."),
    # The authorization endpoint: those that go back to the client, and the pages.
    700054: Fault(400, "unsupported_response_type",
                  "response_type 'id_token' is not enabled for the application."),
    65004: Fault(400, "access_denied", "The user declined to consent to the application.",
                 {"error_subcode": "cancel"}),
    50058: Fault(400, "login_required", "A silent sign-in was sent, but no user is signed in."),
    50105: Fault(400, "access_denied", "User '{user}' is not assigned to a role for application "
                 "'{client}'."),
    50020: Fault(400, "access_denied", "User '{user}' of identity provider '{home}' does not exist "
                 "in tenant '{tenant}'."),
    50034: Fault(400, "invalid_grant", "The user account '{user}' does not exist in the "
                 "'{tenant}' directory."),
    50126: Fault(400, "invalid_grant", "Invalid user name or password."),
}


def description(code, values, era):
    """The description and its companions. Answers of 2018 begin with a second code and break
    lines, those of 2020 break lines, later ones do not: davidjrh/dnn.azureadprovider issue 17,
    MicrosoftDocs/azure-docs issue 63819, davidjrh/dnn.azureadprovider issue 112."""
    fault = FAULTS[code]
    text = f"AADSTS{code}: {fault.text.format(**values)}"
    codes = [code]
    if era < 2020 and fault.error in ("invalid_grant", "invalid_client"):
        text = "AADSTS70002: Error validating credentials. " + text
        codes = [70002, code]
    trace, correlation = str(uuid.uuid4()), str(uuid.uuid4())
    stamp = time.strftime("%Y-%m-%d %H:%M:%SZ", time.gmtime())
    apart = " " if era >= 2024 else "\r\n"
    return {
        "error": fault.error,
        "error_description": apart.join((
            text, "Trace ID: " + trace, "Correlation ID: " + correlation, "Timestamp: " + stamp)),
        "error_codes": codes, "timestamp": stamp, "trace_id": trace,
        "correlation_id": correlation}


def document(code, values, url, era):
    """The JSON object of an error answer."""
    more = {} if era < 2020 else {"error_uri": f"{url}/error?code={code}"}
    return {**description(code, values, era), **more, **FAULTS[code].more}
