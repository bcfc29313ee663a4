// Modulus, exponent and token: the library's RSA check against OpenSSL's one-shot call.
// Parts: a digest ("SHA384"), n, e, token.
#include <openssl/evp.h>

#include "sso/jwt.h"
#include "support/independent.h"
#include "support/target.h"

FUZZ_TARGET(rsa_signature) {
  const auto part = fuzz::parts(input, 4);
  const auto three = fuzz::segments(part[3]);
  const std::string digest = part[0] == "SHA384" || part[0] == "SHA512" ? part[0] : "SHA256";
  if (three.empty()) return false;

  std::string n = part[1];
  std::string e = part[2];
  const bool accepted = fuzz::returns(
      {{typeid(QOVA::JWT::jwt_verify_failed), "verify rsa signature failed"}},
      [&] { QOVA::JWT::Jwt(part[3]).JwtRSAVerify(n, e, EVP_get_digestbyname(digest.c_str())); });
  fuzz::require(n == part[1] && e == part[2], "the arguments were changed");

  const auto modulus = fuzz::strictBase64url(fuzz::cString(n));
  const auto exponent = fuzz::strictBase64url(fuzz::cString(e));
  const auto signature = fuzz::strictBase64url(fuzz::cString(three[2]));
  if (!modulus || !exponent || !signature) return accepted;
  const bool expected = !modulus->empty() && !exponent->empty() && !signature->empty() &&
                        fuzz::verifyRsa(*modulus, *exponent, digest,
                                        fuzz::cString(three[0] + "." + three[1]), *signature);
  fuzz::require(accepted == expected, "OpenSSL says otherwise");
  return accepted;
}
