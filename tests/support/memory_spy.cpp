#include "support/memory_spy.h"

#include <dlfcn.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <new>

#include "support/support_call.h"

namespace {

std::size_t untilNew = 0;
bool failed = false;

struct Watch {
  const void* memory;
  int deletions;
};
Watch watches[2];

void release(void* memory) {
  for (Watch& each : watches) {
    if (memory != nullptr && each.memory == memory) ++each.deletions;
  }
  std::free(memory);
}

std::size_t failingBytes = 0;
std::size_t failures = 0;

void* allocate(std::size_t size) {
  if (test::support_calls == 0 && untilNew > 0 && --untilNew == 0) {
    failed = true;
    return nullptr;
  }
  return std::malloc(size == 0 ? 1 : size);
}

void* allocateOrThrow(std::size_t size) {
  void* const memory = allocate(size);
  if (memory == nullptr) throw std::bad_alloc();
  return memory;
}

}  // namespace

// The whole family, so that what one gives out another can take back.
void* operator new(std::size_t size) {
  return allocateOrThrow(size);
}
void* operator new[](std::size_t size) {
  return allocateOrThrow(size);
}
void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
  return allocate(size);
}
void* operator new[](std::size_t size, const std::nothrow_t&) noexcept {
  return allocate(size);
}
void operator delete(void* memory) noexcept {
  release(memory);
}
void operator delete[](void* memory) noexcept {
  release(memory);
}
void operator delete(void* memory, std::size_t) noexcept {
  release(memory);
}
void operator delete[](void* memory, std::size_t) noexcept {
  release(memory);
}
void operator delete(void* memory, const std::nothrow_t&) noexcept {
  release(memory);
}
void operator delete[](void* memory, const std::nothrow_t&) noexcept {
  release(memory);
}

// Zero-filled memory from malloc: asking the dynamic linker for the real calloc would end up here
// again, since it allocates itself.
extern "C" __attribute__((visibility("default"))) void* calloc(std::size_t count,
                                                               std::size_t size) noexcept {
  if (failingBytes != 0 && count * size == failingBytes) {
    ++failures;
    errno = ENOMEM;
    return nullptr;
  }
  if (size != 0 && count > static_cast<std::size_t>(-1) / size) {
    errno = ENOMEM;
    return nullptr;
  }
  void* const memory = std::malloc(count * size);
  // A volatile pointer keeps the compiler from turning the two calls into one of calloc.
  void* volatile filled = memory;
  if (memory != nullptr) std::memset(filled, 0, count * size);
  return memory;
}

namespace test {

Watched::Watched(const void* memory) : slot(watches[0].memory == nullptr ? 0 : 1) {
  watches[slot] = {memory, 0};
}
Watched::~Watched() {
  watches[slot] = {nullptr, 0};
}
int Watched::deletions() const {
  return watches[slot].deletions;
}

void failNew(std::size_t nth) {
  untilNew = nth;
  failed = false;
}

bool newFailed() {
  return failed;
}

FailingCalloc::FailingCalloc(std::size_t bytes) {
  failingBytes = bytes;
  failures = 0;
}

FailingCalloc::~FailingCalloc() {
  failingBytes = 0;
}

std::size_t FailingCalloc::times() const {
  return failures;
}

}  // namespace test
