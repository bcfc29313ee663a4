// What the two provider clients have in common: requests, token response, claim checks.
#pragma once

#include <json/value.h>
#include <openssl/evp.h>

#include <cstdint>
#include <ctime>
#include <iostream>
#include <map>
#include <sstream>
#include <stdexcept>
#include <string>

#include "platform/platform.h"
#include "sso/common.h"
#include "sso/json.h"
#include "sso/jwt.h"
#include "sso/nonce.h"
#include "sso/utils.h"

namespace QOVA {
namespace SSO {

// The parameters of a request, written in ascending order of their names.
using ParameterSet = std::map<std::string, std::string>;

// Writes "&", name, "=" and URL-encoded value for each parameter. Names are written as they are.
inline std::string WriteParameters(const ParameterSet& parameters) {
  std::string text;
  for (const auto& [name, value] : parameters) {
    text.append(1, '&').append(name).append(1, '=').append(URLEncode(value));
  }
  return text;
}

// The platform's base64 text. Throws sso_op_failed if it does not fit the platform's buffer.
inline std::string EncodeBase64(const std::string& bytes) {
  constexpr int kOption = 1;
  char text[1024] = {};
  if (QOVABase64Encode(bytes.data(), bytes.size(), text, sizeof text, kOption) == 0) {
    throw sso_op_failed("encode base64 failed.");
  }
  return text;
}

// The state of an authorization request: the caller's parameters and the digest of the nonce.
inline std::string MakeState(const Json::Value& parameters, const std::string& nonce) {
  Json::Value state = parameters.isObject() ? parameters : Json::Value(Json::objectValue);
  state[oauth::kNonce] = MD5Digest(nonce);
  return EncodeBase64(WriteJson(state));
}

// The URL of an authorization request with a fresh nonce.
inline std::string AuthorizationURL(const std::string& endpoint, const std::string& client_id,
                                    const std::string& redirect_uri, const char* scope,
                                    const Json::Value& parameters) {
  const std::string nonce = MakeNonce();
  std::string query = WriteParameters({{oauth::kResponseType, "code"},
                                       {oauth::kScope, scope},
                                       {oauth::kRedirectURI, redirect_uri},
                                       {oauth::kClientID, client_id},
                                       {oauth::kNonce, nonce},
                                       {oauth::kState, MakeState(parameters, nonce)}});
  // Even behind an endpoint that holds a query already.
  query.front() = '?';
  return endpoint + query;
}

// Ends a CGI header with a redirect to `url`: one write, not flushed.
inline void WriteRedirect(const std::string& url) {
  const std::string header = "Location: " + url + "\n\n";
  std::cout.write(header.data(), static_cast<std::streamsize>(header.size()));
}

// The form-encoded body of a code exchange. The client authenticates with its secret in it.
inline std::string TokenRequestBody(const std::string& client_id, const std::string& client_secret,
                                    const std::string& redirect_uri, const std::string& code) {
  return WriteParameters({{oauth::kGrantType, "authorization_code"},
                          {oauth::kRedirectURI, redirect_uri},
                          {oauth::kClientID, client_id},
                          {oauth::kClientSecret, client_secret},
                          {oauth::kCode, code}})
      .substr(1);
}

inline Json::Value ParseTokenResponse(const std::string& response) {
  Json::Value document;
  if (!ParseJson(response, document)) throw std::invalid_argument("parse json falied");
  return document;
}

inline std::string FindIDToken(const Json::Value& response) {
  const Json::Value* const token = FindString(response, oauth::kIDToken);
  if (token == nullptr) throw sso_err_resp("we cannot find key 'id_token' in response!");
  return token->asString();
}

// The claims of the stored ID token, not verified.
inline Json::Value StoredClaims(const std::string& token) {
  if (token.empty()) throw std::invalid_argument("please request a id_token first.");
  return JWT::Jwt(token).GetBody();
}

// Throws if the expiry time, text in seconds since the epoch, has passed. No leeway; text without
// a number is long past.
inline void CheckExpiry(const std::string& exp) {
  std::int64_t expiry = 0;
  std::istringstream(exp) >> expiry;
  if (static_cast<std::int64_t>(time(nullptr)) > expiry) {
    throw std::invalid_argument("id_token expired.");
  }
}

// A signature algorithm (RFC 7518, section 3.1) and its digest.
struct Algorithm {
  const char* name;
  const EVP_MD* (*digest)();
};

template <size_t N>
const EVP_MD* FindDigest(const Algorithm (&supported)[N], const std::string& name) {
  for (const Algorithm& algorithm : supported) {
    if (name == algorithm.name) return algorithm.digest();
  }
  throw JWT::jwt_not_support(name + " algorithm is not supported");
}

}  // namespace SSO
}  // namespace QOVA
