#include "support/platform_spy.h"

#include <algorithm>

#include "platform/platform.h"

extern "C" {
int ReferenceBase64Encode(const char*, size_t, char*, size_t, int);
int ReferenceBase64Decode(const char*, size_t, char*, size_t*);
int ReferenceCGIURLEncode(const char*, char*, size_t);
int ReferenceWinsUserNameFqdn2Netbios(const char*, char*, size_t);
}

namespace {

bool isZero(const char* buffer, std::size_t size) {
  return std::all_of(buffer, buffer + size, [](char c) { return c == '\0'; });
}

}  // namespace

namespace test {

PlatformSpy& platformSpy() {
  static PlatformSpy spy;
  return spy;
}

}  // namespace test

using test::platformSpy;

int QOVABase64Encode(const char* source, size_t length, char* text, size_t capacity, int option) {
  const std::string input(source, length);
  platformSpy().base64Encode.push_back({input, capacity, option, isZero(text, capacity)});
  if (platformSpy().onBase64Encode) return platformSpy().onBase64Encode(input, text, capacity);
  return ReferenceBase64Encode(source, length, text, capacity, option);
}

int QOVABase64Decode(const char* text, size_t length, char* bytes, size_t* size) {
  const std::string input(text, length);
  platformSpy().base64Decode.push_back({input, *size, 0, isZero(bytes, *size)});
  if (platformSpy().onBase64Decode) return platformSpy().onBase64Decode(input, bytes, size);
  return ReferenceBase64Decode(text, length, bytes, size);
}

int QOVACGIURLEncode(const char* text, char* encoded, size_t capacity) {
  platformSpy().urlEncode.push_back({text, capacity, 0, isZero(encoded, capacity + 1)});
  if (platformSpy().onURLEncode) return platformSpy().onURLEncode(text, encoded, capacity);
  return ReferenceCGIURLEncode(text, encoded, capacity);
}

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  // The library offers one byte less than it has.
  platformSpy().userName.push_back({name, size, 0, isZero(result, size + 1)});
  if (platformSpy().onUserName) return platformSpy().onUserName(name, result, size);
  return ReferenceWinsUserNameFqdn2Netbios(name, result, size);
}
