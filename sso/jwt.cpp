// The key is built from its modulus and exponent with the RSA calls that OpenSSL 3 deprecates.
#define OPENSSL_API_COMPAT 0x10100000L

#include "sso/jwt.h"

#include <openssl/bio.h>
#include <openssl/bn.h>
#include <openssl/evp.h>
#include <openssl/hmac.h>
#include <openssl/rsa.h>
#include <syslog.h>

#include <algorithm>
#include <climits>
#include <cstring>
#include <utility>

#include "sso/internal/json.h"
#include "sso/internal/owned.h"
#include "sso/internal/split.h"

namespace QOVA {
namespace JWT {

namespace {

using SSO::CText;
using SSO::Releaser;

constexpr char kUnit[] = "jwt.cpp";

using BigNumber = std::unique_ptr<BIGNUM, Releaser<BN_free>>;
using BioChain = std::unique_ptr<BIO, Releaser<BIO_free_all>>;
using DigestContext = std::unique_ptr<EVP_MD_CTX, Releaser<EVP_MD_CTX_free>>;
using PublicKey = std::unique_ptr<EVP_PKEY, Releaser<EVP_PKEY_free>>;
using RSAKey = std::unique_ptr<RSA, Releaser<RSA_free>>;

// A base64 filter in front of `memory`, which the chain takes over; null if either is missing.
BioChain Base64Filter(BIO* memory) {
  BioChain chain(memory);
  if (chain == nullptr) return nullptr;
  BIO* const filter = BIO_new(BIO_f_base64());
  if (filter == nullptr) return nullptr;
  BIO_set_flags(filter, BIO_FLAGS_BASE64_NO_NL);
  return BioChain(BIO_push(filter, chain.release()));
}

// The text in the alphabet of standard base64, padded to whole groups of four. A text of 4k + 1
// characters gets three pads; it encodes nothing and must not decode.
std::string StandardBase64(const char* text, size_t length) {
  std::string copy(length + (4 - length % 4) % 4, '=');
  std::transform(text, text + length, copy.begin(), [](char c) {
    return c == '-' ? '+' : c == '_' ? '/' : c;
  });
  return copy;
}

// OpenSSL counts in int: a longer text, with its pads, counts as undecodable.
constexpr size_t kLongestText = INT_MAX - 3;

// Decodes base64url text (RFC 4648, section 5), padded or not. Returns a zero-terminated buffer of
// malloc, its decoded length (0 or less for what is not base64) in `*length`; or null for an empty
// text and when out of memory.
char* Base64UrlDecode(const char* text, int* length) {
  const size_t text_length = strlen(text);
  if (text_length > kLongestText) {
    *length = 0;
    return static_cast<char*>(std::calloc(1, 1));
  }
  const std::string copy = StandardBase64(text, text_length);
  const BioChain chain = Base64Filter(BIO_new_mem_buf(copy.data(), static_cast<int>(copy.size())));
  if (chain == nullptr) return nullptr;

  const int pending = static_cast<int>(BIO_pending(chain.get()));
  if (pending <= 0) return nullptr;
  char* const buffer = static_cast<char*>(std::malloc(static_cast<size_t>(pending) + 1));
  if (buffer == nullptr) return nullptr;

  // OpenSSL's filter would read a byte out of one character and three pads.
  const bool decodable = text_length % 4 != 1;
  *length = decodable ? BIO_read(chain.get(), buffer, pending) : 0;
  buffer[std::max(*length, 0)] = '\0';
  return buffer;
}

// The bytes that a base64url text encodes.
class Bytes {
 public:
  explicit Bytes(const std::string& text) { buffer.reset(Base64UrlDecode(text.c_str(), &length)); }

  bool missing() const { return buffer == nullptr; }
  const unsigned char* data() const { return reinterpret_cast<unsigned char*>(buffer.get()); }
  int size() const { return std::max(length, 0); }

