// What the provider answers: discovery document, key set, token endpoint.
#include <cstdlib>

#include "doctor/checkup.h"
#include "doctor/claims.h"
#include "doctor/json.h"
#include "doctor/keyset.h"
#include "doctor/text.h"
#include "doctor/transfer.h"
#include "doctor/web.h"

namespace doctor {

namespace {

bool IsRedirect(const WebAnswer& answer) {
  return answer.status >= 300 && answer.status < 400;
}

std::string Describe(const WebAnswer& answer) {
  std::string text = "HTTP " + std::to_string(answer.status);
  if (!answer.type.empty()) text += ", " + Clip(answer.type, 60);
  if (IsRedirect(answer) && !answer.location.empty()) text += ", to " + Clip(answer.location, 200);
  return text;
}

// "error" and "error_description" of an OAuth error response.
std::string ErrorOf(const Json::Value& document) {
  const std::string error = StringOf(document, "error");
  const std::string more = StringOf(document, "error_description");
  return Quote(Clip(error, 60)) + (more.empty() ? "" : " (" + Clip(more, 200) + ")");
}

// False if there is a finding about the URL already.
bool IsWorthRequest(const Checkup& checkup, const std::string& url) {
  return !url.empty() && checkup.bad_urls.count(url) == 0;
}

void NoteProxy(Checkup& checkup) {
  for (const char* name : {"https_proxy", "HTTPS_PROXY", "http_proxy", "all_proxy", "ALL_PROXY"}) {
    if (std::getenv(name) == nullptr) continue;
    checkup.report.Note("proxy", "",
                        "requests go through the proxy of the environment variable " +
                            std::string(name) + "; the login program may have another");
  }
}

// --- discovery document

std::vector<Said> WithoutDiscovery(const Checkup& checkup) {
  if (checkup.provider == Provider::kWebSphere) return {Said::Does("does not use it")};
  return checkup.library.Verify(MakeToken(GoodHeader(checkup), GoodClaims(checkup))).said;
}

void CompareEndpoint(Checkup& checkup, const Json::Value& document, const char* member,
                     const char* key, const std::string& configured) {
  const std::string named = StringOf(document, member);
  if (named.empty() || configured.empty() || named == configured) return;
  checkup.report.Add(
      {"discovery-differs",
       Severity::kWarning,
       "discovery document",
       "names the " + std::string(key) + " " + Clip(named, 200) + "; configured is " +
           Clip(configured, 200),
       {Said::Does("uses the configured one and does not compare")},
       "Set " + std::string(checkup.provider == Provider::kAzure ? "azure_" : "websphere_") + key +
           " to what the document names, unless the other is meant."});
}

// The path segment of an issuer that is a tenant's ID, if there is one.
std::string TenantOf(const std::string& issuer) {
  for (size_t at = 0; at + 36 <= issuer.size(); ++at) {
    const std::string part = issuer.substr(at, 36);
    if (IsGuid(part)) return part;
  }
  return "";
}

void CompareTenant(Checkup& checkup) {
  const std::string tenant = TenantOf(checkup.issuer);
  if (checkup.provider != Provider::kAzure || tenant.empty() || tenant == checkup.tenant) return;
  Json::Value claims = GoodClaims(checkup);
  claims["tid"] = tenant;
  checkup.report.Add(
      {"discovery-other-tenant", Severity::kFailure, "discovery document",
       "is that of the tenant " + tenant + "; configured is " + Quote(checkup.tenant),
       checkup.library.VerifyOffline(MakeToken(GoodHeader(checkup), claims)).said,
       "Let azure_tenant_id and the URLs be of the same tenant."});
}

// Adds what is wrong with the document as a whole. True if it is one.
bool CheckDocument(Checkup& checkup, const WebAnswer& answer, Json::Value& document) {
  const bool parsed = ParseJson(answer.body, document);
  const bool azure = checkup.provider == Provider::kAzure;
  const Severity grave = azure ? Severity::kFailure : Severity::kWarning;
  const auto add = [&](const char* id, const std::string& seen) {
    checkup.report.Add({id, grave, "discovery document", seen, WithoutDiscovery(checkup),
                        "Look at the configured URL: it must give the provider's "
                        ".well-known/openid-configuration."});
    return false;
  };
  if (IsRedirect(answer) && !parsed) {
    return add("discovery-redirect", Describe(answer) + "; the library follows no redirects");
  }
  if (!parsed) return add("discovery-no-json", Describe(answer) + ", not JSON");
  if (azure && StringOf(document, "jwks_uri").empty()) {
    return add("discovery-no-keys",
               Describe(answer) + ", without \"jwks_uri\"" +
                   (StringOf(document, "error").empty() ? "" : ": " + ErrorOf(document)));
  }
  return true;
}

Json::Value CheckDiscovery(Checkup& checkup) {
  checkup.report.Begin("Discovery document");
  Json::Value document;
  if (!IsWorthRequest(checkup, checkup.settings.wellknown)) return document;
  const Severity grave =
      checkup.provider == Provider::kAzure ? Severity::kFailure : Severity::kWarning;
  const WebAnswer answer = Fetch(checkup.settings.wellknown, nullptr, checkup.options.timeout);
  const Destination destination{"discovery document", checkup.settings.wellknown, grave,
                                [&checkup] { return WithoutDiscovery(checkup); }};
  if (!ReportTransfer(checkup, destination, answer)) return document;
  if (!CheckDocument(checkup, answer, document)) return Json::Value();

  checkup.issuer = StringOf(document, "issuer");
  CompareEndpoint(checkup, document, "authorization_endpoint", "authorization_endpoint",
                  checkup.settings.authorization_endpoint);
  CompareEndpoint(checkup, document, "token_endpoint", "token_endpoint",
                  checkup.settings.token_endpoint);
  CompareEndpoint(checkup, document, "end_session_endpoint", "logout_endpoint",
                  checkup.settings.logout_endpoint);
  CompareTenant(checkup);
  return document;
}

// The algorithms that the provider says it signs with. `kid`: of a key that can be used.
void CheckAlgorithms(Checkup& checkup, const Json::Value& document, const std::string& kid) {
  const std::string prefix = checkup.provider == Provider::kAzure ? "RS" : "HS";
  const Json::Value offered =
      document.isObject() ? document["id_token_signing_alg_values_supported"] : Json::Value();
  if (!offered.isArray() || offered.empty()) return;
  std::string names;
  for (const Json::Value& name : offered) {
    if (!name.isString()) continue;
    for (const char* size : {"256", "384", "512"}) {
      if (name.asString() == prefix + size) return;
    }
    names += (names.empty() ? "" : ", ") + Clip(name.asString(), 20);
  }
  Json::Value header = GoodHeader(checkup);
  header["alg"] = offered[0];
  header["kid"] = kid;
  checkup.report.Add({"algorithms-unsupported", Severity::kFailure, "signature algorithms",
                      "the provider signs with " + names,
                      checkup.library.Verify(MakeToken(header, GoodClaims(checkup))).said,
                      "Let the provider sign this client's ID tokens with " + prefix + "256, " +
                          prefix + "384 or " + prefix + "512."});
}

// --- token endpoint

// What is wrong with the answer to an empty request; an empty id if nothing is.
Finding TokenEndpointFault(const WebAnswer& answer, const Json::Value& document, bool parsed) {
  Finding finding{"", Severity::kFailure, "token endpoint", Describe(answer), {}, ""};
  if (IsRedirect(answer)) {
    finding.id = "token-endpoint-redirect";
    finding.seen += "; the library follows no redirects";
    finding.remedy = "Configure the URL that the server redirects to, if it is the provider's.";
  } else if (answer.status >= 500) {
    finding.id = "token-endpoint-error";
    finding.remedy = "Look at the provider: it reports an error of its own.";
  } else if (answer.status == 404 || answer.status == 405 || answer.status == 410) {
    finding.id = "token-endpoint-wrong";
    finding.remedy = "Look at the URL of the token endpoint: the server knows no such page.";
  } else if (!parsed) {
    finding.id = "token-endpoint-no-json";
    finding.seen += ", not JSON";
    finding.remedy = "Look at the URL: it must be the token endpoint, not a page for people.";
    if (answer.status == 400 || answer.status == 401) finding.severity = Severity::kWarning;
  } else if (StringOf(document, "error").empty()) {
    finding.id = "token-endpoint-odd";
    finding.severity = Severity::kWarning;
    finding.seen += ", JSON without an OAuth \"error\"";
    finding.remedy = "Look at the URL: a token endpoint refuses an empty request.";
  }
  return finding;
}

// Sends the client secret with a false code. The provider checks the client first.
void TrySecret(Checkup& checkup) {
  const std::string body = checkup.library.ExchangeBody();
  const WebAnswer answer = Fetch(checkup.settings.token_endpoint, &body, checkup.options.timeout);
  Json::Value document;
  ParseJson(answer.body, document);
  const std::string error = StringOf(document, "error");
  if (error == "invalid_grant") {
    checkup.report.Ok(
        "secret-accepted", "token endpoint",
        "takes client ID and secret, and refuses the false code: " + ErrorOf(document));
  } else if (error == "invalid_client" || error == "unauthorized_client") {
    checkup.report.Add({"secret-refused", Severity::kFailure, "token endpoint",
                        "refuses client ID or secret: " + ErrorOf(document),
                        checkup.library.TokenRequest(body).said,
                        "Set client ID and client secret to what the provider gave; a secret may "
                        "have run out there."});
  } else {
    checkup.report.Add({"secret-not-checked",
                        Severity::kUnchecked,
                        "token endpoint",
                        "does not tell whether it takes client ID and secret: " + Describe(answer) +
                            (error.empty() ? "" : ", " + ErrorOf(document)),
                        {},
                        "Try a login."});
  }
}

void CheckTokenEndpoint(Checkup& checkup) {
  checkup.report.Begin("Token endpoint");
  if (!IsWorthRequest(checkup, checkup.settings.token_endpoint)) return;
  const std::string nothing;
  const auto ask = [&checkup] { return checkup.library.TokenRequest("").said; };
  const WebAnswer answer =
      Fetch(checkup.settings.token_endpoint, &nothing, checkup.options.timeout);
  if (!ReportTransfer(checkup,
                      {"token endpoint", checkup.settings.token_endpoint, Severity::kFailure, ask},
                      answer)) {
    return;
  }
  Json::Value document;
  const bool parsed = ParseJson(answer.body, document) && document.isObject();
  Finding fault = TokenEndpointFault(answer, document, parsed);
  if (!fault.id.empty()) {
    fault.library = ask();
    checkup.report.Add(fault);
    return;
  }
  checkup.report.Ok("token-endpoint", "token endpoint",
                    "refuses an empty request as it should: " + ErrorOf(document));
  if (checkup.options.try_secret) TrySecret(checkup);
}

}  // namespace

void CheckEndpoints(Checkup& checkup) {
  if (!checkup.settings_read) return;
  if (checkup.options.offline) {
    checkup.report.Begin("Network");
    checkup.report.Note("offline", "", "no request was sent (--offline)");
    return;
  }
  checkup.report.Begin("Network");
  NoteProxy(checkup);
  // In the order of a login.
  CheckTokenEndpoint(checkup);
  const Json::Value document = CheckDiscovery(checkup);
  std::string kid;
  if (checkup.provider == Provider::kAzure && document.isObject()) {
    kid = CheckKeySet(checkup, StringOf(document, "jwks_uri"));
  }
  checkup.report.Begin("Signature algorithms");
  if (checkup.provider == Provider::kWebSphere || !kid.empty()) {
    CheckAlgorithms(checkup, document, kid);
  }
}

}  // namespace doctor
