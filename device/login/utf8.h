// Text in UTF-8 that comes from outside.
#pragma once

#include <string>

// IsUTF8 says whether a text is UTF-8 (RFC 3629): no overlong forms, no surrogates.
bool IsUTF8(const std::string& text);

// HasControl says whether a text in UTF-8 holds a control character of ASCII or Latin-1, or one of
// Unicode's line separators.
bool HasControl(const std::string& text);

// BeginsOrEndsBlank says whether a text in UTF-8 has a blank of any script at either end.
bool BeginsOrEndsBlank(const std::string& text);

// OneLine returns a text for a line of the log, at most `most` bytes: control characters and
// what is not UTF-8 are replaced.
std::string OneLine(const std::string& text, size_t most);
