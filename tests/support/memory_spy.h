// Lets an allocation fail, and sees memory given back. Link support/memory_spy.cpp into the test
// program that needs it.
#pragma once

#include <gtest/gtest.h>

#include <cstddef>
#include <new>

namespace test {

// From now on the nth operator new (counted from 1) throws std::bad_alloc, once; 0: none.
void failNew(std::size_t nth);
// Whether it has come to that since.
bool newFailed();

// Calls `operation` with the first, the second, ... operator new failing, until none does. Each
// must come out as std::bad_alloc. Returns how many there were.
template <typename Operation>
int failEachNew(const Operation& operation) {
  for (int nth = 1; nth < 100000; ++nth) {
    bool thrown = false;
    failNew(static_cast<std::size_t>(nth));
    try {
      operation();
    } catch (const std::bad_alloc&) {
      thrown = true;
    }
    const bool failed = newFailed();
    failNew(0);
    if (!failed) return nth - 1;
    EXPECT_TRUE(thrown) << "operator new " << nth;
  }
  return -1;
}

// While it lives, counts how often operator delete is given this memory. One at a time, or two.
class Watched {
 public:
  explicit Watched(const void* memory);
  ~Watched();
  Watched(const Watched&) = delete;
  Watched& operator=(const Watched&) = delete;

  int deletions() const;

 private:
  int slot;
};

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
