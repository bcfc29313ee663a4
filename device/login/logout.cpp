#include "logout.h"

#include <algorithm>
#include <cctype>

#include "failure.h"
#include "identity.h"
#include "seal.h"
#include "session.h"
#include "sso/azuresso.h"
#include "sso/utils.h"

using namespace QOVA::SSO;

namespace {

constexpr char kTokenCharacters[] =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_.";
constexpr char kHint[] = "__Host-hint";
constexpr char kRelayPage[] = "/webman/ssoclient/relay.html";

// The scheme, host and port of an absolute URL, as browsers write them.
std::string Site(const std::string& url) {
  const size_t host = url.find("://");
  if (host == std::string::npos) return "";
  std::string site = url.substr(0, url.find_first_of("/?#", host + 3));
  std::transform(site.begin(), site.end(), site.begin(),
                 [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  for (const std::string port : {":443", ":80"}) {
    const bool standard = (port == ":443") == (site.compare(0, 6, "https:") == 0);
    if (!standard || site.size() <= port.size()) continue;
    const size_t end = site.size() - port.size();
    if (site.compare(end, port.size(), port) == 0) site.resize(end);
  }
  return site;
}

// Sec-Fetch-Site is the browser's own word, and no page can choose it. An Origin of "null" comes
// from pages that hide where they are, this device's among them if its web server says so.
void CheckSender(const cgi::Request& request, const std::string& site) {
  const std::string own = site.empty() ? "https://" + request.host : site;
  const bool same_origin = request.fetch_site == "same-origin";
  const char* problem = nullptr;
  if (!request.fetch_site.empty() && !same_origin) problem = "Sec-Fetch-Site is not same-origin";
  const bool hidden = same_origin && request.origin == "null";
  if (!request.origin.empty() && !hidden && Site(request.origin) != own) {
    problem = "Origin is not this device";
  }
  const std::string token = session::Token(request);
  if (token.empty()) problem = "no session";
  if (problem == nullptr && !SameText(token, cgi::Value(cgi::ReadForm(request), "token"))) {
    problem = "the form's token does not belong to the session";
  }
  if (problem != nullptr) {
    throw Failure(FailureCode::kSignOutRefused, std::string("sign-out refused: ") + problem);
  }
}

// Where the provider ends its own session; empty if it has no such address.
std::string ProviderLogout(const cgi::Request& request, SSOProfile& profile,
                           const std::string& site) {
  if (profile.GetSSOProfile() == "azure" && !site.empty()) {
    const std::string url = GetAzureSSOLogoutURL(site + "/index.cgi");
    CheckIdentity();
    return url[0] == '?' ? "" : url;  // there is no endpoint before the way back
  }
  std::string url = profile.GetSSOClient()->GetLogoutEndpoint();
  if (!url.empty() && !site.empty()) {  // the library adds the way back to Azure's alone
    url += "?post_logout_redirect_uri=" + URLEncode(site + kRelayPage);
    const std::string hint = cgi::Value(request.cookies, kHint);
    if (!hint.empty()) url += "&id_token_hint=" + URLEncode(hint);
  }
  return url;
}

}  // namespace

std::string HintCookie(const std::string& profile, const std::string& token) {
  const bool token_only = token.find_first_not_of(kTokenCharacters) == std::string::npos;
  return cgi::Cookie(kHint, profile == "websphere" && token_only ? token : "");
}

void Logout(const cgi::Request& request, SSOProfile& profile) {
  // The device's address comes from its own settings: a browser may send any Host.
  const std::string site = Site(profile.GetSSOClient()->GetRedirectURI());
  CheckSender(request, site);
  const std::string cookie = session::Close(request);
  const std::string url = ProviderLogout(request, profile, site);
  cgi::Redirect(url.empty() ? kRelayPage : url, {cookie, cgi::Cookie(kHint, "")});
}
