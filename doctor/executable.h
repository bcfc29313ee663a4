// A program file: what the kernel makes of it, and what a run of it gives.
#pragma once

#include <string>

#include "doctor/ask.h"

namespace doctor {

struct Executable {
  explicit Executable(const std::string& file);

  bool IsElf() const;
  bool IsScript() const { return head.compare(0, 2, "#!") == 0; }
  bool EndsInCrLf() const;  // its first line
  // The program that the kernel starts for this one: a script's interpreter, or the dynamic
  // loader; empty if there is none.
  std::string Interpreter() const;

  std::string path;
  std::string head;  // its first bytes
};

// Why exec gave `error` for the user, and what to do, as far as it is more than the system's text.
struct Reason {
  std::string cause;
  std::string action;
};
Reason WhyNotStarted(const Executable& program, const Caller& caller, int error);

// Run is the answer of the program to a HEAD request with an unknown action.
struct Run {
  int error = 0;  // errno of exec
  Output output;

  bool IsCgi() const;  // header lines, and the blank line behind them
  std::string Header(const std::string& name) const;
  // The first line on standard error, as it may be shown.
  std::string FirstError() const;
};
Run RunProgram(const std::string& path, const Caller& caller, int seconds);

}  // namespace doctor
