// What the administrator gets to know of a failure.
#pragma once

#include <string>
#include <vector>

#include "failure.h"

// Redact returns a text without the given secrets, in any of the forms in which they are sent, and
// without anything that looks like a JSON Web Token. What is taken out is marked "[...]".
std::string Redact(const std::string& text, const std::vector<std::string>& secrets);

// IsLikeCode says whether a text could be an authorization code. The browser chooses the code of
// a request: what is a word of a message must not take that word out of the log.
bool IsLikeCode(const std::string& text);

// FindError returns the error of an OAuth error response, empty texts for anything else.
ProviderError FindError(const std::string& response);

// LogLine returns the line of the system log for a failed sign-in: at most some 2,000 bytes.
std::string LogLine(const Failure& failure, const std::string& reference,
                    const std::string& address, const std::string& profile);
