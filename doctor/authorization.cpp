// The authorization endpoint, requested as a browser requests it; nobody signs in.
#include "doctor/answer.h"
#include "doctor/checkup.h"
#include "doctor/json.h"
#include "doctor/redact.h"
#include "doctor/text.h"
#include "doctor/transfer.h"

namespace doctor {

namespace {

constexpr int kMostRedirects = 5;

std::vector<Said> SendsTheBrowser() {
  return {Said::Does("sends the browser there, and does not see what comes of it")};
}

// True if the redirect leads back to the device.
bool IsBack(const Checkup& checkup, const WebAnswer& answer) {
  const std::string& uri = checkup.settings.redirect_uri;
  return IsRedirect(answer) && !uri.empty() && answer.location.compare(0, uri.size(), uri) == 0;
}

// Some providers send their login page with an error status.
bool IsLogin(const WebAnswer& answer) {
  return answer.asks_login || LowerCase(answer.body).find("password") != std::string::npos;
}

// What the answer says of the request; an empty id if a person could sign in there.
Finding Fault(const Checkup& checkup, const WebAnswer& answer) {
  Finding finding{"", Grade::kFailure, ""};
  Json::Value document;
  const bool json = ParseJson(answer.body, document) && document.isObject();
  const bool back = IsBack(checkup, answer);
  const bool page = !json && !back;
  const Refusal refusal = RefusalIn(back ? answer.location : answer.body);
  const std::string described = " (" + Describe(answer) + ")";
  if (!refusal.code.empty() && !(page && refusal.plain)) {
    finding.id = "authorization-refused";
    finding.cause = refusal.meaning + " (" + refusal.code + ")";
    finding.action = refusal.action;
  } else if (back) {
    finding.id = "authorization-refused";
    finding.cause = "The provider sends the browser back at once" + described;
    finding.action = "Check that " + checkup.Key("authorization_endpoint") + " has no query.";
  } else if (answer.status == 404 || answer.status == 405 || answer.status == 410 || json) {
    finding.id = "authorization-wrong";
    finding.cause = "The server has no authorization endpoint at this URL" + described;
    finding.action = checkup.Fix("authorization_endpoint", checkup.settings.authorization_endpoint);
  } else if (answer.status >= 500) {
    finding.id = "authorization-error";
    finding.cause = "The authorization endpoint has an internal error" + described;
    finding.action = "Check the provider and its log.";
  } else if (answer.status >= 400 && !IsLogin(answer)) {
    finding.id = "authorization-odd";
    finding.grade = answer.status == 400 ? Grade::kFailure : Grade::kWarning;
    finding.cause = "The provider refuses the request of a browser" + described;
    finding.action = "Open the device's login page in a browser: the provider's page says why.";
  }
  return finding;
}

}  // namespace

void CheckAuthorization(Checkup& checkup) {
  Destination endpoint{"authorization endpoint", checkup.settings.authorization_endpoint,
                       Grade::kFailure, SendsTheBrowser};
  if (!checkup.IsWorthRequest(endpoint.url)) return;
  if (!checkup.Documented("authorization_endpoint", endpoint.url).empty()) {
    endpoint.fix = checkup.Fix("authorization_endpoint", endpoint.url);
  }
  endpoint.page = true;
  const std::string host = ParsedUrl(endpoint.url).host();
  std::string url = checkup.library.AuthorizationRequest();
  WebAnswer answer;
  for (int i = 0; i < kMostRedirects; ++i) {
    if (!Exchange(checkup, endpoint, nullptr, answer, url)) return;
    // Only on the provider's own server: what is elsewhere is not the device's business.
    if (!IsRedirect(answer) || IsBack(checkup, answer)) break;
    if (ParsedUrl(answer.location).host() != host) break;
    url = answer.location;
  }
  Finding fault = Fault(checkup, answer);
  fault.place = At(endpoint, answer);
  fault.detail = SendsTheBrowser();
  if (!fault.id.empty()) return checkup.report.Add(fault);
  checkup.report.Good("authorization-endpoint",
                      "The provider takes client ID and redirect URI (" + Describe(answer) + ")",
                      fault.place);
}

}  // namespace doctor
