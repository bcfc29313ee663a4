// The contract of platform/platform.h, line by line, as checks of somebody's four functions.
//
// Each line runs in its own process, with the functions loaded afresh: a crash, an exception or a
// call that never returns is a finding of that line, and the other lines go on.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

namespace port {

// The four functions under check.
struct Platform {
  int (*base64_encode)(const char* source, size_t length, char* text, size_t capacity, int option);
  int (*base64_decode)(const char* text, size_t length, char* bytes, size_t* size);
  int (*url_encode)(const char* text, char* encoded, size_t capacity);
  int (*convert_name)(const char* name, char* result, size_t size);
};

struct Options {
  std::string file;
  std::string name = "AD.EXAMPLE.NET\\alice";  // a user that the device's directory knows
  std::string result;                          // what it must become; empty: not compared
  std::string only;                            // what the ids of the lines to check begin with
  unsigned seconds = 30;                       // for each line
};

struct Line {
  const char* id;    // "encode-capacity"
  const char* text;  // the promise, in words
  void (*check)(const Platform& platform, const Options& options);
};

struct Function {
  const char* name;
  std::vector<Line> lines;
};

// The lines of each function, in the order of the header.
Function EncodeLines();
Function DecodeLines();
Function URLLines();
Function NameLines();

}  // namespace port
