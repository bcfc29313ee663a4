// Functions of OpenSSL that fail when a test says so. They are defined in the test program,
// where the library's calls find them first.
#pragma once

#include <string>

namespace test {

// While it lives, the `nth` call that the library itself makes to `function` fails; calls from
// elsewhere, libcrypto's own included, go through. One at a time. `function` is one of those in
// faults.cpp, or one that the test program defines itself with the help of failsNow().
class Fault {
 public:
  explicit Fault(const char* function, int nth = 1);
  ~Fault();
  Fault(const Fault&) = delete;
  Fault& operator=(const Fault&) = delete;

  bool wasHit() const;  // whether that call was made
};

// Whether a call that returns to the address `caller` comes from the library under test.
bool isFromLibrary(const void* caller);

// Whether this call, which returns to the address `caller`, is the one to fail.
bool failsNow(const char* function, const void* caller);

}  // namespace test
