#include "reason.h"

#include <json/reader.h>
#include <json/value.h>
#include <algorithm>
#include <exception>

#include <memory>

#include "sso/utils.h"
#include "state.h"

namespace {

constexpr size_t kLongest = 120;
constexpr char kTaken[] = "[...]";

void TakeOut(std::string& text, const std::string& secret) {
  if (secret.empty()) return;
  for (size_t at = 0; (at = text.find(secret, at)) != std::string::npos;) {
    text.replace(at, secret.size(), kTaken);
    at += sizeof kTaken - 1;
  }
}

// A JSON Web Token's header is an object, and its text therefore begins like this in base64.
void TakeOutTokens(std::string& text) {
  for (size_t at = 0; (at = text.find("eyJ", at)) != std::string::npos;) {
    const size_t end = text.find_first_not_of(
        "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_.", at);
    text.replace(at, end == std::string::npos ? end : end - at, kTaken);
    at += sizeof kTaken - 1;
  }
}

bool IsControl(char c) {
  return static_cast<unsigned char>(c) < 0x20 || c == 0x7f;
}

// The error code of an OAuth error response (RFC 6749, section 5.2); empty for any other text.
std::string ErrorCode(const std::string& text) {
  if (text.empty() || text[0] != '{') return "";
  const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
  Json::Value root;
  try {
    if (!reader->parse(text.data(), text.data() + text.size(), &root, nullptr)) return "";
  } catch (const std::exception&) {  // nested too deep
    return "";
  }
  const std::string code = Member(root, "error");
  return code.empty() ? "error response" : code;
}

}  // namespace

std::string Redact(const std::string& text, const std::vector<std::string>& secrets) {
  std::string out = text;
  for (const std::string& secret : secrets) {
    TakeOut(out, secret);
    TakeOut(out, QOVA::SSO::URLEncode(secret));
  }
  TakeOutTokens(out);
  return out;
}

std::string LogLine(const std::string& text) {
  std::string line = text.substr(0, text.find_last_not_of('\n') + 1);
  std::replace_if(line.begin(), line.end(), IsControl, ' ');
  return line;
}

std::string ShortReason(const std::string& text) {
  const std::string code = ErrorCode(text);
  std::string reason = (code.empty() ? text : code).substr(0, kLongest);
  std::replace_if(
      reason.begin(), reason.end(), [](char c) { return c < 0x20 || c > 0x7e; }, ' ');
  return reason;
}
