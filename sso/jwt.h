// JSON Web Tokens in compact form (RFC 7519, RFC 7515 section 7.1) and their signatures.
#pragma once

#include <json/value.h>
#include <openssl/ossl_typ.h>

#include <string>

#include "sso/common.h"

namespace QOVA {
namespace JWT {

// Jwt holds the three segments of one token, still base64url-encoded. Nothing is verified until
// one of the two checks is called, and nothing is cached.
class SSOCLIENT_API Jwt {
 public:
  // Splits the token at ".". Throws std::invalid_argument "bad jwt format!" unless there are
  // exactly three segments; their content is not looked at.
  Jwt(std::string token);  // NOLINT(google-explicit-constructor): callers may pass a text

  // GetHeader and GetBody decode a segment and parse it as JSON; the value need not be an object.
  // Throw std::invalid_argument "bad jwt header format!" or "bad jwt body format!" for what is
  // not base64url text of JSON, and std::logic_error for an empty segment.
  Json::Value GetHeader();
  Json::Value GetBody();

  // GetSignature returns the third segment as it is in the token, not decoded.
  std::string GetSignature();

  // JwtRSAVerify checks an RSASSA-PKCS1-v1_5 signature (RFC 7518, section 3.3) under the public
  // key with modulus `n` and exponent `e`, base64url texts as in a JSON Web Key (RFC 7518,
  // section 6.3.1), and the digest `md`, which stays the caller's. Throws jwt_verify_failed
  // "verify rsa signature failed"; a line in the system log may say which step failed.
  void JwtRSAVerify(std::string& n, std::string& e, const EVP_MD* md);

  // JwtHMACVerify checks an HMAC (RFC 7518, section 3.2) under the bytes of `key`, a base64url
  // text. The signature is compared as text, so it must be base64url without padding. Throws
  // jwt_verify_failed "verify hmac signature failed".
  void JwtHMACVerify(std::string& key, const EVP_MD* md);

 private:
  std::string header;
  std::string body;
  std::string signature;
};

}  // namespace JWT
}  // namespace QOVA
