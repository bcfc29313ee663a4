// Key and token: the library's HMAC check against OpenSSL's one-shot call.
// Parts: a digest ("SHA384"), key text, token; "!" as the last segment means the right MAC.
#include <openssl/evp.h>

#include "sso/jwt.h"
#include "support/independent.h"
#include "support/target.h"

FUZZ_TARGET(hmac_signature) {
  const auto part = fuzz::parts(input, 3);
  const auto three = fuzz::segments(part[2]);
  const std::string digest = part[0] == "SHA384" || part[0] == "SHA512" ? part[0] : "SHA256";
  if (three.empty()) return false;

  const std::string data = three[0] + "." + three[1];
  const auto key = fuzz::strictBase64url(fuzz::cString(part[1]));
  const bool usable = key && !key->empty();
  const std::string right =
      usable ? fuzz::base64url(fuzz::hmac(*key, fuzz::cString(data), digest)) : "";
  const std::string signature = three[2] == "!" ? right : three[2];

  std::string text = part[1];
  const bool accepted =
      fuzz::returns({{typeid(QOVA::JWT::jwt_verify_failed), "verify hmac signature failed"}}, [&] {
        QOVA::JWT::Jwt(data + "." + signature)
            .JwtHMACVerify(text, EVP_get_digestbyname(digest.c_str()));
      });
  fuzz::require(text == part[1], "the key was changed");
  if (!key) return accepted;
  fuzz::require(accepted == (usable && fuzz::cString(signature) == right),
                "OpenSSL says otherwise");
  return accepted;
}
