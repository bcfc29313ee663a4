// The write function that collects the body of an answer in a string.
#pragma once

#include <cstring>
#include <new>
#include <string>

namespace QOVA {
namespace SSO {

// Appends a chunk to the std::string at `userData`, up to the chunk's first zero byte: the rest
// of such a chunk is dropped, and still counts as taken.
//
// No exception may cross libcurl's frames: with no memory left it takes nothing, which ends the
// transfer as a failed one.
static unsigned WriteToStringCallback(void* data, unsigned size, unsigned count, void* userData) {
  const unsigned length = size * count;
  const char* const text = static_cast<const char*>(data);
  try {
    static_cast<std::string*>(userData)->append(text, strnlen(text, length));
  } catch (const std::bad_alloc&) {
    return 0;
  }
  return length;
}

}  // namespace SSO
}  // namespace QOVA
