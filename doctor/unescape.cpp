#include "doctor/unescape.h"

#include <cctype>
#include <cstdlib>

#include "doctor/text.h"

namespace doctor {

namespace {

// The named character references of ASCII (HTML, section 13.5), each behind its character.
constexpr const char* kNames[] = {"&amp",          "<lt",
                                  ">gt",           "\"quot",
                                  "'apos",         "\tTab",
                                  "\nNewLine",     "!excl",
                                  "#num",          "$dollar",
                                  "%percnt",       "(lpar",
                                  ")rpar",         "*ast",
                                  "*midast",       "+plus",
                                  ",comma",        ".period",
                                  "/sol",          ":colon",
                                  ";semi",         "=equals",
                                  "?quest",        "@commat",
                                  "[lsqb",         "[lbrack",
                                  "\\bsol",        "]rsqb",
                                  "]rbrack",       "^Hat",
                                  "_lowbar",       "_UnderBar",
                                  "`grave",        "`DiacriticalGrave",
                                  "{lcub",         "{lbrace",
                                  "|verbar",       "|vert",
                                  "|VerticalLine", "}rcub",
                                  "}rbrace",       " nbsp"};

struct Decoded {
  size_t length = 0;  // of what was read; 0: no escape
  std::string bytes;
};

bool IsHex(const std::string& text, size_t at, size_t count) {
  if (at + count > text.size()) return false;
  for (size_t i = at; i < at + count; ++i) {
    if (std::isxdigit(static_cast<unsigned char>(text[i])) == 0) return false;
  }
  return true;
}

unsigned long Number(const std::string& text, size_t at, size_t count, int base) {
  return std::strtoul(text.substr(at, count).c_str(), nullptr, base);
}

std::string Utf8(unsigned long code) {
  const auto byte = [](unsigned long value) { return static_cast<char>(value & 0xff); };
  const auto tail = [&](int shift, unsigned long of) { return byte(0x80 | (of >> shift & 0x3f)); };
  if (code < 0x80) return {byte(code)};
  if (code < 0x800) return {byte(0xc0 | code >> 6), tail(0, code)};
  if (code < 0x10000) return {byte(0xe0 | code >> 12), tail(6, code), tail(0, code)};
  return {byte(0xf0 | code >> 18), tail(12, code), tail(6, code), tail(0, code)};
}

// "&#65;", "&#x41;", with any number of zeros, with or without the semicolon.
Decoded NumericReference(const std::string& text, size_t at) {
  const bool hex = at + 2 < text.size() && (text[at + 2] == 'x' || text[at + 2] == 'X');
  const size_t first = at + (hex ? 3 : 2);
  size_t end = first;
  while (end < text.size() &&
         (hex ? IsHex(text, end, 1) : std::isdigit(static_cast<unsigned char>(text[end])) != 0)) {
    ++end;
  }
  if (end == first) return {};
  const unsigned long code = Number(text, first, end - first, hex ? 16 : 10);
  if (end < text.size() && text[end] == ';') ++end;
  return {end - at, code < 0x110000 ? Utf8(code) : "?"};
}

Decoded Reference(const std::string& text, size_t at) {
  if (text.compare(at, 2, "&#") == 0) return NumericReference(text, at);
  for (const char* const known : kNames) {
    const std::string name = known + 1;
    if (text.compare(at + 1, name.size(), name) != 0) continue;
    const size_t end = at + 1 + name.size();
    return {end - at + (end < text.size() && text[end] == ';' ? 1 : 0), std::string(1, known[0])};
  }
  return {};
}

// "\u0041", a pair of surrogates too.
Decoded Unicode(const std::string& text, size_t at) {
  if (!IsHex(text, at + 2, 4)) return {};
  const unsigned long code = Number(text, at + 2, 4, 16);
  if (code < 0xd800 || code > 0xdbff || text.compare(at + 6, 2, "\\u") != 0 ||
      !IsHex(text, at + 8, 4)) {
    return {6, Utf8(code)};
  }
  const unsigned long low = Number(text, at + 8, 4, 16);
  return {12, Utf8(0x10000 + ((code & 0x3ff) << 10 | (low & 0x3ff)))};
}

Decoded Backslash(const std::string& text, size_t at) {
  static const std::string kLetters = "nrtbf";
  if (at + 1 >= text.size()) return {};
  const char next = text[at + 1];
  if (next == 'u') return Unicode(text, at);
  if (next == 'x' && IsHex(text, at + 2, 2)) {
    return {4, std::string(1, static_cast<char>(Number(text, at + 2, 2, 16)))};
  }
  if (IsHex(text, at + 1, 2)) {
    return {3, std::string(1, static_cast<char>(Number(text, at + 1, 2, 16)))};
  }
  const size_t letter = kLetters.find(next);
  if (letter != std::string::npos) return {2, std::string(1, "\n\r\t\b\f"[letter])};
  if (std::isalnum(static_cast<unsigned char>(next)) != 0) return {};
  return {2, std::string(1, next)};
}

Decoded Decode(const std::string& text, size_t at) {
  switch (text[at]) {
    case '%':
      if (!IsHex(text, at + 1, 2)) return {};
      return {3, std::string(1, static_cast<char>(Number(text, at + 1, 2, 16)))};
    case '&':
      return Reference(text, at);
    case '\\':
      return Backslash(text, at);
    default:
      return {};
  }
}

}  // namespace

View ViewOf(const std::string& text) {
  View view;
  for (size_t i = 0; i < text.size(); ++i) view.Add(text[i], i, i + 1);
  return view;
}

View Unescape(const View& view) {
  View result;
  for (size_t at = 0; at < view.text.size();) {
    Decoded decoded = Decode(view.text, at);
    if (decoded.length == 0) decoded = {1, std::string(1, view.text[at])};
    const size_t last = at + decoded.length - 1;
    for (const char byte : decoded.bytes) result.Add(byte, view.begin[at], view.end[last]);
    at = last + 1;
  }
  return result;
}

View DecodeBase64Runs(const View& view, size_t skipped) {
  View result;
  unsigned bits = 0;
  size_t in_run = 0;
  for (size_t at = 0; at < view.text.size(); ++at) {
    const int value = Base64Value(view.text[at]);
    if (value < 0) {
      in_run = 0;
      result.Add('\0', view.begin[at], view.end[at]);
      continue;
    }
    if (in_run++ < skipped) continue;
    bits = bits << 6 | static_cast<unsigned>(value);
    // The second to fourth character of four each complete a byte.
    const size_t place = (in_run - 1 - skipped) % 4;
    if (place == 0) continue;
    result.Add(static_cast<char>(bits >> (6 - 2 * place) & 0xff), view.begin[at - 1], view.end[at]);
  }
  return result;
}

}  // namespace doctor
