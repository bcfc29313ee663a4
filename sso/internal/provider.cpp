#include "sso/internal/provider.h"

#include <cstdint>
#include <ctime>
#include <iostream>
#include <map>
#include <sstream>
#include <stdexcept>

#include "sso/internal/encoding.h"
#include "sso/internal/json.h"
#include "sso/internal/nonce.h"
#include "sso/jwt.h"
#include "sso/utils.h"

namespace QOVA {
namespace SSO {

namespace {

// The parameters of a request, written in ascending order of their names.
using ParameterSet = std::map<std::string, std::string>;

void Add(ParameterSet& parameters, const char* name, std::string_view value) {
  parameters.emplace(name, value);
}

// Appends "&", name, "=" and URL-encoded value for each parameter. Names are written as they are.
void AppendParameters(const ParameterSet& parameters, std::string& text) {
  for (const auto& [name, value] : parameters) {
    text += '&';
    text += name;
    text += '=';
    AppendURLEncoded(value, text);
  }
}

std::string MakeState(const Json::Value& parameters, const std::string& nonce) {
  Json::Value state = parameters.isObject() ? parameters : Json::Value(Json::objectValue);
  state[oauth::kNonce] = MD5Digest(nonce);
  return EncodeBase64(WriteJson(state));
}

}  // namespace

std::string AuthorizationURL(const AuthorizationRequest& request, const Json::Value& parameters) {
  const std::string nonce = MakeNonce();
  ParameterSet query;
  Add(query, oauth::kResponseType, "code");
  Add(query, oauth::kScope, request.scope);
  Add(query, oauth::kRedirectURI, request.redirect_uri);
  Add(query, oauth::kClientID, request.client_id);
  Add(query, oauth::kNonce, nonce);
  Add(query, oauth::kState, MakeState(parameters, nonce));

  std::string url;
  url.reserve(request.endpoint.size() + 1024);
  url += request.endpoint;
  AppendParameters(query, url);
  // Even behind an endpoint that holds a query already.
  url[request.endpoint.size()] = '?';
  return url;
}

void WriteRedirect(const std::string& url) {
  const std::string header = "Location: " + url + "\n\n";
  std::cout.write(header.data(), static_cast<std::streamsize>(header.size()));
}

std::string TokenRequestBody(const TokenRequest& request) {
  ParameterSet parameters;
  Add(parameters, oauth::kGrantType, "authorization_code");
  Add(parameters, oauth::kRedirectURI, request.redirect_uri);
  Add(parameters, oauth::kClientID, request.client_id);
  Add(parameters, oauth::kClientSecret, request.client_secret);
  Add(parameters, oauth::kCode, request.code);

  std::string body;
  AppendParameters(parameters, body);
  body.erase(0, 1);
  return body;
}

Json::Value ParseTokenResponse(const std::string& response) {
  Json::Value document;
  if (!ParseJson(response, document)) throw std::invalid_argument("parse json falied");
  return document;
}

std::string FindIDToken(const Json::Value& response) {
  const Json::Value* const token = FindString(response, oauth::kIDToken);
  if (token == nullptr) throw sso_err_resp("we cannot find key 'id_token' in response!");
  return token->asString();
}

Json::Value StoredClaims(const std::string& token) {
  if (token.empty()) throw std::invalid_argument("please request a id_token first.");
  return JWT::Jwt(token).GetBody();
}

void CheckExpiry(const std::string& exp) {
  std::int64_t expiry = 0;
  std::istringstream(exp) >> expiry;
  if (static_cast<std::int64_t>(time(nullptr)) > expiry) {
    throw std::invalid_argument("id_token expired.");
  }
}

}  // namespace SSO
}  // namespace QOVA
