// A fuzz target: a function that gives one input to one entry point of the library and checks what
// comes out. The same function serves the fuzzer (fuzzer.cpp) and the replay of the seeds
// (replay.cpp).
#pragma once

#include <exception>
#include <string>
#include <typeinfo>
#include <vector>

namespace fuzz {

// Runs one input. True if the entry point let it through: the input was read, verified, answered.
// An answer that must not be ends the program by require().
using Run = bool (*)(const std::string& input);

struct Target {
  const char* name;
  Run run;
};

std::vector<Target>& targets();

// Runs one input of a target in a fresh environment, and checks that nothing was left behind.
bool runOne(const Target& target, const std::string& input);

// Ends the program, as a crash, unless `good`.
void require(bool good, const char* what);

// Inputs of several parts hold them one after the other, with "\n%%\n" between them. Parts that
// are not there are empty; the last part takes all that is left.
std::vector<std::string> parts(const std::string& input, std::size_t count);

// Whether `call` returns; if not, it throws one of the standard exceptions that `expected` names
// by type and message ("" is any message), or the program ends.
struct Thrown {
  const std::type_info& type;
  std::string message;
};
void requireOneOf(const std::exception& thrown, const std::vector<Thrown>& expected);
template <typename Call>
bool returns(const std::vector<Thrown>& expected, const Call& call) {
  try {
    call();
    return true;
  } catch (const std::exception& e) {
    requireOneOf(e, expected);
  }
  return false;
}

}  // namespace fuzz

// FUZZ_TARGET(NAME) { ... return true or false ... }, with the input as `input`.
#define FUZZ_TARGET(NAME)                           \
  static bool run_##NAME(const std::string& input); \
  static const bool added_##NAME = [] {             \
    fuzz::targets().push_back({#NAME, run_##NAME}); \
    return true;                                    \
  }();                                              \
  static bool run_##NAME(const std::string& input)
