#include "doctor/keys.h"

#include "doctor/claims.h"
#include "doctor/text.h"

namespace doctor {

namespace {

constexpr char kClientId[] = "the client ID (application ID) that the provider gave this device";
constexpr char kClientSecret[] = "the value of the client secret that the provider gave";
constexpr char kAuthorization[] = "the URL of the provider's authorization endpoint";
constexpr char kToken[] = "the URL of the provider's token endpoint";
constexpr char kRedirect[] = "the URL of this device's login program, as registered";
constexpr char kLogout[] = "the URL of the provider's end-session endpoint";
constexpr char kWellknown[] =
    "the URL of the discovery document (.../.well-known/openid-configuration)";

// The checks of a token with one wrong claim.
std::vector<Said> VerifyAnother(const Checkup& checkup, const char* claim) {
  Json::Value claims = GoodClaims(checkup);
  claims[claim] = "of another";
  return checkup.library.VerifyOffline(MakeToken(GoodHeader(checkup), claims)).said;
}

}  // namespace

const FileKind kFileKinds[3] = {
    {"profile.conf",
     Provider::kNone,
     false,
     "",
     {{"sso_enable", Json::booleanValue, true, "true"},
      {"sso_profile", Json::stringValue, true, "\"azure\" or \"websphere\""}}},
    {"azure.conf",
     Provider::kAzure,
     true,
     "azure_",
     {{"azure_sso_enable", Json::booleanValue, false, "true"},
      {"azure_wellknown", Json::stringValue, true, kWellknown},
      {"azure_client_id", Json::stringValue, true, kClientId},
      {"azure_client_secret", Json::stringValue, true, kClientSecret},
      {"azure_tenant_id", Json::stringValue, true, "the directory (tenant) ID"},
      {"azure_authorization_endpoint", Json::stringValue, true, kAuthorization},
      {"azure_token_endpoint", Json::stringValue, true, kToken},
      {"azure_redirect_uri", Json::stringValue, true, kRedirect},
      {"azure_logout_endpoint", Json::stringValue, false, kLogout}}},
    {"websphere.conf",
     Provider::kWebSphere,
     true,
     "websphere_",
     {{"websphere_wellknown", Json::stringValue, false, kWellknown},
      {"websphere_client_id", Json::stringValue, true, kClientId},
      {"websphere_client_secret", Json::stringValue, true, kClientSecret},
      {"websphere_authorization_endpoint", Json::stringValue, true, kAuthorization},
      {"websphere_token_endpoint", Json::stringValue, true, kToken},
      {"websphere_redirect_uri", Json::stringValue, true, kRedirect},
      {"websphere_logout_endpoint", Json::stringValue, false, kLogout}}}};

const FileKind* FindKind(const std::string& name) {
  for (const FileKind& kind : kFileKinds) {
    if (name == kind.name) return &kind;
  }
  return nullptr;
}

const Key* FindKey(const FileKind& kind, const std::string& name) {
  for (const Key& key : kind.keys) {
    if (name == key.name) return &key;
  }
  return nullptr;
}

std::vector<Said> WithoutKey(const Checkup& checkup, const Key& key) {
  const std::string name = key.name;
  const bool azure = checkup.provider == Provider::kAzure;
  if (name == "sso_enable" || name == "sso_profile") return checkup.library.Login().said;
  // With an empty URL nothing is sent.
  if (EndsWith(name, "_token_endpoint")) return checkup.library.TokenRequest("").said;
  if (EndsWith(name, "_client_id")) return VerifyAnother(checkup, "aud");
  if (EndsWith(name, "_tenant_id")) return VerifyAnother(checkup, "tid");
  if (EndsWith(name, "_wellknown")) {
    if (!azure) return {Said::Does("does not use it")};
    return checkup.library.Verify(MakeToken(GoodHeader(checkup), GoodClaims(checkup))).said;
  }
  if (EndsWith(name, "_client_secret")) {
    if (azure) return {Said::Does("sends an empty client_secret, which the provider refuses")};
    return checkup.library.Verify(MakeToken(GoodHeader(checkup), GoodClaims(checkup))).said;
  }
  if (EndsWith(name, "_authorization_endpoint")) {
    return {Said::Does(
        "sends the browser to a URL that begins with \"?\", which is the device itself")};
  }
  if (EndsWith(name, "_redirect_uri")) {
    return {Said::Does("sends an empty redirect_uri, which the provider refuses")};
  }
  if (EndsWith(name, "_logout_endpoint")) {
    return {Said::Does("returns an empty logout endpoint; no user is signed out at the provider")};
  }
  return {Said::Does("signs users in anyway; isEnable() returns false")};
}

}  // namespace doctor
