// What a failure looks like to the user, and to the administrator.
#pragma once

#include <string>
#include <vector>

// Redact returns a text without the given secrets, as they are or URL-encoded, and without
// anything that looks like a JSON Web Token. What is taken out is marked "[...]".
std::string Redact(const std::string& text, const std::vector<std::string>& secrets);

// LogLine returns a text as it goes to the system log: on one line, control characters blanked.
std::string LogLine(const std::string& text);

// ShortReason returns what the relay page may show of a failure: the error code if the text is a
// provider's error response, or else the text, cut to a line of printable ASCII.
std::string ShortReason(const std::string& text);
