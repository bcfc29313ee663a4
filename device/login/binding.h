// Ties a login to the browser that started it, without a word kept on the device.
//
// A login has a random name. It goes into the state, and into the name of a cookie whose value is
// the time and a seal of name, time and state. Whoever comes back with a state must bring its
// cookie too: a link with somebody else's code and state (login cross-site request forgery, code
// injection) is of no use in another browser. Each login has its own cookie, so that two tabs can
// sign in at once. A ticket serves once: those that were used are remembered while they are valid.
#pragma once

#include <json/value.h>

#include <ctime>
#include <string>
#include <vector>

#include "cgi.h"

namespace binding {

constexpr char kMember[] = "binding";  // the member of the state that holds the name

// Ticket is a login that came back in the browser that started it.
struct Ticket {
  Json::Value state;  // decoded, as it was sent
  std::string seal;
  time_t expiry;
  std::string expire;  // the text of the Set-Cookie header that deletes the cookie
};

// NewName returns a name for a login.
std::string NewName();

// Cookies returns the texts of the Set-Cookie headers for a login: its own cookie, and the deletion
// of the browser's oldest ones if it has too many.
std::vector<std::string> Cookies(const cgi::Request& request, const std::string& name,
                                 const std::string& state);

// Find returns the ticket of the request's state. Nothing is used up by it. Throws Failure if the
// login was not started in this browser, or long ago.
Ticket Find(const cgi::Request& request);

// Redeem uses a ticket up. Throws Failure if it was used before.
void Redeem(const Ticket& ticket);

}  // namespace binding
