#include "doctor/paste.h"

#include <algorithm>
#include <cctype>
#include <cstdlib>
#include <map>
#include <regex>

namespace doctor {

namespace {

constexpr int kDeepest = 4;  // encodings inside each other
constexpr size_t kLongestTag = 400;

bool IsHex(const std::string& text, size_t at, size_t count) {
  if (at + count > text.size()) return false;
  return std::all_of(text.begin() + at, text.begin() + at + count,
                     [](unsigned char c) { return std::isxdigit(c) != 0; });
}

unsigned long Number(const std::string& text, size_t at, size_t count, int base) {
  return std::strtoul(text.substr(at, count).c_str(), nullptr, base);
}

// No code or message needs more than ASCII: of the rest only blanks and what is invisible count.
std::string Character(unsigned long code) {
  if (code == 0xad || (code >= 0x200b && code <= 0x200d) || code == 0xfeff) return "";
  if (code == 0xa0 || (code >= 0x2000 && code <= 0x200a)) return " ";
  return code < 0x80 ? std::string(1, static_cast<char>(code)) : "?";
}

// Each of these decodes what begins at `at`, appends it and moves `at` behind it; or does nothing.

bool DecodePercent(const std::string& text, size_t& at, std::string& out) {
  if (text[at] != '%' || !IsHex(text, at + 1, 2)) return false;
  out += static_cast<char>(Number(text, at + 1, 2, 16));
  at += 3;
  return true;
}

bool DecodeEscape(const std::string& text, size_t& at, std::string& out) {
  if (text[at] != '\\' || at + 1 == text.size()) return false;
  const char kind = text[at + 1];
  const size_t digits = kind == 'u' ? 4 : kind == 'x' ? 2 : 0;
  if (digits > 0 && !IsHex(text, at + 2, digits)) return false;
  if (digits > 0) {
    out += Character(Number(text, at + 2, digits, 16));
  } else if (kind == 'n' || kind == 'r') {
    out += '\n';
  } else if (kind == 't') {
    out += ' ';
  } else if (kind == '"' || kind == '/' || kind == '\\' || kind == '\'') {
    out += kind;
  } else {
    return false;
  }
  at += 2 + digits;
  return true;
}

bool DecodeEntity(const std::string& text, size_t& at, std::string& out) {
  static const std::map<std::string, std::string> names = {
      {"amp", "&"},  {"lt", "<"},     {"gt", ">"},   {"quot", "\""},
      {"apos", "'"}, {"lowbar", "_"}, {"nbsp", " "}, {"shy", ""}};
  const size_t end = text[at] == '&' ? text.find(';', at) : std::string::npos;
  if (end == std::string::npos || end - at > 10) return false;
  const std::string name = text.substr(at + 1, end - at - 1);
  const auto named = names.find(name);
  if (named != names.end()) {
    out += named->second;
  } else if (name.size() > 1 && name[0] == '#') {
    const bool hex = name[1] == 'x' || name[1] == 'X';
    out += Character(Number(name, hex ? 2 : 1, name.size(), hex ? 16 : 10));
  } else {
    return false;
  }
  at = end + 1;
  return true;
}

std::string Decode(const std::string& text) {
  std::string out;
  for (size_t at = 0; at < text.size();) {
    if (DecodePercent(text, at, out) || DecodeEscape(text, at, out) || DecodeEntity(text, at, out))
      continue;
    out += text[at++];
  }
  return out;
}

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
    const std::string decoded = Decode(text);
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
