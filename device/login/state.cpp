#include "state.h"

#include <json/reader.h>

#include <cctype>
#include <exception>
#include <memory>

namespace {

constexpr size_t kLongestState = 1024;
constexpr size_t kLongestOrigin = 256;

const std::string kAlphabet = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

// Unreserved and reserved characters, and the percent sign.
constexpr char kURLCharacters[] =
    "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789"
    "-._~:/?#[]@!$&'()*+,;=%";

bool IsHexDigit(char c) {
  return std::isxdigit(static_cast<unsigned char>(c)) != 0;
}

// Empty for a text that is no base64.
std::string DecodeBase64(const std::string& text) {
  if (text.size() % 4 != 0 || text.size() > kLongestState) return "";
  const size_t digits = text.find_last_not_of('=') + 1;
  if (text.size() - digits > 2) return "";
  std::string out;
  unsigned bits = 0;
  for (size_t i = 0; i < digits; ++i) {
    const size_t value = kAlphabet.find(text[i]);
    if (value == std::string::npos) return "";
    bits = (bits << 6 | static_cast<unsigned>(value)) & 0xffffff;
    // Each digit but the first of four completes a byte.
    if (i % 4 != 0) out += static_cast<char>(bits >> (6 - i % 4 * 2) & 0xff);
  }
  return out;
}

}  // namespace

Json::Value DecodeState(const std::string& state) {
  const std::string text = DecodeBase64(state);
  const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
  Json::Value root;
  try {
    const bool parsed = reader->parse(text.data(), text.data() + text.size(), &root, nullptr);
    return parsed && root.isObject() ? root : Json::Value();
  } catch (const std::exception&) {  // nested too deep
    return Json::Value();
  }
}

std::string Member(const Json::Value& object, const std::string& name) {
  if (!object.isObject() || !object[name].isString()) return "";
  return object[name].asString();
}

bool IsOwnPath(const std::string& text) {
  if (text.empty() || text[0] != '/' || text.size() > kLongestOrigin) return false;
  // Not even further on: "/..//host" is "//host" once its dots are resolved.
  if (text.substr(0, text.find_first_of("?#")).find("//") != std::string::npos) return false;
  for (size_t i = 0; i < text.size(); ++i) {
    if (text[i] == '%' &&
        !(i + 2 < text.size() && IsHexDigit(text[i + 1]) && IsHexDigit(text[i + 2]))) {
      return false;
    }
  }
  // A URL holds nothing else (RFC 3986). Browsers take a backslash for a slash.
  return text.find_first_not_of(kURLCharacters) == std::string::npos;
}
