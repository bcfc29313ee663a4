// What the provider answers: discovery document, key set, token endpoint.
#include <cstdlib>

#include "doctor/answer.h"
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

constexpr long kSlow = 800;  // milliseconds that a person notices

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

// A URL that works, though the document has another one.
void CompareEndpoint(Checkup& checkup, const char* key, const std::string& configured) {
  const std::string there = checkup.Documented(key, configured);
  Place place = checkup.At(key);
  place.url = Shown(configured, 200);
  if (there.empty() || configured.empty() || !checkup.IsWorthRequest(configured) ||
      checkup.report.HasAt(place.url)) {
    return;
  }
  checkup.report.Warn("discovery-differs",
                      "The discovery document has another URL: " + Shown(there, 200), place,
                      "If sign-ins fail, set " + checkup.Key(key) + " to that one.",
                      {Said::Does("uses the configured one and does not compare")});
}

// Adds what is wrong with the document as a whole. True if it is a discovery document.
bool CheckDocument(Checkup& checkup, const Destination& destination, const WebAnswer& answer) {
  Json::Value document;
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
  const Refusal refusal = RefusalIn(answer.body);
  if (!refusal.code.empty() && !refusal.plain) {
    checkup.report.Add({"discovery-refused", destination.grave,
                        refusal.meaning + " (" + refusal.code + ")", At(destination, answer),
                        refusal.action, WithoutDiscovery(checkup)});
    return false;
  }
  if (checkup.azure() && StringOf(document, "jwks_uri").empty()) {
    return add("discovery-no-keys",
               "The discovery document has no \"jwks_uri\"" +
                   (StringOf(document, "error").empty() ? "" : "; error " + ErrorOf(document)));
  }
  return true;
}

// The discovery document: asked for first, because it says what the URLs should be, and reported
// in the order of a sign-in.
class Discovery {
 public:
  explicit Discovery(Checkup& checked)
      : checkup(checked),
        destination{"discovery document", checked.settings.wellknown,
                    checked.azure() ? Grade::kFailure : Grade::kWarning,
                    [&checked] { return WithoutDiscovery(checked); }} {
    const std::string role = ShapeOf(destination.url).role;
    sent = checkup.IsWorthRequest(destination.url) && (role.empty() || role == "wellknown");
    if (!sent) return;
    answer = Send(checkup, destination);
    if (answer.code == CURLE_OK && ParseJson(answer.body, checkup.discovery)) {
      checkup.issuer = StringOf(checkup.discovery, "issuer");
    }
  }

  void Report() {
    if (!sent) return;
    if (!Judge(checkup, destination, answer) || !CheckDocument(checkup, destination, answer)) {
      checkup.discovery = Json::Value();
    }
  }

 private:
  Checkup& checkup;
  const Destination destination;
  bool sent;
  WebAnswer answer;
};

// The provider's algorithm needs a secret of so many bytes; SHA-256's are checked elsewhere.
void CheckLength(Checkup& checkup, size_t least) {
  const size_t length = checkup.settings.client_secret.size();
  if (checkup.azure() || length < 32 || length >= least) return;
  checkup.report.Warn("secret-short",
                      "The client secret has " + std::to_string(length) +
                          " bytes; the provider's algorithm needs " + std::to_string(least),
                      checkup.At("client_secret"),
                      "Set a random client secret of " + std::to_string(least) +
                          " bytes or more, here and at the provider.",
                      {Said::Does("accepts any length; new versions of Liberty do not")});
}

// The algorithms that the provider says it signs with. `kid`: of a key that can be used.
void CheckAlgorithms(Checkup& checkup, const std::string& kid) {
  const Json::Value& document = checkup.discovery;
  const std::string prefix = checkup.azure() ? "RS" : "HS";
  const Json::Value offered =
      document.isObject() ? document["id_token_signing_alg_values_supported"] : Json::Value();
  if (!offered.isArray() || offered.empty()) return;
  std::string names;
  for (const Json::Value& name : offered) {
    if (!name.isString()) continue;
    for (const char* size : {"256", "384", "512"}) {
      if (name.asString() == prefix + size) return CheckLength(checkup, std::stoul(size) / 8);
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

// libcurl reads all certificate authorities again for each request of a sign-in.
void CheckBundle(Checkup& checkup) {
  const long sent = static_cast<long>(checkup.report.Requests().size());
  const long needed = checkup.azure() ? 3 : 1;
  const long all = sent == 0 ? 0 : checkup.transfer_milliseconds * needed / sent;
  const BundleTime bundle = ReadBundle();
  const long reading = static_cast<long>(bundle.clock) * needed;
  const std::string cause = "libcurl takes " + std::to_string(reading) + " ms of the " +
                            std::to_string(all) +
                            " ms of a sign-in's requests to read the certificate authorities";
  const Place place{TrustStore()};
  // On a busy device every request takes longer.
  const bool slow = bundle.processor * static_cast<double>(needed) >= kSlow;
  if (2 * reading <= all || !slow) return checkup.report.Good("bundle", cause, place);
  checkup.report.Warn("bundle-slow", cause, place,
                      "Give the device a bundle with the provider's certificate authorities alone.",
                      {Said::Does("reads the bundle once for each request")});
}

}  // namespace

void CheckEndpoints(Checkup& checkup) {
  if (!checkup.settings_read) return;
  Report& report = checkup.report;
  if (checkup.options.offline) {
    CheckConsistency(checkup);
    return report.Good("offline", "No request was sent (--offline)");
  }
  NoteProxy(checkup);
  Discovery discovery(checkup);
  report.Begin("URLs");
  CheckConsistency(checkup);
  report.Begin("Token endpoint");
  CheckTokenEndpoint(checkup);
  report.Begin("Discovery document and key set");
  discovery.Report();
  std::string kid;
  if (checkup.azure() && checkup.discovery.isObject()) {
    kid = CheckKeySet(checkup, StringOf(checkup.discovery, "jwks_uri"));
  }
  checkup.network_obstacle = report.Obstacle();
  if (!checkup.azure() || !kid.empty()) CheckAlgorithms(checkup, kid);
  report.Begin("Authorization endpoint");
  CheckAuthorization(checkup);
  report.Begin("URLs");
  CompareEndpoint(checkup, "authorization_endpoint", checkup.settings.authorization_endpoint);
  CompareEndpoint(checkup, "token_endpoint", checkup.settings.token_endpoint);
  CompareEndpoint(checkup, "logout_endpoint", checkup.settings.logout_endpoint);
  CheckBundle(checkup);
  report.Begin("Redirect URI");
  CheckRedirect(checkup);
}

}  // namespace doctor
