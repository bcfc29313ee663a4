// Text that looks right and is not: characters that cannot be seen or look like others, quotation
// marks inside values, and placeholders of examples.
#pragma once

#include <string>

namespace doctor {

// Names the first character of the text that is not printable ASCII, "a no-break space (U+00A0)";
// empty if there is none. `at` is its offset.
std::string OddCharacter(const std::string& text, size_t* at = nullptr);
// The same for what is outside the strings of a JSON document.
std::string OddOutsideStrings(const std::string& text, size_t& at);

// The text without invisible characters, and with "?" or the ASCII form for look-alikes.
std::string Skeleton(const std::string& text);

enum class Placeholder {
  kNone,
  kPossible,  // a word that could be a real value: "changeme"
  kCertain    // "<client-id>"
};
Placeholder PlaceholderOf(const std::string& value);
bool IsPlaceholderUrl(const std::string& url);

bool IsInQuotes(const std::string& value);

}  // namespace doctor
