#include "utf8.h"

#include <algorithm>
#include <cstdint>
#include <vector>

namespace {

constexpr std::uint32_t kBad = 0xffffffff;

// Reads one character at `at` and moves behind it; kBad, and one byte further, if there is none.
std::uint32_t Next(const std::string& text, size_t& at) {
  const auto byte = [&](size_t i) { return static_cast<unsigned char>(text[i]); };
  const unsigned char first = byte(at++);
  if (first < 0x80) return first;
  const size_t more = first >= 0xf0 ? 3 : first >= 0xe0 ? 2 : 1;
  constexpr std::uint32_t kLeast[] = {0, 0x80, 0x800, 0x10000};
  if (first < 0xc2 || first > 0xf4 || at + more > text.size()) return kBad;
  std::uint32_t value = first & (0x3f >> more);
  for (size_t i = 0; i < more; ++i) {
    if ((byte(at + i) & 0xc0) != 0x80) return kBad;
    value = value << 6 | (byte(at + i) & 0x3f);
  }
  if (value < kLeast[more] || value > 0x10ffff || (value >= 0xd800 && value < 0xe000)) return kBad;
  at += more;
  return value;
}

std::vector<std::uint32_t> Characters(const std::string& text) {
  std::vector<std::uint32_t> characters;
  for (size_t at = 0; at < text.size();) characters.push_back(Next(text, at));
  return characters;
}

bool IsControl(std::uint32_t c) {
  return c < 0x20 || (c >= 0x7f && c < 0xa0) || c == 0x2028 || c == 0x2029;
}

bool IsBlank(std::uint32_t c) {
  return c == ' ' || c == 0xa0 || c == 0x1680 || (c >= 0x2000 && c <= 0x200b) || c == 0x202f ||
         c == 0x205f || c == 0x3000 || c == 0xfeff;
}

}  // namespace

bool IsUTF8(const std::string& text) {
  const std::vector<std::uint32_t> characters = Characters(text);
  return std::find(characters.begin(), characters.end(), kBad) == characters.end();
}

bool HasControl(const std::string& text) {
  const std::vector<std::uint32_t> characters = Characters(text);
  return std::any_of(characters.begin(), characters.end(), IsControl);
}

bool BeginsOrEndsBlank(const std::string& text) {
  const std::vector<std::uint32_t> characters = Characters(text);
  return !characters.empty() && (IsBlank(characters.front()) || IsBlank(characters.back()));
}

std::string OneLine(const std::string& text, size_t most) {
  std::string line;
  for (size_t at = 0; at < text.size();) {
    const size_t begin = at;
    const std::uint32_t c = Next(text, at);
    if (line.size() + (at - begin) > most) return line + "...";
    if (c == kBad) {
      line += '?';
    } else if (IsControl(c)) {
      line += ' ';
    } else {
      line.append(text, begin, at - begin);
    }
  }
  return line.substr(0, line.find_last_not_of(' ') + 1);
}
