// Marks the work of the test support inside calls of the library, so that a failure that a test
// arranges for the library does not hit the support instead.
#pragma once

namespace test {

inline int busy = 0;

class Busy {
 public:
  Busy() { ++busy; }
  ~Busy() { --busy; }
  Busy(const Busy&) = delete;
  Busy& operator=(const Busy&) = delete;
};

}  // namespace test
