#include "seal.h"

#include <stdexcept>

#include "identity.h"
#include "random.h"
#include "store.h"

namespace {

constexpr size_t kKeySize = 32;
constexpr size_t kBlock = 64;
static_assert(kKeySize <= kBlock);

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
  // RFC 2104, for a key that is shorter than a block.
  std::string inner(kBlock, '\x36');
  std::string outer(kBlock, '\x5c');
  for (size_t i = 0; i < key.size(); ++i) {
    inner[i] = static_cast<char>(inner[i] ^ key[i]);
    outer[i] = static_cast<char>(outer[i] ^ key[i]);
  }
  return Digest(outer + DigestBytes(inner + text));
}
