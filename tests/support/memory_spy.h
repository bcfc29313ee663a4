// Lets an allocation fail. Link support/memory_spy.cpp into the test program that needs it.
#pragma once

#include <cstddef>

namespace test {

// From now on the nth operator new (counted from 1) throws std::bad_alloc, once; 0: none.
void failNew(std::size_t nth);
// Whether it has come to that since.
bool newFailed();

// While it lives, calloc of exactly so many bytes (count times size) gives null, errno ENOMEM.
class FailingCalloc {
 public:
  explicit FailingCalloc(std::size_t bytes);
  ~FailingCalloc();
  FailingCalloc(const FailingCalloc&) = delete;
  FailingCalloc& operator=(const FailingCalloc&) = delete;

  std::size_t times() const;  // so often it gave null
};

}  // namespace test
