#include "support/clock.h"

#include <dlfcn.h>

#include "support/faults.h"

namespace {

bool stopped = false;
std::time_t stopped_at = 0;

}  // namespace

namespace test {

Clock::Clock(std::time_t now) {
  stopped = true;
  stopped_at = now;
}

Clock::~Clock() {
  stopped = false;
}

}  // namespace test

// On a 32-bit target with a clock of 64 bits the compiler gives this another name.
extern "C" std::time_t time(std::time_t* result) noexcept {
  constexpr const char* kName = sizeof(std::time_t) > sizeof(long) ? "__time64" : "time";
  static auto* const next =
      reinterpret_cast<std::time_t (*)(std::time_t*)>(dlsym(RTLD_NEXT, kName));
  const bool mine = stopped && test::isFromLibrary(__builtin_return_address(0));
  const std::time_t now = mine ? stopped_at : next(nullptr);
  if (result != nullptr) *result = now;
  return now;
}
