#include "doctor/token_endpoint.h"

#include <algorithm>
#include <array>

#include "doctor/answer.h"
#include "doctor/json.h"
#include "doctor/redact.h"
#include "doctor/text.h"
#include "doctor/transfer.h"

namespace doctor {

namespace {

// What a sound provider answers to a request with a false code, or without a secret.
constexpr std::array kExpected = {"AADSTS9002313", "AADSTS900144", "AADSTS90014", "AADSTS70000",
                                  "AADSTS70002",   "AADSTS70008",  "AADSTS54005", "AADSTS7000218",
                                  "AADSTS7000216", "AADSTS50012",  "AADSTS50089", "CWWKS1406E",
                                  "CWOAU0029E",    "CWOAU0033E",   "CWOAU0038E",  "CWOAU0058E"};

// The resource of Entra ID that each tenant has, in each cloud.
constexpr char kGraph[] = "00000003-0000-0000-c000-000000000000";

bool IsExpected(const Refusal& refusal) {
  return refusal.code.empty() || refusal.plain ||
         std::find(kExpected.begin(), kExpected.end(), refusal.code) != kExpected.end();
}

// What is wrong with the answer; an empty id if nothing is.
Finding Fault(const Checkup& checkup, const WebAnswer& answer, const Json::Value& document) {
  Finding finding{"", Grade::kFailure, ""};
  const Refusal refusal = RefusalIn(answer.body);
  const std::string fix = checkup.Fix("token_endpoint", checkup.settings.token_endpoint);
  const auto is = [&](const char* id, const std::string& cause, const std::string& action) {
    finding.id = id;
    finding.cause = cause + " (" + Describe(answer) + ")";
    finding.action = action;
    return finding;
  };
  if (!IsExpected(refusal)) {
    is("token-endpoint-refuses", refusal.meaning, refusal.action);
    finding.cause = refusal.meaning + " (" + refusal.code + ")";
    return finding;
  }
  if (IsRedirect(answer)) {
    return is("token-endpoint-redirect",
              "The token endpoint redirects; the library does not follow",
              "Set the URL that the server redirects to, if it is the provider's.");
  }
  if (answer.status >= 500) {
    return is("token-endpoint-error", "The token endpoint has an internal error",
              "Check the provider and its log.");
  }
  if (answer.status == 404 || answer.status == 405 || answer.status == 410) {
    return is("token-endpoint-wrong", "The server has no token endpoint at this URL", fix);
  }
  // A refusal without a reason.
  const bool refused = answer.status >= 400 && answer.status < 500;
  if (refused && answer.body.empty()) return finding;
  if (!document.isObject()) {
    if (refused) finding.grade = Grade::kWarning;
    return is("token-endpoint-no-json", "The token endpoint does not answer in JSON", fix);
  }
  if (StringOf(document, "error").empty()) {
    finding.grade = Grade::kWarning;
    return is("token-endpoint-odd",
              "The token endpoint does not refuse a false code with \"error\"", fix);
  }
  return finding;
}

// --- the client secret

// The body of a token request, without some of its parameters.
std::string Without(const std::string& body, std::initializer_list<const char*> names) {
  std::string rest;
  for (size_t at = 0; at < body.size();) {
    const size_t end = std::min(body.find('&', at), body.size());
    const std::string parameter = body.substr(at, end - at);
    const std::string name = parameter.substr(0, parameter.find('='));
    if (std::find(names.begin(), names.end(), name) == names.end()) {
      rest += (rest.empty() ? "" : "&") + parameter;
    }
    at = end + 1;
  }
  return rest;
}

// The grant that no user takes part in: what it answers is about client and secret alone.
std::string ClientCredentials(const Checkup& checkup, const std::string& exchange) {
  const int version = ShapeOf(checkup.settings.token_endpoint).version;
  return "grant_type=client_credentials&" +
         Without(exchange, {"grant_type", "code", "redirect_uri"}) +
         (version == 2   ? std::string("&scope=") + kGraph + "%2F.default"
          : version == 1 ? std::string("&resource=") + kGraph
                         : "");
}

// Why the secret must not be sent there; empty if it may.
std::string Doubt(const Checkup& checkup) {
  const std::string& url = checkup.settings.token_endpoint;
  if (ParsedUrl(url).scheme() != "https") return "the URL is not https";
  if (!checkup.Documented("token_endpoint", url).empty()) {
    return "the discovery document has another token endpoint";
  }
  return "";
}

class SecretCheck {
 public:
  SecretCheck(Checkup& checked, const Destination& to)
      : checkup(checked), endpoint(to), place(checked.At("client_secret")) {}

