#include "doctor/characters.h"

#include <cstdio>
#include <regex>

namespace doctor {

namespace {

struct Range {
  unsigned first;
  unsigned last;
  bool invisible;
  const char* name;
};

// Earlier rows count first.
constexpr Range kRanges[] = {
    {0x00, 0x1f, true, "a control character"},
    {0x20, 0x7e, false, ""},
    {0x7f, 0x9f, true, "a control character"},
    {0xa0, 0xa0, true, "a no-break space"},
    {0xad, 0xad, true, "a soft hyphen"},
    {0x370, 0x3ff, false, "a Greek letter"},
    {0x400, 0x52f, false, "a Cyrillic letter"},
    {0x61c, 0x61c, true, "an invisible character"},
    {0x2000, 0x200a, true, "a typographic space"},
    {0x200b, 0x200b, true, "a zero-width space"},
    {0x200c, 0x200f, true, "an invisible character"},
    {0x2010, 0x2015, false, "a typographic dash"},
    {0x2018, 0x201f, false, "a typographic quotation mark"},
    {0x2028, 0x202f, true, "an invisible character or space"},
    {0x205f, 0x206f, true, "an invisible character or space"},
    {0x2212, 0x2212, false, "a minus sign"},
    {0x3000, 0x3000, true, "an ideographic space"},
    {0xfe00, 0xfe0f, true, "an invisible character"},
    {0xfeff, 0xfeff, true, "a byte-order mark"},
    {0xff01, 0xff5e, false, "a full-width character"},
    {0, 0x10ffff, false, "a character outside ASCII"},
};
constexpr unsigned kNotUtf8 = 0x110000;

// The character at `at`, which is moved behind it.
unsigned Next(const std::string& text, size_t& at) {
  const auto byte = [&text](size_t i) {
    return i < text.size() ? static_cast<unsigned char>(text[i]) : 0U;
  };
  const unsigned first = byte(at++);
  if (first < 0x80) return first;
  const size_t more = first >= 0xf0 ? 3 : first >= 0xe0 ? 2 : first >= 0xc2 ? 1 : 0;
  unsigned character = first & (0x3fU >> more);
  for (size_t i = 0; i < more; ++i) {
    if ((byte(at + i) & 0xc0U) != 0x80) return kNotUtf8;
    character = character << 6 | (byte(at + i) & 0x3fU);
  }
  at += more;
  return more == 0 ? kNotUtf8 : character;
}

const Range* RangeOf(unsigned character) {
  for (const Range& range : kRanges) {
    if (character >= range.first && character <= range.last) return &range;
  }
  return nullptr;
}

// Empty for printable ASCII.
std::string NameOf(unsigned character) {
  const Range* const range = RangeOf(character);
  if (range == nullptr) return "a byte that is not UTF-8";
  if (*range->name == '\0') return "";
  char code[16];
  std::snprintf(code, sizeof code, " (U+%04X)", character);
  return range->name + std::string(code);
}

bool Matches(const std::string& text, const char* pattern) {
  return std::regex_search(text.substr(0, 300), std::regex(pattern, std::regex::icase));
}

}  // namespace

std::string OddCharacter(const std::string& text, size_t* at) {
  for (size_t i = 0; i < text.size();) {
    if (at != nullptr) *at = i;
    const std::string name = NameOf(Next(text, i));
    if (!name.empty()) return name;
  }
  return "";
}

std::string OddOutsideStrings(const std::string& text, size_t& at) {
  bool inside = false;
  for (size_t i = 0; i < text.size();) {
    at = i;
    const unsigned character = Next(text, i);
    if (inside && character == '\\') ++i;
    if (character == '"') inside = !inside;
    const bool blank = character == '\n' || character == '\r' || character == '\t';
    const std::string name = inside || blank ? "" : NameOf(character);
    if (!name.empty()) return name;
  }
  return "";
}

std::string Skeleton(const std::string& text) {
  std::string result;
  for (size_t i = 0; i < text.size();) {
    const unsigned character = Next(text, i);
    const Range* const range = RangeOf(character);
    if (range != nullptr && range->invisible) continue;
    const bool wide = character >= 0xff01 && character <= 0xff5e;
    result += character < 0x80 ? static_cast<char>(character)
              : wide           ? static_cast<char>(character - 0xfee0)
                               : '?';
  }
  return result;
}

Placeholder PlaceholderOf(const std::string& value) {
  if (Matches(value,
              R"(^(<.*>|\{.*\}|\[.*\]|\$[({]?[a-z_]+[)}]?|%[a-z_]+%|@[a-z_]+@|__+[a-z_]+__+)$|)"
              R"(^[0x]{8}-([0x]{4}-){3}[0x]{12}$|^the value of the client secret$|)"
              R"(^a random secret of 32 bytes or more$|^(x+|\*+|\.\.+|\?+)$)")) {
    return Placeholder::kCertain;
  }
  const bool word = Matches(
      value,
      R"(^((change|replace|fill|put|insert|enter|paste)[-_ ]?(me|it|this|here|in|with|your).*|)"
      R"((your|my)[-_ ]?(client|secret|tenant|app|directory|device|value|own|id|key|password).*|)"
      R"(todo|tbd|fixme|n/?a|none|null|undefined|unknown|test|secret|password|dummy|example|)"
      R"((place[-_ ]?holder|sample|dummy|example)[-_ ]?.*|)"
      R"((azure|websphere)?[-_ ]?(client|tenant|application|app|directory)[-_ ]?(id|secret|key))$)");
  return word ? Placeholder::kPossible : Placeholder::kNone;
}

bool IsPlaceholderUrl(const std::string& url) {
  return Matches(url, R"([<>{}]|%7b|\byour[-_]?(tenant|device|domain|server|host|provider)|)"
                      R"([/=](tenant[-_]?id|client[-_]?id|changeme|x{4,})(/|$))");
}

bool IsInQuotes(const std::string& value) {
  return value.size() >= 2 && value.front() == value.back() &&
         (value.front() == '"' || value.front() == '\'' || value.front() == '`');
}

}  // namespace doctor
