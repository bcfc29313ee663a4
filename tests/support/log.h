// The system log as the library wrote it: syslog and its relatives are defined here, in the
// test program, and record instead of sending.
#pragma once

#include <gtest/gtest.h>
#include <syslog.h>

#include <string>
#include <vector>

namespace test {

struct LogLine {
  int priority;      // as given, facility included
  std::string text;  // with %m filled in
  int error;         // errno at the call
};

// What a line is expected to be: "FILE:<digits> MESSAGE" at that priority.
struct Expected {
  int priority;
  std::string file;
  std::string message;
};

// Records from its construction on; one at a time.
class Log {
 public:
  Log();
  ~Log();
  Log(const Log&) = delete;
  Log& operator=(const Log&) = delete;

  // From now on errno is another one after each line, as the real calls may leave it.
  void spoilErrno();

  const std::vector<LogLine>& lines() const;
  void clear();

  // All lines, in order, and no others. Use as EXPECT_TRUE(log.is({{LOG_ERR, "sso.cpp", "..."}})).
  testing::AssertionResult is(const std::vector<Expected>& expected) const;
  testing::AssertionResult isEmpty() const { return is({}); }
};

}  // namespace test
