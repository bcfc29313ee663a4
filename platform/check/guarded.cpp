#include "guarded.h"

#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <new>
#include <vector>

#include "trial.h"

namespace port {

namespace {

constexpr size_t kFront = 64;

// Those that exist, for Place.
std::vector<const Guarded*> all;

char* Map(size_t length) {
  void* memory = mmap(nullptr, length, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  if (memory == MAP_FAILED) throw std::bad_alloc();
  return static_cast<char*>(memory);
}

}  // namespace

Guarded::Guarded(const char* name, size_t limit)
    : what(name),
      page(static_cast<size_t>(sysconf(_SC_PAGESIZE))),
      length((limit + kFront + page - 1) / page * page),
      memory(Map(length + page)),
      room(memory + length) {
  mprotect(memory + length, page, PROT_NONE);
  all.push_back(this);
}

Guarded::~Guarded() {
  all.erase(std::find(all.begin(), all.end(), this));
  munmap(memory, length + page);
}

void Guarded::Protect(int rights) {
  const bool to_write = (rights & PROT_WRITE) != 0;
  if (to_write && writable) return;
  mprotect(memory, length, rights);
  writable = to_write;
}

char* Guarded::Room(size_t size, size_t slack) {
  Protect(PROT_READ | PROT_WRITE);
  given = size;
  room = memory + length - slack - size;
  memset(room - kFront, kUntouched, kFront + size + slack);
  return room;
}

const char* Guarded::Copy(const std::string& bytes, size_t slack) {
  Room(bytes.size(), slack);
  memcpy(room, bytes.data(), bytes.size());
  memset(room + bytes.size(), 0, slack);
  Protect(PROT_READ);
  return room;
}

void Guarded::CheckFront() const {
  for (size_t i = 1; i <= kFront; ++i) {
    if (room[-static_cast<ptrdiff_t>(i)] == kUntouched) continue;
    Broken("wrote " + std::to_string(i) + " bytes in front of " + what);
  }
}

void Guarded::Lock() {
  Protect(PROT_NONE);
}

std::string Guarded::Place(const void* address) {
  const char* at = static_cast<const char*>(address);
  for (const Guarded* one : all) {
    const char* end = one->room + one->given;
    if (at < one->memory || at >= one->memory + one->length + one->page) continue;
    if (at >= end) {
      return "touched byte " + std::to_string(at - end + 1) + " behind the end of " + one->what +
             " (" + std::to_string(one->given) + " bytes)";
    }
    return "wrote to " + std::string(one->what) + ", or touched it after the call";
  }
  return "";
}

}  // namespace port
