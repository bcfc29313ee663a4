#include "login.h"

#include <syslog.h>

#include <stdexcept>

#include "reason.h"
#include "session.h"
#include "sso/azuresso.h"
#include "sso/profile.h"
#include "sso/sso.h"
#include "sso/utils.h"
#include "sso/webspheresso.h"

using namespace QOVA::SSO;

namespace {

constexpr char kPages[] = "/webman/";
constexpr size_t kLongestOrigin = 256;

// A page of this very site: what is not a plain path could lead the browser elsewhere.
bool IsOwnPath(const std::string& text) {
  if (text.empty() || text[0] != '/' || text.size() > kLongestOrigin) return false;
  if (text.size() > 1 && text[1] == '/') return false;
  return text.find_first_not_of(
             "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789"
             "/._~-?&=%") == std::string::npos;
}

// The scheme, host and port of an absolute URL.
std::string Site(const std::string& url) {
  const size_t host = url.find("://");
  if (host == std::string::npos) return "";
  return url.substr(0, url.find('/', host + 3));
}

}  // namespace

void Start(const cgi::Request& request) {
  const std::string origin = cgi::Value(request.query, "origin");
  Json::Value state(Json::objectValue);
  if (IsOwnPath(origin)) state["origin"] = origin;

  SSOProfile profile;
  if (!profile.SSOIsEnable()) throw std::runtime_error("single sign-on is off");
  if (profile.GetSSOProfile() == "azure") {
    AzureSSOClient client;
    cgi::BeginRedirect({});
    client.RedirectAuthEndpoint(state);
  } else if (profile.GetSSOProfile() == "websphere") {
    WebSphereSSOClient client;
    cgi::BeginRedirect({});
    client.RedirectAuthEndpoint(state);
  } else {
    throw std::runtime_error("unknown profile");
  }
}

void Callback(const cgi::Request& request) {
  const std::string error = cgi::Value(request.query, "error");
  if (!error.empty()) throw std::runtime_error("provider refused: " + error);
  const std::string code = cgi::Value(request.query, "code");
  if (code.empty()) throw std::runtime_error("no code");

  std::string user;
  OIDCLogin(code, user);
  const std::string cookie = session::Open(user);
  syslog(LOG_INFO, "signed in: %s", LogLine(user, "").c_str());
  cgi::Redirect(kPages + GetSSORelayURL(true, cgi::Value(request.query, "state"), ""), {cookie});
}

void Logout(const cgi::Request& request) {
  const std::string cookie = session::Close(request);
  SSOProfile profile;
  const std::string site = Site(profile.GetSSOClient()->GetRedirectURI());
  std::string url;
  if (profile.GetSSOProfile() == "azure" && !site.empty()) {
    url = GetAzureSSOLogoutURL(site + "/index.cgi");
  } else {
    url = profile.GetSSOClient()->GetLogoutEndpoint();
  }
  if (url.empty()) url = std::string(kPages) + "ssoclient/relay.html";
  cgi::Redirect(url, {cookie});
}

void Fail(const cgi::Request& request, const std::string& text) {
  syslog(LOG_ERR, "sign-in failed: %s", LogLine(text, cgi::Value(request.query, "code")).c_str());
  // The library does not encode the reason, and a provider's words may stand in it.
  cgi::Redirect(kPages + GetSSORelayURL(false, "", URLEncode(ShortReason(text))), {});
}
