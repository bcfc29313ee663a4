#include "random.h"

#include <fcntl.h>
#include <sys/random.h>
#include <unistd.h>

#include <stdexcept>

namespace {

// For kernels without getrandom, and filters of system calls that do not let it pass.
bool ReadDevice(std::string& bytes) {
  const int file = open("/dev/urandom", O_RDONLY | O_CLOEXEC);
  if (file < 0) return false;
  const ssize_t size = read(file, &bytes[0], bytes.size());
  close(file);
  return size == static_cast<ssize_t>(bytes.size());
}

}  // namespace

std::string RandomBytes(size_t size) {
  std::string bytes(size, '\0');
  if (getrandom(&bytes[0], size, 0) == static_cast<ssize_t>(size)) return bytes;
  if (!ReadDevice(bytes)) throw std::runtime_error("no random bytes");
  return bytes;
}

std::string Hex(const std::string& bytes) {
  std::string text;
  for (const char byte : bytes) {
    text += "0123456789abcdef"[static_cast<unsigned char>(byte) >> 4];
    text += "0123456789abcdef"[static_cast<unsigned char>(byte) & 15];
  }
  return text;
}

std::string Reference() {
  constexpr char kAlphabet[] = "23456789ABCDEFGHJKMNPQRSTVWXYZ";
  std::string text;
  for (const char byte : RandomBytes(8)) {
    text += kAlphabet[static_cast<unsigned char>(byte) % (sizeof kAlphabet - 1)];
  }
  return text;
}
