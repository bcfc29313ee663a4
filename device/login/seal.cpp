#include "seal.h"

#include <openssl/evp.h>
#include <openssl/hmac.h>

#include <stdexcept>

#include "identity.h"
#include "random.h"
#include "store.h"

namespace {

constexpr size_t kKeySize = 32;

// Whoever is first makes the key. The lock keeps others from reading a part of it.
std::string Key() {
  const AsRoot root;
  const store::File file(store::Folder("", 0755) + "key", store::File::Wait::kYes);
  std::string key(kKeySize, '\0');
  if (file.Read(&key[0], key.size(), 0)) return key;
  key = RandomBytes(kKeySize);
  if (!file.Write(key.data(), key.size(), 0)) throw std::runtime_error("cannot write the key");
  return key;
}

}  // namespace

std::string Seal(const std::string& text) {
  static const std::string key = Key();
  std::string seal(EVP_MAX_MD_SIZE, '\0');
  unsigned size = 0;
  if (HMAC(EVP_sha256(), key.data(), static_cast<int>(key.size()),
           reinterpret_cast<const unsigned char*>(text.data()), text.size(),
           reinterpret_cast<unsigned char*>(&seal[0]), &size) == nullptr) {
    throw std::runtime_error("no seal");
  }
  seal.resize(size);
  return Hex(seal);
}
