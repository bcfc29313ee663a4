#include "doctor/messages.h"

namespace doctor {

namespace {

using Group = MessageGroup;

// A row a line.
// clang-format off
constexpr Message kMessages[] = {
    {Group::kBefore, "read profile file failed.", "sso_op_failed", "`OIDCLogin` could not read `profile.conf`: it is missing, not JSON (a byte-order mark counts), or the program's effective user lacks permission to read it", "install the file with mode 0644; fix its JSON"},
    {Group::kBefore, "sso does not enable.", "sso_op_failed", "\"sso_enable\" is missing, false, or not a boolean (`\"true\"` is a string); or the file holds no JSON object", "set `\"sso_enable\": true` in `profile.conf`"},
    {Group::kBefore, "not specify sso profile", "sso_op_failed", "\"sso_profile\" is missing or not a string", "set `\"sso_profile\"` in `profile.conf` to `\"azure\"` or `\"websphere\"`"},
    {Group::kBefore, "profile not support.", "sso_exception", "\"sso_profile\" is neither `azure` nor `websphere`, in lower case", "correct the name in `profile.conf`"},
    {Group::kBefore, "encode base64 failed.", "sso_op_failed", "before login: the parameters for the state are longer than 765 bytes of JSON; at login: the WebSphere client secret is longer than 765 bytes", "carry less in the state; use a shorter client secret"},

    {Group::kTokenEndpoint, "parse json falied", "std::invalid_argument", "the token endpoint gave no JSON: it was not reached (a log line says why), or it answered with an HTML page or a redirect, or its URL is empty because the settings file could not be read", "check the log line before it, the URL of the token endpoint, and the settings file"},
    {Group::kTokenEndpoint, "", "sso_err_resp", "the Azure token endpoint refused the request; \"error\" and \"error_description\" say why", "see [the provider's codes](#codes-of-the-providers)", "", "the provider's error response, JSON on one line with a line feed"},
    {Group::kTokenEndpoint, "we cannot find key 'id_token' in response!", "sso_err_resp", "the answer holds no \"id_token\" that is a string; for WebSphere, error responses end here too", "check the provider's log; ask for the scope \"openid\"; check client ID and secret"},

    {Group::kIdToken, "token cannot be empty", "std::invalid_argument", "\"id_token\" was an empty string, or no token was processed before `VerifyIDToken`", "check the provider's answer"},
    {Group::kIdToken, "bad jwt format!", "std::invalid_argument", "the token does not have exactly three segments; an encrypted token has five", "let the provider sign, not encrypt, the ID token"},
    {Group::kIdToken, "bad jwt header format!", "std::invalid_argument", "the first segment is not base64url of JSON", "check the provider's answer"},
    {Group::kIdToken, "bad jwt body format!", "std::invalid_argument", "the second segment is not base64url of JSON", "check the provider's answer"},
    {Group::kIdToken, "basic_string: construction from null is not valid", "std::logic_error", "the first or the second segment is empty", "check the provider's answer"},
    {Group::kIdToken, "id_token expired.", "std::invalid_argument", "\"exp\" is missing or has passed by the device's clock; there is no leeway", "set the device's clock; let the provider give a longer lifetime"},
    {Group::kIdToken, "tenant ID invalid", "std::invalid_argument", "\"tid\" is not the configured tenant ID, byte for byte (Azure)", "set \"azure_tenant_id\" to the directory (tenant) ID, in lower case"},
    {Group::kIdToken, "client ID invalid", "std::invalid_argument", "\"aud\" is not the configured client ID, byte for byte", "set the client ID to the application's; check that the token is for this device"},
    {Group::kIdToken, "kid does not exist in Azure verified kyes", "std::invalid_argument", "no key of the tenant's key set has the token's \"kid\"; or discovery document or key set could not be read (log lines say why) (Azure)", "check the log lines before it, and \"azure_wellknown\""},
    {Group::kIdToken, "RSA public 'n' cannot be found!", "std::invalid_argument", "the key that signed the token has no string \"n\": it is not an RSA key (Azure)", "let the provider sign with an RSA key"},
    {Group::kIdToken, "RSA public 'e' cannot be found!", "std::invalid_argument", "the same for \"e\" (Azure)", "let the provider sign with an RSA key"},
    {Group::kIdToken, " algorithm is not supported", "jwt_not_support", "\"alg\" is not one of RS256, RS384, RS512 (Azure) or HS256, HS384, HS512 (WebSphere); `none` is never supported", "choose the algorithm at the provider", "(^|[^A-Za-z0-9])([A-Za-z]{2}[0-9]{3}K?|none|EdDSA) algorithm is not supported", "the token's \"alg\", then ` algorithm is not supported`"},
    {Group::kIdToken, "verify rsa signature failed", "jwt_verify_failed", "the signature does not belong to the token and the key (Azure)", "check the log line before it; the token was altered, or is another provider's"},
    {Group::kIdToken, "verify hmac signature failed", "jwt_verify_failed", "the signature is not the HMAC under the client secret; or the client secret is empty; or the signature is padded (WebSphere)", "set \"websphere_client_secret\" to the provider's"},

    {Group::kUser, "please request a id_token first.", "std::invalid_argument", "`GetUserName` or `GetUserInfo` was called before a token was processed", "call `ProcessTokenResponse` before"},
    {Group::kUser, "cannot find the user name!", "std::invalid_argument", "no string under \"unique_name\" or \"email\" (Azure) or \"sub\" (WebSphere)", "Azure v2.0: add the optional claim \"email\"; WebSphere: let \"sub\" be a string"},
    {Group::kUser, "cannot get the user name!", "std::invalid_argument", "the claim does not hold exactly one \"@\" (Azure)", "let the claim be account@dns.domain"},
    {Group::kUser, "QOVAWinsUserNameFqdn2Netbios failed.", "sso_op_failed", "the device's directory service did not convert the name (Azure)", "join the device to the user's domain; check that the directory service runs"},

    {Group::kProgram, "GetIDTokenReqParams not implemented", "sso_not_implemented", "a hook was called on a plain `SSOClient`, as `SSOProfile` holds it", "construct `AzureSSOClient` or `WebSphereSSOClient`"},
    {Group::kProgram, "ProcessTokenResponse not implemented", "sso_not_implemented", "a hook was called on a plain `SSOClient`, as `SSOProfile` holds it", "construct `AzureSSOClient` or `WebSphereSSOClient`"},
    {Group::kProgram, "VerifyIDToken not implemented", "sso_not_implemented", "a hook was called on a plain `SSOClient`, as `SSOProfile` holds it", "construct `AzureSSOClient` or `WebSphereSSOClient`"},
    {Group::kProgram, "GetUserName not implemented", "sso_not_implemented", "a hook was called on a plain `SSOClient`, as `SSOProfile` holds it", "construct `AzureSSOClient` or `WebSphereSSOClient`"},

    {Group::kLog, "request token uri %s.", "sso.cpp", "the token endpoint was not reached; the text is libcurl's (below), not the URL. `parse json falied` follows", "as for libcurl's text"},
    {Group::kLog, "", "sso.cpp", "the discovery document was not reached. The `kid` exception follows", "as for libcurl's text", "", "libcurl's text alone"},
    {Group::kLog, "bad wellknown json format.", "sso.cpp", "the discovery document is not JSON", "set \"azure_wellknown\" to the URL of the provider's `.well-known/openid-configuration`"},
    {Group::kLog, "request wellknown uri %s.", "azuresso.cpp", "the key set was not reached (libcurl's text), or is not JSON (`bad wellknown json format.`). With `URL using bad/illegal format or missing URL` the discovery document named no key set. The `kid` exception follows", "check \"jwks_uri\" of the discovery document"},
    {Group::kLog, "no kyes information", "azuresso.cpp", "the key set has no member \"keys\"", "check \"jwks_uri\" of the discovery document"},
    {Group::kLog, "EVP_DigestVerifyFinal failed", "jwt.cpp", "the RSA signature does not verify. `verify rsa signature failed` follows, as for the lines below", "the token was altered, or is another provider's", kAnchored},
    {Group::kLog, "EVP_DigestVerifyInit failed", "jwt.cpp", "OpenSSL does not accept digest or key", "check the key set, and OpenSSL's configuration on the device", kAnchored},
    {Group::kLog, "EVP_DigestVerifyUpdate failed", "jwt.cpp", "OpenSSL could not digest the token", "free memory; check OpenSSL's configuration", kAnchored},
    {Group::kLog, "EVP_PKEY_assign_RSA failed", "jwt.cpp", "OpenSSL did not accept the key", "free memory; check OpenSSL's configuration", kAnchored},
    {Group::kLog, "check key type failed", "jwt.cpp", "the key that was made is not an RSA key", "check OpenSSL's configuration", kAnchored},
    {Group::kLog, "Profile '%s' not support", "profile.cpp", "`SSOProfile` met an unknown profile name, or none, with single sign-on on", "set \"sso_profile\" to `azure` or `websphere`", "Profile '[^']{0,64}' not support($|[^A-Za-z])"},
    {Group::kLog, "bad_alloc. %m", "sso.cpp", "out of memory, or libcurl made no transfer handle", "free memory or raise the limit", kAnchored},
    {Group::kLog, "curl_easy_init failed. %m", "azuresso.cpp", "the same, for the key set", "free memory or raise the limit", kAnchored},
    {Group::kLog, "MD5 digest failed %m", "utils.cpp", "OpenSSL made no MD5 digest (switched off by a FIPS configuration, for example); the state then carries an empty nonce", "allow MD5, or check OpenSSL's configuration", kAnchored},
    {Group::kLog, "calloc failed. %m", "utils.cpp", "out of memory; the state then carries an empty nonce", "free memory or raise the limit", kAnchored},

    {Group::kGuard, "WARNING: set%s(%d, %d, %d)", "info", "an effective id was raised to root for a read; three of them are normal for each read", "none", "WARNING: setres[ug]id\\("},
    {Group::kGuard, "ERROR: set%s(%d, %d, %d) [%s]", "err", "an id could not be changed; in brackets the system's text", "install the login program set-user-id root, on a file system without `nosuid`", "ERROR: setres[ug]id\\("},
    {Group::kGuard, "ERROR: %s", "err", "which half of the guard failed: `ENTERCriticalSection` (the file is then read without permission), `LEAVECriticalSection` (the ids stay as they are)", "install the login program set-user-id root, on a file system without `nosuid`", "ERROR: (ENTER|LEAVE)CriticalSection"},

    {Group::kOther, "Couldn't resolve host name", "libcurl", "name service", "check the host name and `/etc/resolv.conf`", kAnchored},
    {Group::kOther, "Couldn't connect to server", "libcurl", "no program listens there, or a firewall refuses", "check port, routes, firewall", kAnchored},
    {Group::kOther, "Timeout was reached", "libcurl", "the network gave up; the library itself sets no time-out", "check the firewall and the provider", kAnchored},
    {Group::kOther, "SSL peer certificate or SSH remote key was not OK", "libcurl", "the server's certificate is not trusted, has expired, is not valid yet, or is for another name", "run `ssoclient-doctor`, which names the cause", kAnchored},
    {Group::kOther, "SSL connect error", "libcurl", "no TLS handshake", "check that the port speaks TLS 1.2 or later", kAnchored},
    {Group::kOther, "Problem with the SSL CA cert (path? access rights?)", "libcurl", "the device has no certificate authorities", "install them (`ca-certificates`)", kAnchored},
    {Group::kOther, "URL using bad/illegal format or missing URL", "libcurl", "an endpoint is empty or not a URL; a blank at its end is enough", "fix the settings file", kAnchored},
    {Group::kOther, "Unsupported protocol", "libcurl", "the URL's scheme is misspelt", "write `https://`", kAnchored},
    {Group::kOther, "Transferred a partial file", "libcurl", "the answer was cut off", "check the provider, proxy and load balancer", kAnchored},
    {Group::kOther, "Server returned nothing (no headers, no data)", "libcurl", "the server closed the connection without an answer", "check the provider, proxy and load balancer", kAnchored},
    {Group::kOther, "Failure when receiving data from the peer", "libcurl", "the connection broke", "check the provider, proxy and load balancer", kAnchored},
    {Group::kOther, "libcurl.so.4: cannot open shared object file", "dynamic linker", "libcurl is not on the device; it is loaded by the first request", "install it", kAnchored, "`libcurl.so.4: cannot open shared object file: ...`"},
    {Group::kOther, "Type is not convertible to string", "jsoncpp", "a member that is read as text is a list or an object: \"aud\", \"exp\", \"tid\", \"alg\", \"kid\"", "let the provider give \"aud\" as one string", kAnchored, "`Type is not convertible to string` (`Json::LogicError`)"},
    {Group::kOther, "basic_string::substr: ", "C++ library", "`GetAzureSSOLogoutURL` was given an address of 1 to 9 bytes", "give the whole URL of the page", kAnchored, "`basic_string::substr: ...` (`std::out_of_range`)"},
    {Group::kOther, "std::bad_alloc", "C++ library", "out of memory", "free memory or raise the limit", kAnchored},
};
// clang-format on

}  // namespace

Rows<Message> Messages() {
  return {kMessages, sizeof kMessages / sizeof *kMessages};
}

}  // namespace doctor
