// The device's own sessions. A firmware has these already: replace this unit by its own.
//
// A session is a file that only root can write, named by the digest of the browser's cookie: who
// can read the folder learns who is signed in, and can neither take a session over nor make one.
#pragma once

#include <ctime>
#include <optional>
#include <string>

#include "cgi.h"
#include "settings.h"

struct Session {
  std::string user;
  time_t since;
  std::string token;  // what a form of the device's own pages sends along
};

namespace session {

// Open starts a session for a user, in place of the one that the browser had, and returns its
// cookie, as the text of a Set-Cookie header. If there are too many, the oldest one ends.
std::string Open(const cgi::Request& request, const std::string& user, const Settings& settings);

// Current returns the request's session. It needs no rights but those of the web server.
std::optional<Session> Current(const cgi::Request& request, const Settings& settings);

// Token returns the form token that belongs to the request's cookie; empty without a cookie. A
// page of another site can send the cookie, but cannot know the token.
std::string Token(const cgi::Request& request);

// Close ends the request's session and returns the header that deletes its cookie.
std::string Close(const cgi::Request& request);

}  // namespace session
