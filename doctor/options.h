// The command line.
#pragma once

#include <optional>
#include <stdexcept>
#include <string>

namespace doctor {

struct Options {
  bool json = false;
  bool verbose = false;
  bool offline = false;     // no request leaves the device
  bool token = false;       // a token comes on standard input
  bool try_secret = false;  // send the client secret to the token endpoint
  int timeout = 10;         // seconds, for each request
  std::string user;         // the login program's user
  std::string program;      // the login program's file
  std::string name;         // a principal name to convert
  // A pasted text; nothing but its explanation is wanted then.
  std::optional<std::string> explain;
};

// What is wrong with the command line, for one line.
class UsageError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// Reads the command line. Prints help or version and returns false if that is all that is wanted.
// Throws UsageError; `options.json` is right by then.
bool ParseOptions(int argc, char** argv, Options& options);

}  // namespace doctor
