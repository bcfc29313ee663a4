#include "reason.h"

#include <json/reader.h>
#include <json/value.h>

#include <sstream>

namespace {

constexpr size_t kLongest = 120;

std::string Printable(const std::string& text) {
  std::string out;
  for (const char c : text.substr(0, kLongest)) {
    out += c >= 0x20 && c < 0x7f ? c : ' ';
  }
  return out;
}

// The error code of an OAuth error response (RFC 6749, section 5.2); empty for any other text.
std::string ErrorCode(const std::string& text) {
  if (text.empty() || text[0] != '{') return "";
  Json::Value root;
  Json::CharReaderBuilder builder;
  std::istringstream in(text);
  if (!Json::parseFromStream(builder, in, &root, nullptr) || !root.isObject()) return "";
  return root["error"].isString() ? root["error"].asString() : "error response";
}

}  // namespace

std::string ShortReason(const std::string& text) {
  const std::string code = ErrorCode(text);
  return Printable(code.empty() ? text : code);
}

std::string LogLine(const std::string& text, const std::string& secret) {
  std::string line = text.substr(0, text.find_last_not_of('\n') + 1);
  if (secret.empty()) return line;
  for (size_t at; (at = line.find(secret)) != std::string::npos;) {
    line.replace(at, secret.size(), "[...]");
  }
  return line;
}
