// Segments of 2 GiB and more, which OpenSSL's int lengths cannot hold. They take little memory: the
// pages of a large allocation are one file of 2 MiB, mapped again and again. So a text must be the
// same letter throughout, but for its ends.
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <new>
#include <stdexcept>
#include <string>

#include "sso/jwt.h"
#include "support/throws.h"

namespace {

constexpr std::size_t kGiB = std::size_t{1} << 30;
constexpr std::size_t kPiece = std::size_t{2} << 20;
constexpr std::size_t kEnd = std::size_t{128} << 10;  // whole pages of every target

struct Mapping {
  char* memory;
  std::size_t size;
};
Mapping mappings[4];  // a map would allocate

char* mapAt(char* where, std::size_t size, int flags, int file) {
  void* const memory = mmap(where, size, PROT_READ | PROT_WRITE, flags, file, 0);
  if (memory == MAP_FAILED) throw std::bad_alloc();
  return static_cast<char*>(memory);
}

char* mapLarge(std::size_t wanted) {
  const std::size_t size = (wanted + kPiece - 1) / kPiece * kPiece + kPiece;
  static const int file = memfd_create("pages", 0);
  if (file < 0 || ftruncate(file, kPiece) != 0) throw std::bad_alloc();
  Mapping* const free_one =
      std::find_if(std::begin(mappings), std::end(mappings),
                   [](const Mapping& each) { return each.memory == nullptr; });
  if (free_one == std::end(mappings)) throw std::bad_alloc();
  constexpr int kPrivate = MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE;
  char* const memory = mapAt(nullptr, size, kPrivate, -1);
  for (std::size_t at = 0; at < size; at += kPiece) {
    mapAt(memory + at, kPiece, MAP_SHARED | MAP_FIXED, file);
  }
  mapAt(memory, kEnd, kPrivate | MAP_FIXED, -1);
  mapAt(memory + wanted / kEnd * kEnd - kEnd, 2 * kEnd, kPrivate | MAP_FIXED, -1);
  *free_one = {memory, size};
  return memory;
}

// A token with `body` As between its dots, the first few of them replaced by `start`.
std::string tokenOf(std::size_t body, const std::string& start) {
  std::string token(body + 4, 'A');
  token[1] = token[token.size() - 2] = '.';
  token.replace(2, start.size(), start);
  return token;
}

}  // namespace

void* operator new(std::size_t size) {
  void* const memory = size >= kGiB ? mapLarge(size) : std::malloc(size);
  if (memory == nullptr) throw std::bad_alloc();
  return memory;
}

void operator delete(void* memory) noexcept {
  for (Mapping& each : mappings) {
    if (memory == nullptr || each.memory != memory) continue;
    munmap(each.memory, each.size);
    each.memory = nullptr;
    return;
  }
  std::free(memory);
}
void operator delete(void* memory, std::size_t) noexcept {
  operator delete(memory);
}

namespace {

// "e30A" is {} and a zero byte: what is in front of the As would be a JSON text.
TEST(JwtSize, ASegmentThatAnIntCannotCountIsUndecodable) {
  for (const std::size_t size : {2 * kGiB, 4 * kGiB + 8}) {
    QOVA::JWT::Jwt jwt(tokenOf(size, "e30A"));
    EXPECT_TRUE(test::throws<std::invalid_argument>("bad jwt body format!", [&] { jwt.GetBody(); }))
        << size;
  }
}

}  // namespace
