// The library's lines in the system log: which there are, and which one a failure calls for.
#pragma once

#include <string>
#include <vector>

#include "support/log.h"

namespace faults {

// "FILE:<digits> MESSAGE" at that priority. In the message "%m" represents the text of errno when
// it was written, and "%t" for any one text that libcurl has for an error.
struct Line {
  int priority;
  const char* file;
  const char* message;
};

bool is(const test::LogLine& written, const Line& line);

// Whether it is one that the library writes at all.
bool isOwn(const test::LogLine& written);

// When that function fails, one of these must be there; none if it may be silent. `all`: and
// everything after it.
std::vector<Line> calledFor(const std::string& function, bool all);

}  // namespace faults
