// What a call throws: the exact type, not one derived from it, and the exact message.
#pragma once

#include <gtest/gtest.h>

#include <exception>
#include <string>
#include <typeinfo>

namespace test {

// Use as EXPECT_TRUE(throws<std::invalid_argument>("message", [&] { call(); })).
template <typename Error, typename Call>
testing::AssertionResult throws(const std::string& message, const Call& call) {
  try {
    call();
  } catch (const std::exception& e) {
    if (typeid(e) == typeid(Error) && e.what() == message) return testing::AssertionSuccess();
    return testing::AssertionFailure() << "threw " << typeid(e).name() << " \"" << e.what()
                                       << "\" instead of \"" << message << '"';
  }
  return testing::AssertionFailure() << "threw nothing instead of \"" << message << '"';
}

// The same for an exception whose message is not the library's own.
template <typename Error, typename Call>
testing::AssertionResult throws(const Call& call) {
  try {
    call();
  } catch (const std::exception& e) {
    if (typeid(e) == typeid(Error)) return testing::AssertionSuccess();
    return testing::AssertionFailure() << "threw " << typeid(e).name() << ": " << e.what();
  }
  return testing::AssertionFailure() << "threw nothing";
}

}  // namespace test
