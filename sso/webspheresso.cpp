#include "sso/webspheresso.h"

#include <openssl/evp.h>

#include <stdexcept>

#include "sso/internal/encoding.h"
#include "sso/internal/json.h"
#include "sso/internal/provider.h"
#include "sso/jwt.h"
#include "sso/privilege.h"

namespace QOVA {
namespace SSO {

namespace {

constexpr char kUnit[] = "webspheresso.cpp";

constexpr char kSettingsPath[] = "/usr/qova/etc/ssoclient/websphere.conf";

constexpr Algorithm kAlgorithms[] = {
    {"HS256", EVP_sha256}, {"HS384", EVP_sha384}, {"HS512", EVP_sha512}};

}  // namespace

WebSphereSSOClient::WebSphereSSOClient() {
  Json::Value settings;
  CriticalSection guard(kUnit);
  guard.Enter(__LINE__);
  const bool read = ReadJsonFile(kSettingsPath, settings);
  guard.Leave(__LINE__);
  if (!read) return;

  TakeSetting(settings, "websphere_wellknown", wellknownEndpoint);
  TakeSetting(settings, "websphere_client_id", clientID);
  TakeSetting(settings, "websphere_client_secret", clientSecret);
  TakeSetting(settings, "websphere_authorization_endpoint", authEndpoint);
  TakeSetting(settings, "websphere_token_endpoint", tokenEndpoint);
  TakeSetting(settings, "websphere_redirect_uri", redirectURI);
  TakeSetting(settings, "websphere_logout_endpoint", logoutEndpoint);
}

WebSphereSSOClient::~WebSphereSSOClient() = default;

std::string WebSphereSSOClient::GetAccessTokenReqURI(const Json::Value& stateInfo) {
  AuthorizationRequest request;
  request.endpoint = authEndpoint;
  request.client_id = clientID;
  request.redirect_uri = redirectURI;
  request.scope = "openid profile email";
  return AuthorizationURL(request, stateInfo);
}

void WebSphereSSOClient::RedirectAuthEndpoint(const Json::Value& stateInfo) {
  WriteRedirect(GetAccessTokenReqURI(stateInfo));
}

std::string WebSphereSSOClient::GetIDTokenReqParams() {
  TokenRequest request;
  request.client_id = clientID;
  request.client_secret = clientSecret;
  request.redirect_uri = redirectURI;
  request.code = code;
  return TokenRequestBody(request);
}

void WebSphereSSOClient::ProcessTokenResponse(std::string response) {
  token.clear();
  token = FindIDToken(ParseTokenResponse(response));
}

void WebSphereSSOClient::VerifyIDToken() {
  if (token.empty()) throw std::invalid_argument("token cannot be empty");
  JWT::Jwt jwt(token);
  const Json::Value header = jwt.GetHeader();
  const Json::Value body = jwt.GetBody();
  const std::string alg = MemberText(header, "alg");
  const std::string aud = MemberText(body, "aud");
  const std::string exp = MemberText(body, "exp");

  CheckExpiry(exp);
  if (aud != clientID) throw std::invalid_argument("client ID invalid");
  const EVP_MD* const digest = FindDigest(kAlgorithms, alg);
  // The check takes its key encoded: this makes it the secret's own bytes.
  std::string key = EncodeBase64(clientSecret);
  jwt.JwtHMACVerify(key, digest);
}

void WebSphereSSOClient::GetUserInfo(Json::Value& info) {
  info = StoredClaims(token);
}

void WebSphereSSOClient::GetUserName(std::string& user) {
  const Json::Value claims = StoredClaims(token);
  const Json::Value* const subject = FindString(claims, "sub");
  if (subject == nullptr) throw std::invalid_argument("cannot find the user name!");
  user = subject->asString();
}

}  // namespace SSO
}  // namespace QOVA
