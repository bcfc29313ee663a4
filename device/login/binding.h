// Ties a login to the browser that started it.
//
// A random value goes into a cookie, and its digest into the state. Whoever comes back with a
// state must bring the cookie too: a link with somebody else's code and state (login cross-site
// request forgery, code injection) is of no use in another browser. Each cookie serves once.
//
// There is one cookie, so there is one login at a time: of two that are under way in two tabs, the
// first is refused when it comes back, and uses up the second one's ticket.
#pragma once

#include <json/value.h>

#include <string>

#include "cgi.h"

namespace binding {

// Ticket is one login that is about to start.
struct Ticket {
  std::string key;     // the random value; the browser's secret
  std::string digest;  // goes into the state as the member that kMember names
  std::string cookie;  // the text of the Set-Cookie header
};

constexpr char kMember[] = "binding";

// Issue makes a ticket.
Ticket Issue();

// Remember keeps a ticket until its login comes back. `state` is the state that was sent, or
// empty if the caller does not know it; if it is known, no other one will be accepted.
void Remember(const Ticket& ticket, const std::string& state);

// Redeem uses up the request's ticket and returns the decoded state. Throws std::runtime_error
// if the request has no ticket that waits, or the state is not the one that belongs to it.
Json::Value Redeem(const cgi::Request& request);

// Expire returns the header that deletes the cookie.
std::string Expire();

}  // namespace binding
