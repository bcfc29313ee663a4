// The device's own sessions. A firmware has these already: replace this unit by its own.
#pragma once

#include <string>

#include "cgi.h"

namespace session {

// Open starts a session for a user and returns its cookie, as the text of a Set-Cookie header.
std::string Open(const std::string& user);

// User returns whom the request's session belongs to; empty if it has none.
std::string User(const cgi::Request& request);

// Close ends the request's session and returns the header that deletes its cookie.
std::string Close(const cgi::Request& request);

}  // namespace session
