#include "secret_forms.h"

#include <openssl/evp.h>

#include <cctype>
#include <iomanip>
#include <sstream>

namespace test {
namespace {

constexpr size_t kWindow = 8;

// How a number is written: "%2F", "&#x2f;".
struct Style {
  const char* before;
  bool hex;
  bool upper;
  int width;
  const char* after;
};

std::string formatted(const Style& style, unsigned value) {
  std::ostringstream text;
  text << style.before << (style.hex ? std::hex : std::dec)
       << (style.upper ? std::uppercase : std::nouppercase) << std::setw(style.width)
       << std::setfill('0') << value << style.after;
  return text.str();
}

constexpr Style kPercent = {"%", true, true, 2, ""};
constexpr Style kPercentLower = {"%", true, false, 2, ""};

// Each byte in the style, or as it is if it is alphanumeric and `all` is not set.
std::string each(const Style& style, bool all) {
  std::string result;
  for (const char c : std::string(kOddSecret)) {
    const auto byte = static_cast<unsigned char>(c);
    const bool plain = !all && byte < 0x80 && std::isalnum(byte) != 0;
    result += plain ? std::string(1, c) : formatted(style, byte);
  }
  return result;
}

// As `each`, with the code point of the last character in place of its two bytes.
std::string eachCode(const Style& style, bool all) {
  const std::string bytes = each(style, all);
  const size_t tail = 2 * formatted(style, 0xa9).size();
  return bytes.substr(0, bytes.size() - tail) + formatted(style, 0xe9);
}

std::string replaced(std::string text, const std::string& from, const std::string& to) {
  for (size_t at = 0; (at = text.find(from, at)) != std::string::npos; at += to.size()) {
    text.replace(at, from.size(), to);
  }
  return text;
}

std::string named() {
  std::string text = replaced(kOddSecret, "&", "&amp;");
  for (const auto& [from, to] :
       std::vector<std::pair<std::string, std::string>>{{"<", "&lt;"},
                                                        {">", "&gt;"},
                                                        {"\"", "&quot;"},
                                                        {"'", "&apos;"},
                                                        {"+", "&plus;"},
                                                        {"/", "&sol;"},
                                                        {"=", "&equals;"},
                                                        {"%", "&percnt;"},
                                                        {"\\", "&bsol;"}}) {
    text = replaced(text, from, to);
  }
  return text;
}

std::string base64(const std::string& bytes, bool url, bool padded) {
  std::string text(4 * ((bytes.size() + 2) / 3) + 1, '\0');
  text.resize(static_cast<size_t>(EVP_EncodeBlock(
      reinterpret_cast<unsigned char*>(text.data()),
      reinterpret_cast<const unsigned char*>(bytes.data()), static_cast<int>(bytes.size()))));
  if (url) text = replaced(replaced(text, "+", "-"), "/", "_");
  return padded ? text : replaced(text, "=", "");
}

// One encoding in another.
std::vector<std::string> nestedForms() {
  return {replaced(each(kPercent, false), "%", "%25"),
          replaced(eachCode({"&#", false, false, 0, ";"}, true), "&", "\\u0026"),
          base64("c:" + each(kPercent, false), false, true)};
}

}  // namespace

std::vector<std::string> secretForms() {
  const std::string json = replaced(replaced(kOddSecret, "\\", "\\\\"), "\"", "\\\"");
  std::vector<std::string> all = {kOddSecret,
                                  each(kPercent, false),
                                  each(kPercentLower, false),
                                  each(kPercent, true),
                                  each(kPercentLower, true),
                                  replaced(each(kPercent, false), "%20", "+"),
                                  replaced(each(kPercent, false), "%", "%25"),
                                  named(),
                                  eachCode({"&#", false, false, 0, ";"}, false),
                                  eachCode({"&#", false, false, 0, ";"}, true),
                                  eachCode({"&#00", false, false, 0, ";"}, true),
                                  eachCode({"&#x", true, false, 0, ";"}, false),
                                  eachCode({"&#X", true, true, 0, ";"}, true),
                                  eachCode({"&#x0", true, true, 0, ";"}, true),
                                  json,
                                  replaced(json, "/", "\\/"),
                                  eachCode({"\\u", true, false, 4, ""}, false),
                                  eachCode({"\\u", true, true, 4, ""}, true)};
  for (const bool url : {false, true}) {
    for (const bool padded : {false, true}) {
      for (const char* before : {"", "i", "id"}) {
        for (const char* after : {"", ":"}) {
          all.push_back(base64(before + std::string(kOddSecret) + after, url, padded));
        }
      }
    }
  }
  return all;
}

std::vector<std::string> allSecretForms() {
  std::vector<std::string> all = secretForms();
  for (const std::string& form : nestedForms()) all.push_back(form);
  return all;
}

std::string windowIn(const std::string& shown, const std::string& form) {
  for (size_t at = 0; at + kWindow <= form.size(); ++at) {
    const std::string window = form.substr(at, kWindow);
    if (shown.find(window) != std::string::npos) return window;
  }
  return "";
}

// Filler that holds no part of a form; it ends with a character that base64 does not have.
std::string filler(size_t length) {
  std::string text = std::string("no such client here, ");
  while (text.size() < length) text += "no such client here, ";
  return text.substr(text.size() - length);
}

}  // namespace test
