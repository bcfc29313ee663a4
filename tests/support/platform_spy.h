// A platform library that records what it is asked, and fails or answers as a test says. The
// library under test is linked with it instead of the reference (ssoclient_spied_test in
// tests/CMakeLists.txt). Left alone it does as the reference does.
#pragma once

#include <cstddef>
#include <functional>
#include <string>
#include <vector>

namespace test {

// One call. `zeroed` says that the whole output buffer, its last zero included, was zero.
struct PlatformCall {
  std::string input;
  std::size_t capacity;
  int option;  // of the base64 encoder alone
  bool zeroed;
};

struct PlatformSpy {
  std::vector<PlatformCall> base64Encode;
  std::vector<PlatformCall> base64Decode;
  std::vector<PlatformCall> urlEncode;
  std::vector<PlatformCall> userName;

  // What is called instead of the reference, with the output buffer and its capacity.
  std::function<int(const std::string& source, char* text, std::size_t capacity)> onBase64Encode;
  std::function<int(const std::string& text, char* bytes, std::size_t* size)> onBase64Decode;
  std::function<int(const std::string& text, char* encoded, std::size_t capacity)> onURLEncode;
  std::function<int(const std::string& name, char* result, std::size_t size)> onUserName;
};

PlatformSpy& platformSpy();

}  // namespace test
