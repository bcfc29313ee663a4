#include "sso/azuresso.h"

#include <openssl/evp.h>
#include <syslog.h>

#include <locale>
#include <new>
#include <stdexcept>

#include "platform/platform.h"
#include "sso/internal/http_body.h"
#include "sso/internal/json.h"
#include "sso/internal/libcurl.h"
#include "sso/internal/provider.h"
#include "sso/internal/split.h"
#include "sso/jwt.h"
#include "sso/privilege.h"
#include "sso/utils.h"

namespace QOVA {
namespace SSO {

namespace {

constexpr char kUnit[] = "azuresso.cpp";

constexpr char kSettingsPath[] = "/usr/qova/etc/ssoclient/azure.conf";
constexpr char kRelayPage[] = "/webman/ssoclient/relay.html";
const char* const kAddressSuffixes[] = {"/index.cgi"};

constexpr Algorithm kAlgorithms[] = {
    {"RS256", EVP_sha256}, {"RS384", EVP_sha384}, {"RS512", EVP_sha512}};

// The first key with the identifier `kid`. Throws if there is none.
const Json::Value& FindKey(const Json::Value& key_set, const std::string& kid) {
  const Json::Value* const keys = FindMember(key_set, "keys");
  if (keys != nullptr && keys->isArray()) {
    for (const Json::Value& key : *keys) {
      const Json::Value* const key_id = FindMember(key, "kid");
      if (key_id != nullptr && key_id->asString() == kid) return key;
    }
  }
  throw std::invalid_argument("kid does not exist in Azure verified kyes");
}

std::string KeyNumber(const Json::Value& key, const char* name, const char* failure) {
  const Json::Value* const number = FindString(key, name);
  if (number == nullptr) throw std::invalid_argument(failure);
  return number->asString();
}

// The claim that names the user. The choice is final: a "unique_name" of no use does not make
// "email" count.
std::string NameClaim(const Json::Value& claims) {
  const Json::Value* name = FindString(claims, "unique_name");
  if (name == nullptr) name = FindString(claims, "email");
  if (name == nullptr) throw std::invalid_argument("cannot find the user name!");
  return name->asString();
}

// account@dns.domain as DNS.DOMAIN\account.
std::string DomainUser(const std::string& principal) {
  Pieces<2> pieces;
  if (!Split(principal, '@', pieces)) throw std::invalid_argument("cannot get the user name!");
  std::string user(pieces[1]);
  const std::locale global;
  std::use_facet<std::ctype<char>>(global).toupper(&user[0], &user[0] + user.size());
  return user.append(1, '\\').append(pieces[0]);
}

}  // namespace

AzureSSOClient::AzureSSOClient() {
  Json::Value settings;
  CriticalSection guard(kUnit);
  guard.Enter(__LINE__);
  const bool read = ReadJsonFile(kSettingsPath, settings);
  guard.Leave(__LINE__);
  if (!read) return;

  TakeSetting(settings, "azure_sso_enable", enable);
  TakeSetting(settings, "azure_wellknown", wellknownEndpoint);
  TakeSetting(settings, "azure_client_id", clientID);
  TakeSetting(settings, "azure_client_secret", clientSecret);
  TakeSetting(settings, "azure_tenant_id", tenantID);
  TakeSetting(settings, "azure_authorization_endpoint", authEndpoint);
  TakeSetting(settings, "azure_token_endpoint", tokenEndpoint);
  TakeSetting(settings, "azure_redirect_uri", redirectURI);
  TakeSetting(settings, "azure_logout_endpoint", logoutEndpoint);
}

AzureSSOClient::~AzureSSOClient() = default;

std::string AzureSSOClient::GetAccessTokenReqURI(const Json::Value& params) {
  AuthorizationRequest request;
  request.endpoint = authEndpoint;
  request.client_id = clientID;
  request.redirect_uri = redirectURI;
  request.scope = "openid";
  return AuthorizationURL(request, params);
}

void AzureSSOClient::RedirectAuthEndpoint(const Json::Value& params) {
  WriteRedirect(GetAccessTokenReqURI(params));
}

std::string AzureSSOClient::GetIDTokenReqParams() {
  TokenRequest request;
  request.client_id = clientID;
  request.client_secret = clientSecret;
  request.redirect_uri = redirectURI;
  request.code = code;
  return TokenRequestBody(request);
}

void AzureSSOClient::ProcessTokenResponse(std::string response) {
  token.clear();
  const Json::Value document = ParseTokenResponse(response);
  if (FindMember(document, azure::kError) != nullptr) throw sso_err_resp(WriteJson(document));
  token = FindIDToken(document);
}

void AzureSSOClient::RequestKeysInfo(std::string uri, Json::Value& keys) {
  keys = Json::Value();
  try {
    std::string response;
    httpGet(uri, response, true, WriteToStringCallback);
    // A key set that was cut off must not pass for a shorter one.
    Json::Value document;
    if (!ParseJson(response, document)) throw sso_err_resp("bad wellknown json format.");
    keys.swap(document);
    if (FindMember(keys, "keys") == nullptr) throw std::invalid_argument("no kyes information");
  } catch (const std::bad_alloc&) {
    __extension__ syslog(LOG_ERR, "%s:%d curl_easy_init failed. %m", kUnit, __LINE__);
  } catch (const std::invalid_argument& e) {
    syslog(LOG_ERR, "%s:%d %s", kUnit, __LINE__, e.what());
  } catch (const sso_err_resp& e) {
    syslog(LOG_ERR, "%s:%d request wellknown uri %s.", kUnit, __LINE__, e.what());
  }
  // httpGet has cleaned up already: this gives up a reference that the host program may hold
  // (docs/integrating.md). It stays: the sequence of calls is settled behaviour.
  CleanUpCurl();
}

void AzureSSOClient::VerifyIDToken() {
  if (token.empty()) throw std::invalid_argument("token cannot be empty");
  JWT::Jwt jwt(token);
  const Json::Value header = jwt.GetHeader();
  const Json::Value body = jwt.GetBody();
  const std::string alg = MemberText(header, "alg");
  const std::string kid = MemberText(header, "kid");
  const std::string aud = MemberText(body, "aud");
  const std::string tid = MemberText(body, "tid");
  const std::string exp = MemberText(body, "exp");

  // Claims before signature: keys are fetched only for a token that is meant for this device.
  CheckExpiry(exp);
  if (tid != tenantID) throw std::invalid_argument("tenant ID invalid");
  if (aud != clientID) throw std::invalid_argument("client ID invalid");

  Json::Value discovery;
  RequestWellknownInfo(discovery);
  Json::Value key_set;
  RequestKeysInfo(MemberText(discovery, "jwks_uri"), key_set);
  const Json::Value& key = FindKey(key_set, kid);
  std::string n = KeyNumber(key, "n", "RSA public 'n' cannot be found!");
  std::string e = KeyNumber(key, "e", "RSA public 'e' cannot be found!");
  jwt.JwtRSAVerify(n, e, FindDigest(kAlgorithms, alg));
}

void AzureSSOClient::GetUserInfo(Json::Value& info) {
  info = StoredClaims(token);
}

void AzureSSOClient::GetUserName(std::string& user) {
  user = DomainUser(NameClaim(StoredClaims(token)));
  char netbios[1024] = {};
  if (QOVAWinsUserNameFqdn2Netbios(user.c_str(), netbios, sizeof netbios - 1) < 0) {
    throw sso_op_failed("QOVAWinsUserNameFqdn2Netbios failed.");
  }
  user = netbios;
}

std::string GetAzureSSOLogoutURL(const std::string& address) {
  std::string url = AzureSSOClient().GetLogoutEndpoint();
  if (address.empty()) return url;

  std::string base = address;
  for (const std::string suffix : kAddressSuffixes) {
    // Throws for an address that is shorter than the suffix: login programs count on it.
    if (base.substr(base.size() - suffix.size()) != suffix) continue;
    base.resize(base.size() - suffix.size());
    break;
  }
  if (!base.empty() && base.back() == '/') base.pop_back();
  base += kRelayPage;
  return url.append(1, '?')
      .append(azure::kPostLogoutRedirectURI)
      .append(1, '=')
      .append(URLEncode(base));
}

}  // namespace SSO
}  // namespace QOVA
