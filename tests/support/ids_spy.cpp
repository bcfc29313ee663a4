#include "support/ids_spy.h"

#include <dlfcn.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "support/support_call.h"

namespace {

test::IdsSpy* spy = nullptr;

template <typename Function>
Function next(const char* name) {
  return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

std::string number(unsigned id) {
  return std::to_string(static_cast<int>(id));
}

int change(const char* name, unsigned real, unsigned effective, unsigned saved) {
  const test::SupportCall call;
  if (spy != nullptr) {
    spy->all.push_back(std::string(name) + "(" + number(real) + ", " + number(effective) + ", " +
                       number(saved) + ")");
    spy->changes.push_back(spy->all.back());
    const std::size_t count = spy->changes.size();
    if (count == spy->failing || (spy->allAfter && count > spy->failing)) {
      errno = spy->error;
      return -1;
    }
  }
  const int result = next<int (*)(unsigned, unsigned, unsigned)>(name)(real, effective, saved);
  const int error = errno;
  if (spy != nullptr && spy->afterwards) spy->afterwards(spy->changes.size());
  errno = error;
  return result;
}

unsigned answer(const char* name, std::vector<unsigned>* scripted) {
  const test::SupportCall call;
  if (spy != nullptr) {
    spy->all.push_back(name);
    if (!scripted->empty()) {
      const unsigned id = scripted->front();
      scripted->erase(scripted->begin());
      return id;
    }
  }
  return next<unsigned (*)()>(name)();
}

void noteBuffer(int error, const char* buffer, std::size_t size) {
  const test::SupportCall call;
  if (spy == nullptr) return;
  const bool zero = std::all_of(buffer, buffer + size, [](char c) { return c == 0; });
  spy->buffers.push_back({size, zero, error});
}

}  // namespace

#define SPY extern "C" __attribute__((visibility("default")))

SPY int setresuid(uid_t real, uid_t effective, uid_t saved) noexcept {
  return change("setresuid", real, effective, saved);
}

SPY int setresgid(gid_t real, gid_t effective, gid_t saved) noexcept {
  return change("setresgid", real, effective, saved);
}

SPY uid_t geteuid() noexcept {
  return answer("geteuid", spy == nullptr ? nullptr : &spy->users);
}
SPY gid_t getegid() noexcept {
  return answer("getegid", spy == nullptr ? nullptr : &spy->groups);
}

// Both forms of strerror_r: GNU's, and the one of XSI.
SPY char* strerror_r(int error, char* buffer, std::size_t size) noexcept {
  const char* volatile given = buffer;  // the compiler knows it as written only
  noteBuffer(error, given, size);
  return next<char* (*)(int, char*, std::size_t)>("strerror_r")(error, buffer, size);
}

SPY int __xpg_strerror_r(int error, char* buffer, std::size_t size) noexcept {
  noteBuffer(error, buffer, size);
  return next<int (*)(int, char*, std::size_t)>("__xpg_strerror_r")(error, buffer, size);
}

namespace test {

IdsSpy::IdsSpy() {
  spy = this;
}
IdsSpy::~IdsSpy() {
  spy = nullptr;
}

}  // namespace test
