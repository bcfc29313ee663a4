// One line's process: what it reports, and how it ends.
#pragma once

#include <string>

#include "contract.h"

namespace port {

enum class Verdict { kKept, kBroken, kNotJudged };

struct Outcome {
  Verdict verdict;
  std::string detail;  // what was seen; empty for a line that is kept
};

// Runs a line in a process that ends after `options.seconds`.
Outcome Try(const Line& line, const Options& options);

// Asks in another process whether the file can be loaded and has the four functions. kNotJudged:
// it cannot be loaded at all.
Outcome TryToLoad(const Options& options);

// For the checks themselves; none of them returns to the check, but Expect if `kept`.
[[noreturn]] void Broken(const std::string& detail);
[[noreturn]] void NotJudged(const std::string& detail);
void Expect(bool kept, const std::string& detail);

// Notes what is called next: a crash or a time-out is reported with it.
void About(const std::string& call);

// A text for a message: in quotes, cut if long, bytes outside ASCII as \xNN.
std::string Shown(const std::string& text);

}  // namespace port
