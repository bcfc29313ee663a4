#include "doctor/token_endpoint.h"

#include "doctor/json.h"
#include "doctor/redact.h"
#include "doctor/text.h"
#include "doctor/transfer.h"

namespace doctor {

namespace {

// What is wrong with the answer to an empty request; an empty id if nothing is.
Finding Fault(const WebAnswer& answer, const Json::Value& document, bool parsed) {
  Finding finding{"", Grade::kFailure, ""};
  const std::string set = "Set the URL to the provider's token endpoint";
  if (IsRedirect(answer)) {
    finding.id = "token-endpoint-redirect";
    finding.cause = "The token endpoint redirects; the library does not follow";
    finding.action = "Set the URL that the server redirects to, if it is the provider's.";
  } else if (answer.status >= 500) {
    finding.id = "token-endpoint-error";
    finding.cause = "The token endpoint has an internal error";
    finding.action = "Check the provider and its log.";
  } else if (answer.status == 404 || answer.status == 405 || answer.status == 410) {
    finding.id = "token-endpoint-wrong";
    finding.cause = "The server has no token endpoint at this URL";
    finding.action = set + ".";
  } else if (!parsed) {
    finding.id = "token-endpoint-no-json";
    finding.cause = "The token endpoint does not answer in JSON";
    finding.action = set + ", not to a page for people.";
    if (answer.status == 400 || answer.status == 401) finding.grade = Grade::kWarning;
  } else if (StringOf(document, "error").empty()) {
    finding.id = "token-endpoint-odd";
    finding.grade = Grade::kWarning;
    finding.cause = "The token endpoint answers an empty request without an OAuth \"error\"";
    finding.action = set + ", which refuses an empty request.";
  }
  finding.cause += " (" + Describe(answer) + ")";
  return finding;
}

// Sends the client secret with a false code. The provider checks the client first.
void TrySecret(Checkup& checkup, const Destination& endpoint) {
  const std::string body = checkup.library.ExchangeBody();
  WebAnswer answer;
  if (!Exchange(checkup, endpoint, &body, answer)) return;
  Json::Value document;
  ParseJson(answer.body, document);
  const std::string error = StringOf(document, "error");
  const Place place = checkup.At("client_secret");
  if (error == "invalid_grant") {
    checkup.report.Good("secret-accepted",
                        "The provider accepts client ID and secret, and refuses the false code: " +
                            ErrorOf(document),
                        place);
  } else if (error == "invalid_client" || error == "unauthorized_client") {
    checkup.report.Fail("secret-refused",
                        "The provider refuses client ID or secret: " + ErrorOf(document), place,
                        "Set client ID and client secret to the provider's values; a secret may "
                        "have expired there.",
                        checkup.library.TokenRequest(body).said);
  } else {
    checkup.report.Unchecked("secret-not-checked",
                             "The provider does not report whether it accepts the secret: " +
                                 Describe(answer) + (error.empty() ? "" : ", " + ErrorOf(document)),
                             place, "Try a sign-in with a browser.");
  }
}

}  // namespace

bool IsRedirect(const WebAnswer& answer) {
  return answer.status >= 300 && answer.status < 400;
}

std::string Describe(const WebAnswer& answer) {
  std::string text = "HTTP " + std::to_string(answer.status);
  if (!answer.type.empty()) text += ", " + Shown(answer.type, 60);
  if (IsRedirect(answer) && !answer.location.empty()) text += ", to " + Shown(answer.location, 200);
  return text;
}

std::string ErrorOf(const Json::Value& document) {
  const std::string more = StringOf(document, "error_description");
  return Quote(Shown(StringOf(document, "error"), 60)) +
         (more.empty() ? "" : " (" + Shown(more, 200) + ")");
}

void CheckTokenEndpoint(Checkup& checkup) {
  const Destination endpoint{"token endpoint", checkup.settings.token_endpoint, Grade::kFailure,
                             [&checkup] { return checkup.library.TokenRequest("").said; }};
  if (!checkup.IsWorthRequest(endpoint.url)) return;
  const std::string nothing;
  WebAnswer answer;
  const bool answered = Exchange(checkup, endpoint, &nothing, answer);
  if (answered) {
    Json::Value document;
    const bool parsed = ParseJson(answer.body, document) && document.isObject();
    Finding fault = Fault(answer, document, parsed);
    if (fault.id.empty()) {
      checkup.report.Good("token-endpoint",
                          "The token endpoint refuses an empty request: " + ErrorOf(document),
                          At(endpoint, answer));
    } else {
      fault.place = At(endpoint, answer);
      fault.detail = endpoint.library();
      checkup.report.Add(fault);
    }
  }
  if (!checkup.options.try_secret) return;
  const std::string obstacle = checkup.report.Obstacle();
  if (!obstacle.empty()) return checkup.report.Skip("The client secret", obstacle);
  TrySecret(checkup, endpoint);
}

}  // namespace doctor
