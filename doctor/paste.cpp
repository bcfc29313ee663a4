#include "doctor/paste.h"

#include <algorithm>
#include <cctype>
#include <regex>

#include "doctor/unescape.h"

namespace doctor {

namespace {

constexpr int kDeepest = 4;  // encodings inside each other
constexpr size_t kLongestTag = 400;

// Zero-width characters, soft hyphens, a mail's soft line breaks and a terminal's colours are taken
// out; other control characters and no-break spaces become blanks.
std::string WithoutUnseen(const std::string& text) {
  static const std::regex unseen(
      "\xc2\xad|\xe2\x80\x8b|\xe2\x80\x8c|\xe2\x80\x8d|\xef\xbb\xbf|=\r?\n|\x1b\\[[0-9;]{0,8}m");
  static const std::regex blank("\xc2\xa0|[\x01-\x09\x0b\x0c\x0e-\x1f]");
  return std::regex_replace(std::regex_replace(text, unseen, ""), blank, " ");
}

std::string WithoutTags(const std::string& text, const std::string& instead) {
  std::string out;
  for (size_t at = 0; at < text.size(); ++at) {
    const size_t end = text[at] == '<' ? text.find('>', at) : std::string::npos;
    if (end == std::string::npos || end - at > kLongestTag) {
      out += text[at];
    } else {
      out += instead;
      at = end;
    }
  }
  return out;
}

}  // namespace

std::vector<std::string> ReadingsOf(const std::string& pasted) {
  std::vector<std::string> readings;
  const auto add = [&readings](const std::string& text) {
    if (std::find(readings.begin(), readings.end(), text) == readings.end())
      readings.push_back(text);
  };
  std::string text = pasted;
  for (int depth = 0; depth <= kDeepest; ++depth) {
    text = WithoutUnseen(text);
    std::string blanks = text;
    std::replace(blanks.begin(), blanks.end(), '+', ' ');  // as in a query
    add(text);
    add(blanks);
    add(WithoutTags(text, ""));
    add(WithoutTags(text, " "));
    const std::string decoded = Unescape(ViewOf(text)).text;
    if (decoded == text) break;
    text = decoded;
  }
  return readings;
}

std::string Collapse(const std::string& text) {
  std::string out;
  for (const char c : text) {
    const bool space = std::isspace(static_cast<unsigned char>(c)) != 0;
    if (!space) out += c;
    if (space && !out.empty() && out.back() != ' ') out += ' ';
  }
  if (!out.empty() && out.back() == ' ') out.pop_back();
  return out;
}

std::string Join(const std::string& text) {
  std::string out;
  bool broken = false;
  for (const char c : text) {
    broken = c == '\n' || c == '\r' || (broken && (c == ' ' || c == '\t'));
    if (!broken) out += c;
  }
  return out;
}

}  // namespace doctor
