#include "seal.h"

#include <openssl/crypto.h>
#include <openssl/evp.h>

#include <stdexcept>

#include "random.h"

std::string Digest(const std::string& text) {
  std::string digest(EVP_MAX_MD_SIZE, '\0');
  unsigned size = 0;
  if (EVP_Digest(text.data(), text.size(), reinterpret_cast<unsigned char*>(&digest[0]), &size,
                 EVP_sha256(), nullptr) != 1) {
    throw std::runtime_error("no digest");
  }
  digest.resize(size);
  return Hex(digest);
}

bool SameText(const std::string& a, const std::string& b) {
  return a.size() == b.size() && CRYPTO_memcmp(a.data(), b.data(), a.size()) == 0;
}
