#include "doctor/text.h"

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstdlib>
#include <numeric>

namespace doctor {

namespace {

constexpr char kAlphabet[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_";

bool IsSpace(char c) {
  return std::isspace(static_cast<unsigned char>(c)) != 0;
}

// The number of letters to change, add or take away to get from one word to the other.
size_t Distance(const std::string& one, const std::string& other) {
  std::vector<size_t> row(other.size() + 1);
  std::iota(row.begin(), row.end(), size_t{0});
  for (size_t i = 0; i < one.size(); ++i) {
    size_t diagonal = row[0];
    row[0] = i + 1;
    for (size_t j = 0; j < other.size(); ++j) {
      const size_t same = diagonal + (one[i] == other[j] ? 0 : 1);
      diagonal = row[j + 1];
      row[j + 1] = std::min({same, row[j] + 1, row[j + 1] + 1});
    }
  }
  return row.back();
}

}  // namespace

std::string LowerCase(std::string text) {
  for (char& c : text) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return text;
}

std::string Quote(const std::string& text) {
  return "\"" + text + "\"";
}

std::string Printable(const std::string& text) {
  std::string result;
  for (size_t i = 0; i < text.size(); ++i) {
    const unsigned char c = static_cast<unsigned char>(text[i]);
    const unsigned char before = i > 0 ? static_cast<unsigned char>(text[i - 1]) : 0;
    // C1 controls are C2 80 to C2 9F in UTF-8.
    const bool control = c < 0x20 || c == 0x7f || (before == 0xc2 && c < 0xa0 && c >= 0x80);
    if (c == '\n' && i + 1 == text.size()) break;
    if (!control) {
      result += text[i];
      continue;
    }
    char escape[8];
    std::snprintf(escape, sizeof escape, "\\x%02X", static_cast<unsigned>(c));
    result += escape;
  }
  return result;
}

std::string Clip(const std::string& text, size_t length) {
  if (text.size() <= length) return text;
  while (length > 0 && (static_cast<unsigned char>(text[length]) & 0xc0) == 0x80) --length;
  return text.substr(0, length) + "...";
}

std::string Plural(size_t count, const std::string& word) {
  return std::to_string(count) + " " + word + (count == 1 ? "" : "s");
}

std::string Time(time_t when) {
  struct tm fields = {};
  char text[64];
  if (gmtime_r(&when, &fields) == nullptr) return std::to_string(when);
  if (std::strftime(text, sizeof text, "%Y-%m-%d %H:%M:%S UTC", &fields) == 0) return "?";
  return text;
}

std::string Span(long long seconds) {
  const unsigned long long span = seconds < 0 ? 0ULL - static_cast<unsigned long long>(seconds)
                                              : static_cast<unsigned long long>(seconds);
  if (span < 120) return std::to_string(span) + " s";
  if (span < 7200) return std::to_string(span / 60) + " min";
  if (span < 172800) return std::to_string(span / 3600) + " h";
  return std::to_string(span / 86400) + " days";
}

std::string Nearest(const std::string& word, const std::vector<std::string>& candidates) {
  std::string nearest;
  size_t least = std::max<size_t>(2, word.size() / 3) + 1;
  for (const std::string& candidate : candidates) {
    const size_t distance = Distance(LowerCase(word), LowerCase(candidate));
    if (distance >= least) continue;
    least = distance;
    nearest = candidate;
  }
  return nearest;
}

int Base64Value(char c) {
  const std::string alphabet = kAlphabet;
  const size_t value = alphabet.find(c == '+' ? '-' : c == '/' ? '_' : c);
  return value == std::string::npos ? -1 : static_cast<int>(value);
}

std::string EncodeBase64Url(const std::string& bytes) {
  std::string text;
  unsigned bits = 0;
  int count = 0;
  for (const char byte : bytes) {
    bits = bits << 8 | static_cast<unsigned char>(byte);
    for (count += 8; count >= 6; count -= 6) text += kAlphabet[bits >> (count - 6) & 63];
  }
  if (count > 0) text += kAlphabet[bits << (6 - count) & 63];
  return text;
}

std::string DecodeBase64Url(const std::string& text) {
  std::string bytes;
  unsigned bits = 0;
  int count = 0;
  for (const char c : text) {
    if (c == '=') continue;
    const int value = Base64Value(c);
    if (value < 0) return "";
    bits = bits << 6 | static_cast<unsigned>(value);
    count += 6;
    if (count < 8) continue;
    count -= 8;
    bytes += static_cast<char>(bits >> count & 255);
  }
  return bytes;
}

bool IsGuid(const std::string& text) {
  if (text.size() != 36) return false;
  for (size_t i = 0; i < text.size(); ++i) {
    const bool dash = i == 8 || i == 13 || i == 18 || i == 23;
    if (dash ? text[i] != '-' : std::isxdigit(static_cast<unsigned char>(text[i])) == 0)
      return false;
  }
  return true;
}

bool EndsWith(const std::string& text, const std::string& end) {
  return text.size() >= end.size() && text.compare(text.size() - end.size(), end.size(), end) == 0;
}

bool HasSpaceAround(const std::string& text) {
  return !text.empty() && (IsSpace(text.front()) || IsSpace(text.back()));
}

bool HasUpperCase(const std::string& text) {
  return std::any_of(text.begin(), text.end(),
                     [](char c) { return std::isupper(static_cast<unsigned char>(c)) != 0; });
}

}  // namespace doctor