 private:
  CText buffer;
  int length = 0;
};

// Decodes a segment and parses it, up to its first zero byte.
Json::Value ParseSegment(const std::string& segment, const char* failure) {
  const Bytes bytes(segment);
  if (bytes.missing()) throw std::logic_error("basic_string: construction from null is not valid");
  const char* const text = reinterpret_cast<const char*>(bytes.data());
  Json::Value value;
  if (!SSO::ParseJson(text, text + strlen(text), value)) throw std::invalid_argument(failure);
  return value;
}

// The text that was signed: the two segments as they are in the token, up to a zero byte.
std::string SigningInput(const std::string& header, const std::string& body) {
  std::string input = header + '.' + body;
  input.resize(strlen(input.c_str()));
  return input;
}

// An RSA key that owns both numbers; null if it cannot be made.
RSAKey MakeRSAKey(const Bytes& modulus, const Bytes& exponent) {
  BigNumber n(BN_bin2bn(modulus.data(), modulus.size(), nullptr));
  BigNumber e(BN_bin2bn(exponent.data(), exponent.size(), nullptr));
  if (n == nullptr || e == nullptr) return nullptr;
  RSAKey key(RSA_new());
  if (key == nullptr || RSA_set0_key(key.get(), n.get(), e.get(), nullptr) != 1) return nullptr;
  (void)n.release();  // the key's now
  (void)e.release();
  return key;
}

PublicKey MakePublicKey(RSAKey rsa) {
  PublicKey key(EVP_PKEY_new());
  if (key == nullptr) return nullptr;
  if (EVP_PKEY_assign(key.get(), EVP_PKEY_RSA, rsa.get()) != 1) {
    syslog(LOG_ERR, "%s:%d EVP_PKEY_assign_RSA failed", kUnit, __LINE__);
    return nullptr;
  }
  (void)rsa.release();  // the key's now
  if (EVP_PKEY_id(key.get()) != EVP_PKEY_RSA) {
    syslog(LOG_ERR, "%s:%d check key type failed", kUnit, __LINE__);
    return nullptr;
  }
  return key;
}

bool VerifyDigest(const std::string& input, const Bytes& signature, EVP_PKEY* key,
                  const EVP_MD* md) {
  const DigestContext context(EVP_MD_CTX_new());
  if (context == nullptr) return false;
  if (EVP_DigestVerifyInit(context.get(), nullptr, md, nullptr, key) != 1) {
    syslog(LOG_ERR, "%s:%d EVP_DigestVerifyInit failed", kUnit, __LINE__);
    return false;
  }
  if (EVP_DigestUpdate(context.get(), input.data(), input.size()) != 1) {
    syslog(LOG_ERR, "%s:%d EVP_DigestVerifyUpdate failed", kUnit, __LINE__);
    return false;
  }
  if (EVP_DigestVerifyFinal(context.get(), signature.data(),
                            static_cast<size_t>(signature.size())) != 1) {
    syslog(LOG_ERR, "%s:%d EVP_DigestVerifyFinal failed", kUnit, __LINE__);
    return false;
  }
  return true;
}

bool VerifyRSA(const std::string& input, const std::string& n, const std::string& e,
               const std::string& signature, const EVP_MD* md) {
  const Bytes modulus(n);
  const Bytes exponent(e);
  const Bytes expected(signature);
  if (modulus.missing() || exponent.missing() || expected.missing()) return false;
  RSAKey rsa = MakeRSAKey(modulus, exponent);
  if (rsa == nullptr) return false;
  const PublicKey key = MakePublicKey(std::move(rsa));
  return key != nullptr && VerifyDigest(input, expected, key.get(), md);
}

// Encodes bytes as base64url text without padding. False if that fails.
bool Base64UrlEncode(const unsigned char* bytes, unsigned count, std::string& text) {
  BIO* const memory = BIO_new(BIO_s_mem());
  const BioChain chain = Base64Filter(memory);
  if (chain == nullptr) return false;
  if (BIO_write(chain.get(), bytes, static_cast<int>(count)) <= 0) return false;
  if (BIO_flush(chain.get()) != 1) return false;
  const int pending = static_cast<int>(BIO_pending(memory));
  if (pending < 0) return false;
  text.resize(static_cast<size_t>(pending) + 1);
  text.resize(static_cast<size_t>(std::max(BIO_read(memory, &text[0], pending), 0)));

  std::replace(text.begin(), text.end(), '/', '_');
  std::replace(text.begin(), text.end(), '+', '-');
  text.erase(std::remove(text.begin(), text.end(), '='), text.end());
  return true;
}

bool VerifyHMAC(const std::string& input, const std::string& key_text, const std::string& signature,
                const EVP_MD* md) {
  const Bytes key(key_text);
  // A text that decodes to nothing must not pass as the empty key.
  if (key.missing() || key.size() == 0) return false;

  unsigned char mac[EVP_MAX_MD_SIZE];
  unsigned count = 0;
  if (HMAC(md, key.data(), key.size(), reinterpret_cast<const unsigned char*>(input.data()),
           input.size(), mac, &count) == nullptr) {
    return false;
  }
  std::string expected;
  return Base64UrlEncode(mac, count, expected) && strcmp(expected.c_str(), signature.c_str()) == 0;
}

}  // namespace

Jwt::Jwt(std::string token) {
  SSO::Pieces<3> segments;
  if (!SSO::Split(token, '.', segments)) throw std::invalid_argument("bad jwt format!");
  header = segments[0];
  signature = segments[2];
  // The body, by far the largest, stays in the token's own memory.
  const size_t size = segments[1].size();
  token.erase(0, header.size() + 1);
  token.resize(size);
  body = std::move(token);
}

Json::Value Jwt::GetHeader() {
  return ParseSegment(header, "bad jwt header format!");
}

Json::Value Jwt::GetBody() {
  return ParseSegment(body, "bad jwt body format!");
}

std::string Jwt::GetSignature() {
  return signature;
}

void Jwt::JwtRSAVerify(std::string& n, std::string& e, const EVP_MD* md) {
  if (!VerifyRSA(SigningInput(header, body), n, e, signature, md)) {
    throw jwt_verify_failed("verify rsa signature failed");
  }
}

void Jwt::JwtHMACVerify(std::string& key, const EVP_MD* md) {
  if (!VerifyHMAC(SigningInput(header, body), key, signature, md)) {
    throw jwt_verify_failed("verify hmac signature failed");
  }
}

}  // namespace JWT
}  // namespace QOVA
