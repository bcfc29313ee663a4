// JSON Web Tokens made with OpenSSL alone, independent of the library under test.
#pragma once

#include <openssl/evp.h>

#include <memory>
#include <string>

namespace test {

std::string base64(const std::string& bytes);     // RFC 4648, section 4
std::string base64url(const std::string& bytes);  // RFC 4648, section 5, without padding
std::string fromBase64(const std::string& text);  // either alphabet, padded or not
std::string md5(const std::string& text);         // in hexadecimal, lower case

class RsaKey {
 public:
  explicit RsaKey(int bits = 2048);
  explicit RsaKey(std::shared_ptr<EVP_PKEY> pair);

  std::string n() const;  // base64url, as in a JSON Web Key
  std::string e() const;
  // {"kty":"RSA","use":"sig","kid":...,"n":...,"e":...}
  std::string jwk(const std::string& kid) const;
  // RSASSA-PKCS1-v1_5 over `data`; `digest` is "SHA256", "SHA384" or "SHA512".
  std::string sign(const std::string& data, const std::string& digest) const;

 private:
  std::string number(const char* name) const;

  std::shared_ptr<EVP_PKEY> key;
};

// One key of 2048 bits for all tests that do not care which: making one takes a while, so the
// build does it.
const RsaKey& anyRsaKey();

std::string hmac(const std::string& secret, const std::string& data, const std::string& digest);

// "header.body", both encoded; `header` and `body` are any bytes, normally JSON.
std::string signingInput(const std::string& header, const std::string& body);
// Whole tokens. The digest is that of `algorithm` (RS256 to HS512), whatever the header says.
std::string rsaToken(const RsaKey& key, const std::string& header, const std::string& body,
                     const std::string& algorithm = "RS256");
std::string hmacToken(const std::string& secret, const std::string& header, const std::string& body,
                      const std::string& algorithm = "HS256");

}  // namespace test
