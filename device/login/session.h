// The device's own sessions. A firmware has these already: replace this unit by its own.
#pragma once

#include <ctime>
#include <optional>
#include <string>

#include "cgi.h"

struct Session {
  std::string user;
  time_t since;
  std::string token;  // what a form of the device's own pages sends along
};

namespace session {

// Open starts a session for a user and returns its cookie, as the text of a Set-Cookie header.
std::string Open(const std::string& user);

// Current returns the request's session.
std::optional<Session> Current(const cgi::Request& request);

// Close ends the request's session and returns the header that deletes its cookie.
std::string Close(const cgi::Request& request);

}  // namespace session
