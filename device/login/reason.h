// What a failure looks like to the user, and to the administrator.
#pragma once

#include <string>

// ShortReason returns what the relay page may show of an exception's text: the error code if the
// text is a provider's error response, or else the text, cut to a line.
std::string ShortReason(const std::string& text);

// LogLine returns the text for the system log: without its line end, and without `secret`
// wherever it occurs.
std::string LogLine(const std::string& text, const std::string& secret);
