// OpenSSL's newer functions load their providers first, which takes a millisecond at each request.
#define OPENSSL_API_COMPAT 0x10100000L

#include <openssl/crypto.h>
#include <openssl/sha.h>

#include "random.h"
#include "seal.h"

std::string DigestBytes(const std::string& text) {
  SHA256_CTX context;
  std::string digest(SHA256_DIGEST_LENGTH, '\0');
  SHA256_Init(&context);
  SHA256_Update(&context, text.data(), text.size());
  SHA256_Final(reinterpret_cast<unsigned char*>(&digest[0]), &context);
  return digest;
}

std::string Digest(const std::string& text) {
  return Hex(DigestBytes(text));
}

bool SameText(const std::string& a, const std::string& b) {
  return a.size() == b.size() && CRYPTO_memcmp(a.data(), b.data(), a.size()) == 0;
}
