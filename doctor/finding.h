// What the doctor has to say, as data.
#pragma once

#include <string>
#include <vector>

namespace doctor {

// Said is one thing that the library says or does about a finding; shown with --verbose.
struct Said {
  enum class Kind { kLogs, kThrows, kDoes };

  Kind kind;
  std::string source;  // kLogs: the unit, "sso.cpp"; kThrows: the class; kDoes: nothing
  std::string text;    // the exact text (of a log line: behind "unit:line "); kDoes: our own words

  static Said Does(const std::string& text) { return {Kind::kDoes, "", text}; }
};

// In the order in which a reader wants them.
enum class Grade {
  kFailure,    // a sign-in fails
  kWarning,    // a sign-in works, but something is unsafe or fragile
  kUnchecked,  // could not be checked
  kGood,       // nothing to do
};

// Place is where a finding is to be fixed. All empty: this device.
struct Place {
  std::string file = "";     // or kStandardInput
  std::string key = "";      // of the file, or a claim of the token
  std::string url = "";      // of the request
  std::string address = "";  // the IP address that the request went to
};

constexpr char kStandardInput[] = "standard input";

// Finding is one cause. Text in it that came from outside has passed Shown (redact.h).
struct Finding {
  std::string id;  // stable; for machines and for the manual page
  Grade grade;
  std::string cause;  // what is wrong: one plain sentence without a full stop
  Place place = {};
  std::string action = "";  // one action, with a command where there is one
  std::vector<Said> detail = {};
  // The identifier of an earlier finding of which this is only a consequence. People see it with
  // --verbose alone; it does not count.
  std::string because = "";
};

// Request is one request of the doctor's own.
struct Request {
  std::string what;  // "token endpoint"
  std::string method;
  std::string url;
  std::string address;
  long status;  // HTTP; 0: no answer
  long milliseconds;
};

}  // namespace doctor
