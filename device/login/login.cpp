#include "login.h"

#include <syslog.h>

#include "binding.h"
#include "exchange.h"
#include "identity.h"
#include "logout.h"
#include "page.h"
#include "process.h"
#include "report.h"
#include "session.h"
#include "settings.h"
#include "slots.h"
#include "sso/azuresso.h"
#include "sso/profile.h"
#include "sso/sso.h"
#include "sso/utils.h"
#include "sso/webspheresso.h"
#include "state.h"
#include "utf8.h"

using namespace QOVA::SSO;

namespace {

constexpr char kPages[] = "/webman/";
constexpr int kGrace = 5;  // seconds that the program has beyond the exchange with the provider

// The value of a parameter in the query of a URL.
std::string Parameter(const std::string& url, const std::string& name) {
  const size_t query = url.find('?');
  return query == std::string::npos ? "" : cgi::Value(cgi::ReadQuery(url.substr(query + 1)), name);
}

bool IsWebAddress(const std::string& url) {
  return url.compare(0, 8, "https://") == 0 || url.compare(0, 7, "http://") == 0;
}

// With an empty endpoint the browser would be sent to this program again, and again.
void CheckSetUp(SSOClient& client, const std::string& profile) {
  const std::string file = "/usr/qova/etc/ssoclient/" + profile + ".conf: ";
  const char* missing = nullptr;
  if (!IsWebAddress(client.GetAuthEndpoint())) missing = "authorization_endpoint";
  if (client.GetClientID().empty()) missing = "client_id";
  if (!IsWebAddress(client.GetTokenEndpoint())) missing = "token_endpoint";
  if (!IsWebAddress(client.GetRedirectURI())) missing = "redirect_uri";
  if (missing == nullptr) return;
  throw Failure(FailureCode::kNotSetUp, file + profile + "_" + missing + " is missing or no URL");
}

template <class Client>
void SendToProvider(const Attempt& attempt) {
  Loaded<Client> client;
  CheckSetUp(*client, attempt.profile);
  const std::string name = binding::NewName();
  Json::Value parameters(Json::objectValue);
  parameters[binding::kMember] = name;
  if (!attempt.origin.empty()) parameters["origin"] = attempt.origin;
  const std::string url = client->GetAccessTokenReqURI(parameters);
  cgi::Redirect(url, binding::Cookies(attempt.request, name, Parameter(url, "state")));
}

void Start(const Attempt& attempt) {
  if (attempt.profile == "azure") return SendToProvider<AzureSSOClient>(attempt);
  if (attempt.profile == "websphere") return SendToProvider<WebSphereSSOClient>(attempt);
  throw Failure(FailureCode::kNotSetUp, "profile not support.");
}

// What the provider said in place of a code (RFC 6749, section 4.1.2.1).
void CheckError(const cgi::Values& query) {
  const std::string error = cgi::Value(query, "error");
  if (!error.empty()) {
    const bool denied = error == "access_denied";
    throw Failure(denied ? FailureCode::kDenied : FailureCode::kProviderError, "provider refused",
                  {Redact(error, {}), Redact(cgi::Value(query, "error_description"), {})});
  }
  if (cgi::Value(query, "code").empty()) {
    throw Failure(FailureCode::kBadRequest, "provider sent no code");
  }
}

// A browser shows a page while the next one is on its way: the provider may be slow. Other clients
// do not say what they want a page for, and get their answer directly.
bool ShowsWaiting(const cgi::Request& request) {
  if (request.fetch_dest != "document" || request.query.count("go") != 0) return false;
  const std::string url = request.script + "?" + request.query_text + "&go=1";
  cgi::Page(page::SigningIn(url, request.languages), {"Refresh: 0; url=" + url});
  return true;
}

// The provider's answer. The order counts: a request that does not belong to a login of this
// browser uses nothing up, and a login that finds no slot can be tried again.
void Callback(Attempt& attempt, const Settings& settings) {
  const cgi::Request& request = attempt.request;
  const binding::Ticket ticket = binding::Find(request);
  attempt.origin = Member(ticket.state, "origin");
  attempt.cookies = {ticket.expire};
  CheckError(request.query);
  if (ShowsWaiting(request)) return;
  attempt.cookies.clear();
  const auto slot = TakeSlot(settings.max_exchanges);
  attempt.cookies = {ticket.expire};
  binding::Redeem(ticket);
  const SignedIn result =
      Exchange(cgi::Value(request.query, "code"), ticket.state, attempt.profile, settings);
  const std::string cookie = session::Open(request, result.user, settings);
  syslog(LOG_INFO, "signed in: %s", OneLine(result.user, result.user.size()).c_str());
  const std::string relay = GetSSORelayURL(true, cgi::Value(request.query, "state"), "");
  cgi::Redirect(kPages + relay, {cookie, HintCookie(attempt.profile, result.token), ticket.expire});
}

void Dispatch(Attempt& attempt, SSOProfile& profile, const Settings& settings) {
  const cgi::Request& request = attempt.request;
  const std::string action = cgi::Value(request.query, "action");
  if (request.method == "POST" && action == "logout") return Logout(request, profile);
  const bool start = action == "start";
  if (request.method != "GET" || !(start || action.empty())) {
    throw Failure(FailureCode::kBadRequest, "unknown request");
  }
  if (!profile.SSOIsEnable()) throw Failure(FailureCode::kDisabled, "sso does not enable.");
  if (start) return Start(attempt);
  Callback(attempt, settings);
}

}  // namespace

void Serve(Attempt& attempt) {
  const std::string origin = cgi::Value(attempt.request.query, "origin");
  if (IsOwnPath(origin)) attempt.origin = origin;
  StepDown();
  const Settings settings = ReadSettings();
  process::SetDeadline(settings.deadline + kGrace);
  for (const std::string& line : settings.complaints) {
    syslog(LOG_WARNING, "%s", OneLine(line, 200).c_str());
  }
  process::SetProxy(settings);
  Loaded<SSOProfile> profile;
  attempt.profile = profile->GetSSOProfile();
  Dispatch(attempt, *profile, settings);
}

void Fail(const Attempt& attempt, const Failure& failure) {
  CheckIdentity();  // of whatever failed
  syslog(LOG_ERR, "%s",
         LogLine(failure, attempt.reference, attempt.request.address, attempt.profile).c_str());
  const std::string reason = std::string(failure.Name()) + "." + attempt.reference;
  std::string relay = GetSSORelayURL(false, "", URLEncode(reason));
  if (!attempt.origin.empty()) relay += "&origin=" + URLEncode(attempt.origin);
  std::vector<std::string> cookies = attempt.cookies;
  // For a browser without scripts: the front page shows the outcome then.
  cookies.push_back(cgi::Cookie("__Host-outcome", reason, 120));
  cgi::Redirect(kPages + relay, cookies);
}
