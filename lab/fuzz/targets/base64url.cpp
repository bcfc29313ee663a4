// Base64url text where the library decodes it: as a key, as a segment, as a signature.
#include <openssl/evp.h>

#include "sso/jwt.h"
#include "support/independent.h"
#include "support/known.h"
#include "support/target.h"

namespace {

using QOVA::JWT::Jwt;
using QOVA::JWT::jwt_verify_failed;

constexpr char kInput[] = "eyJhbGciOiJIUzI1NiJ9.e30";

// Whether `key` serves as the key of a token signed with `bytes`.
bool isKeyOf(const std::string& bytes, std::string key) {
  const std::string mac = fuzz::base64url(fuzz::hmac(bytes, kInput, "SHA256"));
  return fuzz::returns({{typeid(jwt_verify_failed), "verify hmac signature failed"}},
                       [&] { Jwt(kInput + ("." + mac)).JwtHMACVerify(key, EVP_sha256()); });
}

void readAsSegment(const std::string& text) {
  fuzz::returns(
      {{typeid(std::invalid_argument), "bad jwt body format!"}, {typeid(std::logic_error), ""}},
      [&] { Jwt("e30." + text + ".").GetBody(); });
}

void readAsSignature(const std::string& text) {
  std::string n = fuzz::kModulus;
  std::string e = fuzz::kExponent;
  fuzz::require(!fuzz::returns({{typeid(jwt_verify_failed), "verify rsa signature failed"}},
                               [&] { Jwt("e30.e30." + text).JwtRSAVerify(n, e, EVP_sha256()); }),
                "a signature out of nowhere");
}

}  // namespace

FUZZ_TARGET(base64url) {
  if (input.find('.') != std::string::npos) return false;
  const std::string text = fuzz::cString(input);
  const auto bytes = fuzz::strictBase64url(text);
  // To HMAC a key of zero bytes and the empty key are one and the same, and zero bytes are what
  // OpenSSL reads out of pads.
  const bool pads = text.find('=') != std::string::npos;
  const bool empty = !pads && fuzz::lenientBase64url(text).empty();
  fuzz::require(!empty || !isKeyOf("", input), "a text became the empty key");
  const bool strict = bytes.has_value() && !bytes->empty();
  const bool isKey = strict && isKeyOf(*bytes, input);
  fuzz::require(isKey == strict, "not the bytes that the text encodes");
  readAsSegment(input);
  readAsSignature(input);
  return isKey;
}
