// Asking the library: a question runs in a child process with a deadline, under the identity of
// the login program if wanted; what the library logs and throws meanwhile is the answer.
//
// So the doctor shows the library's own words, is not held up by a provider that stays silent,
// and keeps its own identity.
#pragma once

#include <json/value.h>
#include <sys/types.h>

#include <functional>
#include <string>
#include <vector>

#include "doctor/finding.h"

namespace doctor {

// Caller is the identity of a program: real and effective ids, and whether root is saved.
struct Caller {
  std::string name;
  uid_t uid;
  gid_t gid;
  std::vector<gid_t> groups;
  bool saved_root;
};

struct Reply {
  bool ended = false;      // false: no answer before the deadline
  std::vector<Said> said;  // log lines in their order, and last the exception, if there was one
  Json::Value result;      // what the question returned; null after an exception

  // The exception's text; empty if there was none.
  std::string Thrown() const;
  std::string ThrownClass() const;
  bool Threw(const std::string& text) const { return Thrown() == text; }
  // The log lines that report an error.
  std::vector<Said> ErrorLines() const;
};

// Output is what a child process wrote, and how it ended.
struct Output {
  bool ended = false;  // before the deadline
  int status = 0;      // as of waitpid
  std::string out;
  std::string err;
};

// Runs `body` in a child process, with its standard error and the descriptor `out` read, for at
// most `seconds`; what it started is ended with it.
Output Capture(const std::function<void(int out)>& body, int seconds);

// Takes on the identity for good. Throws std::system_error.
void Become(const Caller& caller);

// Runs `question` in a child process, for at most `seconds`, as `caller` (null: as we are).
Reply Ask(const std::function<Json::Value()>& question, int seconds,
          const Caller* caller = nullptr);

}  // namespace doctor
