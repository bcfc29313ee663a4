// What all four functions promise alike: about the process, about memory, and about calls that
// follow each other.
#pragma once

#include <string>
#include <vector>

#include "contract.h"
#include "guarded.h"

namespace port {

// Memory for the arguments of a call.
struct Arguments {
  Guarded in{"the input", 4096};
  Guarded out{"the output", 4096};
};

// The outcome of one call, for comparisons.
struct Result {
  bool ok;
  std::string bytes;
};

// Makes call number `which` of a function's typical ones, 0 to kCalls - 1; some of them fail.
using Call = Result (*)(const Platform& platform, const Options& options, Arguments& memory,
                        unsigned which);
constexpr unsigned kCalls = 8;

void CheckRepeat(Call call, const Platform& platform, const Options& options);
void CheckPointers(Call call, const Platform& platform, const Options& options);
void CheckProcess(Call call, const Platform& platform, const Options& options);
void CheckMemory(Call call, const Platform& platform, const Options& options);

// Appends the four lines about one function; their ids are given.
template <Call call>
void AddHabits(const char* const (&ids)[4], std::vector<Line>& lines) {
  lines.push_back({ids[0], "the result does not depend on earlier calls, nor on errno",
                   [](const Platform& p, const Options& o) { CheckRepeat(call, p, o); }});
  lines.push_back({ids[1], "keeps no pointer that it was given",
                   [](const Platform& p, const Options& o) { CheckPointers(call, p, o); }});
  lines.push_back({ids[2], "leaves the process as it is and prints nothing",
                   [](const Platform& p, const Options& o) { CheckProcess(call, p, o); }});
  lines.push_back({ids[3], "memory does not grow over 100,000 calls",
                   [](const Platform& p, const Options& o) { CheckMemory(call, p, o); }});
}

}  // namespace port
