#include "login.h"

#include <syslog.h>

#include <stdexcept>

#include "binding.h"
#include "exchange.h"
#include "reason.h"
#include "session.h"
#include "settings.h"
#include "sso/azuresso.h"
#include "sso/profile.h"
#include "sso/sso.h"
#include "sso/utils.h"
#include "sso/webspheresso.h"
#include "state.h"

using namespace QOVA::SSO;

namespace {

constexpr char kPages[] = "/webman/";

// The value of a parameter in the query of a URL.
std::string Parameter(const std::string& url, const std::string& name) {
  const size_t query = url.find('?');
  return query == std::string::npos ? "" : cgi::Value(cgi::ReadQuery(url.substr(query + 1)), name);
}

// The scheme, host and port of an absolute URL.
std::string Site(const std::string& url) {
  const size_t host = url.find("://");
  if (host == std::string::npos) return "";
  return url.substr(0, url.find('/', host + 3));
}

template <class Client>
void SendToProvider(const Json::Value& parameters, const binding::Ticket& ticket) {
  Client client;
  if (ReadSettings().plain) {
    binding::Remember(ticket, "");
    // The library ends the header with its Location: the cookie must be out before.
    cgi::BeginRedirect({ticket.cookie});
    client.RedirectAuthEndpoint(parameters);
    return;
  }
  const std::string url = client.GetAccessTokenReqURI(parameters);
  binding::Remember(ticket, Parameter(url, "state"));
  cgi::Redirect(url, {ticket.cookie});
}

}  // namespace

void Start(const cgi::Request& request) {
  const binding::Ticket ticket = binding::Issue();
  Json::Value parameters(Json::objectValue);
  parameters[binding::kMember] = ticket.digest;
  const std::string origin = cgi::Value(request.query, "origin");
  if (IsOwnPath(origin)) parameters["origin"] = origin;

  SSOProfile profile;
  if (!profile.SSOIsEnable()) throw std::runtime_error("sso does not enable.");
  if (profile.GetSSOProfile() == "azure") {
    SendToProvider<AzureSSOClient>(parameters, ticket);
  } else if (profile.GetSSOProfile() == "websphere") {
    SendToProvider<WebSphereSSOClient>(parameters, ticket);
  } else {
    throw std::runtime_error("profile not support.");
  }
}

void Callback(const cgi::Request& request) {
  const Json::Value state = binding::Redeem(request);
  const std::string error = cgi::Value(request.query, "error");
  if (!error.empty()) throw std::runtime_error("provider refused: " + error);
  const std::string code = cgi::Value(request.query, "code");
  if (code.empty()) throw std::runtime_error("provider sent no code");

  const std::string user = Exchange(code, state, ReadSettings());
  const std::string cookie = session::Open(user);
  syslog(LOG_INFO, "signed in: %s", LogLine(user).c_str());
  // In the plain road the state was not compared as a whole: its origin is looked at again.
  const bool own = IsOwnPath(Member(state, "origin"));
  const std::string relay = GetSSORelayURL(true, own ? cgi::Value(request.query, "state") : "", "");
  cgi::Redirect(kPages + relay, {cookie, binding::Expire()});
}

void Logout(const cgi::Request& request) {
  const std::string cookie = session::Close(request);
  SSOProfile profile;
  // The device's address comes from its own settings: a browser may send any Host.
  const std::string site = Site(profile.GetSSOClient()->GetRedirectURI());
  std::string url;
  if (profile.GetSSOProfile() == "azure" && !site.empty()) {
    url = GetAzureSSOLogoutURL(site + "/index.cgi");
  } else {
    url = profile.GetSSOClient()->GetLogoutEndpoint();
    if (!url.empty() && !site.empty()) {  // the library adds the way back to Azure's alone
      url += "?post_logout_redirect_uri=" + URLEncode(site + kPages + "ssoclient/relay.html");
    }
  }
  if (url.empty()) url = std::string(kPages) + "ssoclient/relay.html";
  cgi::Redirect(url, {cookie});
}

void Fail(const cgi::Request& request, const std::string& text) {
  const std::string safe = Redact(text, {cgi::Value(request.query, "code")});
  syslog(LOG_ERR, "sign-in failed: %s", LogLine(safe).c_str());
  // The library does not encode the reason, and a provider's words may stand in it.
  const std::string relay = GetSSORelayURL(false, "", URLEncode(ShortReason(safe)));
  cgi::Redirect(kPages + relay, {binding::Expire()});
}
