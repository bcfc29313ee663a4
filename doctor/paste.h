// A text as a person pastes it: from a log, a browser's address bar, a page's source, a mail.
#pragma once

#include <string>
#include <vector>

namespace doctor {

// The text as it is, and with what may hide a word undone: percent-encoding, JSON escapes, HTML
// tags and entities, one inside the other, and characters that are not seen.
std::vector<std::string> ReadingsOf(const std::string& pasted);

// Runs of white space as one blank.
std::string Collapse(const std::string& text);

// Line breaks, with the indentation behind them, taken out.
std::string Join(const std::string& text);

}  // namespace doctor
