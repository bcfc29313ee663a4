#include "sso/sso.h"

#include <syslog.h>

#include <cstring>
#include <iterator>
#include <new>
#include <utility>

#include "platform/platform.h"
#include "sso/azuresso.h"
#include "sso/internal/http_body.h"
#include "sso/internal/json.h"
#include "sso/utils.h"
#include "sso/webspheresso.h"

namespace QOVA {
namespace SSO {

namespace {

constexpr char kUnit[] = "sso.cpp";

// The name of the profile that single sign-on is enabled with.
std::string EnabledProfile() {
  Json::Value profile;
  if (!ReadJsonFile(kProfilePath, profile)) throw sso_op_failed("read profile file failed.");

  bool enable = false;
  TakeSetting(profile, kEnableKey, enable);
  if (!enable) throw sso_op_failed("sso does not enable.");

  const Json::Value* const name = FindString(profile, kProfileKey);
  if (name == nullptr) throw sso_op_failed("not specify sso profile");
  return name->asString();
}

template <typename Client>
void Login(const std::string& code, std::string& user) {
  Client().OpenIDConnectLogin(code, user);
}

constexpr struct {
  const char* profile;
  void (*login)(const std::string& code, std::string& user);
} kLogins[] = {{kAzureProfile, Login<AzureSSOClient>},
               {kWebSphereProfile, Login<WebSphereSSOClient>}};
static_assert(std::size(kLogins) == std::size(kSupportedProfiles));  // each has its login

// Finds the "origin" that the login program packed into a state; false if there is none.
bool FindOrigin(const std::string& state, std::string& origin) {
  char text[1024] = {};
  size_t size = sizeof text;
  if (QOVABase64Decode(state.data(), state.size(), text, &size) == 0) return false;

  Json::Value parameters;
  // A state that fills the buffer has no terminating zero in it.
  if (!ParseJson(text, text + strnlen(text, sizeof text), parameters)) return false;
  const Json::Value* const member = FindString(parameters, "origin");
  if (member == nullptr) return false;
  origin = member->asString();
  return true;
}

}  // namespace

SSOClient::SSOClient() = default;
SSOClient::SSOClient(const SSOClient& other) = default;
SSOClient::SSOClient(SSOClient&& other) noexcept = default;
SSOClient& SSOClient::operator=(const SSOClient& other) = default;
SSOClient& SSOClient::operator=(SSOClient&& other) noexcept = default;
SSOClient::~SSOClient() = default;

bool SSOClient::isEnable() {
  return enable;
}
std::string SSOClient::GetClientID() {
  return clientID;
}
std::string SSOClient::GetClientSecret() {
  return clientSecret;
}
std::string SSOClient::GetRedirectURI() {
  return redirectURI;
}
std::string SSOClient::GetToken() {
  return token;
}
std::string SSOClient::GetAuthEndpoint() {
  return authEndpoint;
}
std::string SSOClient::GetTokenEndpoint() {
  return tokenEndpoint;
}
std::string SSOClient::GetWellknownEndpoint() {
  return wellknownEndpoint;
}
std::string SSOClient::GetLogoutEndpoint() {
  return logoutEndpoint;
}

void SSOClient::SetRedirectURI(std::string uri) {
  redirectURI = std::move(uri);
}

void SSOClient::SetCode(std::string value) {
  code = std::move(value);
}

void SSOClient::RequestWellknownInfo(Json::Value& out) {
  try {
    std::string response;
    httpGet(wellknownEndpoint, response, true, WriteToStringCallback);
    if (!ParseJson(response, out)) throw sso_err_resp("bad wellknown json format.");
  } catch (const std::bad_alloc&) {
    __extension__ syslog(LOG_ERR, "%s:%d bad_alloc. %m", kUnit, __LINE__);
  } catch (const std::invalid_argument& e) {
    syslog(LOG_ERR, "%s:%d %s", kUnit, __LINE__, e.what());
  } catch (const sso_err_resp& e) {
    syslog(LOG_ERR, "%s:%d %s", kUnit, __LINE__, e.what());
  }
}

void SSOClient::RequestTokenEndpoint(std::string& response, const std::string& params) {
  try {
    httpPost(tokenEndpoint, params, response, true, WriteToStringCallback);
  } catch (const std::bad_alloc&) {
    __extension__ syslog(LOG_ERR, "%s:%d bad_alloc. %m", kUnit, __LINE__);
  } catch (const std::invalid_argument& e) {
    syslog(LOG_ERR, "%s:%d %s", kUnit, __LINE__, e.what());
  } catch (const sso_err_resp& e) {
    // "uri", but the text is the error's: administrators search their logs for this line.
    syslog(LOG_ERR, "%s:%d request token uri %s.", kUnit, __LINE__, e.what());
  }
}

void SSOClient::VerifyIDToken() {
  throw sso_not_implemented("VerifyIDToken not implemented");
}

std::string SSOClient::GetIDTokenReqParams() {
  throw sso_not_implemented("GetIDTokenReqParams not implemented");
}

void SSOClient::GetUserName(std::string&) {
  throw sso_not_implemented("GetUserName not implemented");
}

void SSOClient::ProcessTokenResponse(std::string) {
  throw sso_not_implemented("ProcessTokenResponse not implemented");
}

void SSOClient::OpenIDConnectLogin(std::string value, std::string& user) {
  SetCode(std::move(value));
  const std::string params = GetIDTokenReqParams();
  std::string response;
  RequestTokenEndpoint(response, params);
  ProcessTokenResponse(std::move(response));
  VerifyIDToken();
  GetUserName(user);
}

void OIDCLogin(const std::string& code, std::string& user) {
  const std::string profile = EnabledProfile();
  for (const auto& supported : kLogins) {
    if (profile == supported.profile) return supported.login(code, user);
  }
  throw sso_exception("profile not support.");
}

std::string GetSSORelayURL(bool success, const std::string& state, const std::string& reason) {
  std::string url = "ssoclient/relay.html#";
  std::string origin;
  if (!success && !reason.empty()) {
    url += "reason=" + reason + "&";
  } else if (success && FindOrigin(state, origin)) {
    url += "origin=" + URLEncode(origin) + "&";
  }
  return url += success ? "success=true" : "success=false";
}

}  // namespace SSO
}  // namespace QOVA
