// What the two provider clients have in common: requests, token response, claim checks. Not
// exported.
#pragma once

#include <json/value.h>
#include <openssl/evp.h>

#include <string>
#include <string_view>

#include "sso/common.h"

namespace QOVA {
namespace SSO {

// The texts that a request is made of; they are the caller's.
struct AuthorizationRequest {
  std::string_view endpoint;
  std::string_view client_id;
  std::string_view redirect_uri;
  std::string_view scope;
};

// The URL of an authorization request with a fresh nonce. Its state is made of the caller's
// parameters and the digest of the nonce.
std::string AuthorizationURL(const AuthorizationRequest& request, const Json::Value& parameters);

// Ends a CGI header with a redirect to `url`: one write, not flushed.
void WriteRedirect(const std::string& url);

struct TokenRequest {
  std::string_view client_id;
  std::string_view client_secret;
  std::string_view redirect_uri;
  std::string_view code;
};

// The form-encoded body of a code exchange. The client authenticates with its secret in it.
std::string TokenRequestBody(const TokenRequest& request);

// Throws std::invalid_argument for what is not JSON.
Json::Value ParseTokenResponse(const std::string& response);

// Throws sso_err_resp if there is none.
std::string FindIDToken(const Json::Value& response);

// The claims of the stored ID token, not verified. Throws std::invalid_argument for an empty one.
Json::Value StoredClaims(const std::string& token);

// Throws if the expiry time, text in seconds since the epoch, has passed. No leeway; text without
// a number is long past.
void CheckExpiry(const std::string& exp);

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
