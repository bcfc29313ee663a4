// Marks the work of the test support inside calls of the library, so that a failure that a test
// arranges for the library does not hit the support instead.
#pragma once

namespace test {

inline int support_calls = 0;

class SupportCall {
 public:
  SupportCall() { ++support_calls; }
  ~SupportCall() { --support_calls; }
  SupportCall(const SupportCall&) = delete;
  SupportCall& operator=(const SupportCall&) = delete;
};

}  // namespace test