  void Run() {
    const std::string doubt = Doubt(checkup);
    if (!doubt.empty()) {
      return checkup.report.Unchecked("secret-not-checked", "The secret was not sent: " + doubt,
                                      place, "Correct the token endpoint, and try again.");
    }
    const std::string exchange = checkup.library.ExchangeBody();
    // Providers differ in the order of their checks: what the second request says is only used if
    // it is about the client.
    if (Try(ClientCredentials(checkup, exchange)) || Try(exchange)) return;
    checkup.report.Unchecked(
        "secret-not-checked",
        "The provider does not report whether it accepts the secret: " + Describe(answer) +
            (refusal.code.empty() ? "" : ", " + refusal.code) +
            (StringOf(document, "error").empty() ? "" : ", " + ErrorOf(document)),
        place, "Try a sign-in with a browser.");
  }

 private:
  // True if the answer, or that there is none, is in the report.
  bool Try(const std::string& body) {
    if (!Exchange(checkup, endpoint, &body, answer)) return true;
    document = Json::Value();
    ParseJson(answer.body, document);
    refusal = RefusalIn(answer.body);
    const std::string token = StringOf(document, "access_token");
    if (answer.status == 200 && !token.empty()) {
      Hide(token);
      checkup.report.Good("secret-accepted", "The provider accepts client ID and secret", place);
      return true;
    }
    const std::string error = StringOf(document, "error");
    const bool client =
        error == "invalid_client" || (error == "unauthorized_client" && !refusal.plain);
    if (!refusal.about_secret && (!client || (IsExpected(refusal) && !refusal.plain))) return false;
    Refuse(body);
    return true;
  }

  void Refuse(const std::string& body) {
    const std::vector<Said> said = checkup.library.TokenRequest(body).said;
    if (refusal.code.empty() || refusal.plain) {
      checkup.report.Fail("secret-refused",
                          "The provider refuses client ID or secret: " + ErrorOf(document), place,
                          "Set client ID and client secret to the provider's values; a secret may "
                          "have expired there.",
                          said);
    } else if (refusal.about_secret) {
      checkup.report.Fail("secret-refused", refusal.meaning + " (" + refusal.code + ")", place,
                          refusal.action, said);
    } else {
      checkup.report.Fail("client-refused", refusal.meaning + " (" + refusal.code + ")",
                          checkup.At("client_id"), refusal.action, said);
    }
  }

  Checkup& checkup;
  const Destination& endpoint;
  const Place place;
  WebAnswer answer;
  Json::Value document;
  Refusal refusal;
};

}  // namespace

void CheckTokenEndpoint(Checkup& checkup) {
  const std::string body = Without(checkup.library.ExchangeBody(), {"client_secret"});
  Destination endpoint{"token endpoint", checkup.settings.token_endpoint, Grade::kFailure,
                       [&] { return checkup.library.TokenRequest(body).said; }};
  if (checkup.IsWorthRequest(endpoint.url)) {
    if (!checkup.Documented("token_endpoint", endpoint.url).empty())
      endpoint.fix = checkup.Fix("token_endpoint", endpoint.url);
    WebAnswer answer;
    if (Exchange(checkup, endpoint, &body, answer)) {
      Json::Value document;
      ParseJson(answer.body, document);
      Finding fault = Fault(checkup, answer, document);
      fault.place = At(endpoint, answer);
      if (fault.id.empty()) {
        checkup.report.Good("token-endpoint",
                            "The token endpoint refuses a false code: " + ErrorOf(document),
                            fault.place);
      } else {
        fault.detail = endpoint.library();
        checkup.report.Add(fault);
      }
    }
  }
  if (!checkup.options.try_secret) return;
  const std::string obstacle = checkup.report.Obstacle();
  if (!obstacle.empty() || !checkup.IsWorthRequest(endpoint.url)) {
    return checkup.report.Skip("The client secret", obstacle);
  }
  SecretCheck(checkup, endpoint).Run();
}

}  // namespace doctor
