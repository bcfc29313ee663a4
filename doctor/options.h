// The command line.
#pragma once

#include <optional>
#include <string>

namespace doctor {

struct Options {
  bool json = false;
  bool offline = false;                // no request leaves the device
  bool token = false;                  // a token comes on standard input
  bool try_secret = false;             // send the client secret to the token endpoint
  int timeout = 10;                    // seconds, for each request
  std::string user;                    // the login program's user
  std::string program;                 // the login program's file
  std::string name;                    // a principal name to convert
  std::optional<std::string> explain;  // a pasted text; nothing else is done then
};

enum class Usage { kRun, kDone, kWrong };

// Reads the command line. Prints help and version (kDone), or what is wrong with it (kWrong).
Usage ParseOptions(int argc, char** argv, Options& options);

}  // namespace doctor
