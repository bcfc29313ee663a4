// The clock as the library reads it.
#pragma once

#include <ctime>

namespace test {

// While it lives, time() is `now` for the library, and for nobody else.
class Clock {
 public:
  explicit Clock(std::time_t now);
  ~Clock();
  Clock(const Clock&) = delete;
  Clock& operator=(const Clock&) = delete;
};

}  // namespace test
