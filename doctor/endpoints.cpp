// What the provider answers: discovery document, key set, token endpoint.
#include <cstdlib>

#include "doctor/checkup.h"
#include "doctor/claims.h"
#include "doctor/json.h"
#include "doctor/keyset.h"
#include "doctor/redact.h"
#include "doctor/text.h"
#include "doctor/token_endpoint.h"
#include "doctor/transfer.h"
#include "doctor/url.h"

namespace doctor {

namespace {

// The proxies of this process, with the passwords that their URLs may hold.
void NoteProxy(Checkup& checkup) {
  for (const char* name : {"https_proxy", "HTTPS_PROXY", "http_proxy", "all_proxy", "ALL_PROXY"}) {
    const char* const proxy = std::getenv(name);
    if (proxy == nullptr) continue;
    Hide(ParsedUrl(proxy).password());
    checkup.report.Good("proxy", "Requests go through the proxy of the environment variable " +
                                     std::string(name) + "; the login program may have another");
  }
}

std::vector<Said> WithoutDiscovery(const Checkup& checkup) {
  if (!checkup.azure()) return {Said::Does("does not use it")};
  return checkup.library.Verify(MakeToken(GoodHeader(checkup), GoodClaims(checkup))).said;
}

void CompareEndpoint(Checkup& checkup, const Json::Value& document, const char* member,
                     const char* key, const std::string& configured) {
  const std::string named = StringOf(document, member);
  if (named.empty() || configured.empty() || named == configured) return;
  Place place = checkup.At(key);
  place.url = Shown(configured, 200);
  checkup.report.Add(
      {"discovery-differs",
       Grade::kWarning,
       "The discovery document names another " + std::string(member) + ": " + Shown(named, 200),
       place,
       "Set " + checkup.Key(key) + " to what the document names, unless the other one is meant.",
       {Said::Does("uses the configured one and does not compare")}});
}

// The part of an issuer that is a tenant's ID, if there is one.
std::string TenantOf(const std::string& issuer) {
  for (size_t at = 0; at + 36 <= issuer.size(); ++at) {
    const std::string part = issuer.substr(at, 36);
    if (IsGuid(part)) return part;
  }
  return "";
}

void CompareTenant(Checkup& checkup) {
  const std::string tenant = TenantOf(checkup.issuer);
  if (!checkup.azure() || tenant.empty() || tenant == checkup.tenant) return;
  Json::Value claims = GoodClaims(checkup);
  claims["tid"] = tenant;
  checkup.report.Fail("discovery-other-tenant",
                      "The discovery document is that of the tenant " + tenant +
                          "; configured is " + Quote(Shown(checkup.tenant, 80)),
                      checkup.At("tenant_id"),
                      "Set azure_tenant_id and the URLs to the same tenant.",
                      checkup.library.VerifyOffline(MakeToken(GoodHeader(checkup), claims)).said);
}

// Adds what is wrong with the document as a whole. True if it is a discovery document.
bool CheckDocument(Checkup& checkup, const Destination& destination, const WebAnswer& answer,
                   Json::Value& document) {
  const bool parsed = ParseJson(answer.body, document);
  const auto add = [&](const char* id, const std::string& cause) {
    checkup.report.Add({id, destination.grave, cause + " (" + Describe(answer) + ")",
                        At(destination, answer),
                        "Set " + checkup.Key("wellknown") +
                            " to the URL of the provider's .well-known/openid-configuration.",
                        WithoutDiscovery(checkup)});
    return false;
  };
  if (IsRedirect(answer) && !parsed) {
    return add("discovery-redirect", "The server redirects; the library does not follow");
  }
  if (!parsed) return add("discovery-no-json", "The discovery document is not JSON");
  if (checkup.azure() && StringOf(document, "jwks_uri").empty()) {
    return add("discovery-no-keys",
               "The discovery document has no \"jwks_uri\"" +
                   (StringOf(document, "error").empty() ? "" : "; error " + ErrorOf(document)));
  }
  return true;
}

Json::Value CheckDiscovery(Checkup& checkup) {
  const Settings& settings = checkup.settings;
  Json::Value document;
  if (!checkup.IsWorthRequest(settings.wellknown)) return document;
  const Destination destination{"discovery document", settings.wellknown,
                                checkup.azure() ? Grade::kFailure : Grade::kWarning,
                                [&checkup] { return WithoutDiscovery(checkup); }};
  WebAnswer answer;
  if (!Exchange(checkup, destination, nullptr, answer)) return document;
  if (!CheckDocument(checkup, destination, answer, document)) return Json::Value();

  checkup.issuer = StringOf(document, "issuer");
  CompareEndpoint(checkup, document, "authorization_endpoint", "authorization_endpoint",
                  settings.authorization_endpoint);
  CompareEndpoint(checkup, document, "token_endpoint", "token_endpoint", settings.token_endpoint);
  CompareEndpoint(checkup, document, "end_session_endpoint", "logout_endpoint",
                  settings.logout_endpoint);
  CompareTenant(checkup);
  return document;
}

// The algorithms that the provider says it signs with. `kid`: of a key that can be used.
void CheckAlgorithms(Checkup& checkup, const Json::Value& document, const std::string& kid) {
  const std::string prefix = checkup.azure() ? "RS" : "HS";
  const Json::Value offered =
      document.isObject() ? document["id_token_signing_alg_values_supported"] : Json::Value();
  if (!offered.isArray() || offered.empty()) return;
  std::string names;
  for (const Json::Value& name : offered) {
    if (!name.isString()) continue;
    for (const char* size : {"256", "384", "512"}) {
      if (name.asString() == prefix + size) return;
    }
    names += (names.empty() ? "" : ", ") + Shown(name.asString(), 20);
  }
  Json::Value header = GoodHeader(checkup);
  header["alg"] = offered[0];
  header["kid"] = kid;
  checkup.report.Fail("algorithms-unsupported",
                      "The provider signs with " + names + ", which the library does not support",
                      checkup.At("wellknown"),
                      "Set the signature algorithm of this client's ID tokens to " + prefix +
                          "256, " + prefix + "384 or " + prefix + "512 at the provider.",
                      checkup.library.Verify(MakeToken(header, GoodClaims(checkup))).said);
}

}  // namespace

void CheckEndpoints(Checkup& checkup) {
  if (!checkup.settings_read) return;
  if (checkup.options.offline) {
    return checkup.report.Good("offline", "No request was sent (--offline)");
  }
  NoteProxy(checkup);
  // In the order of a sign-in.
  checkup.report.Begin("Token endpoint");
  CheckTokenEndpoint(checkup);
  checkup.report.Begin("Discovery document and key set");
  const Json::Value document = CheckDiscovery(checkup);
  std::string kid;
  if (checkup.azure() && document.isObject()) {
    kid = CheckKeySet(checkup, StringOf(document, "jwks_uri"));
  }
  checkup.network_obstacle = checkup.report.Obstacle();
  checkup.report.Begin("Signature algorithms");
  if (!checkup.azure() || !kid.empty()) CheckAlgorithms(checkup, document, kid);
}

}  // namespace doctor
