#include "binding.h"

#include <stdexcept>

#include "sso/utils.h"
#include "state.h"
#include "store.h"

namespace binding {
namespace {

// The prefix makes browsers refuse the cookie from any other host, path or transport.
constexpr char kCookie[] = "__Host-login";

// A person has ten minutes to type name and password.
Store Tickets() {
  return Store("tickets", 600, 1000);
}

// MD5 will do: the key is 256 random bits, and nobody can choose it.
std::string Digest(const std::string& key) {
  return QOVA::SSO::MD5Digest(key);
}

}  // namespace

Ticket Issue() {
  const std::string key = Store::NewKey();
  return {key, Digest(key), cgi::Cookie(kCookie, key)};
}

void Remember(const Ticket& ticket, const std::string& state) {
  Tickets().Put(ticket.key, state);
}

Json::Value Redeem(const cgi::Request& request) {
  const std::string key = cgi::Value(request.cookies, kCookie);
  const std::optional<std::string> sent = Tickets().Take(key);
  if (!sent) throw std::runtime_error("login was not started in this browser, or is used up");
  const std::string state = cgi::Value(request.query, "state");
  const Json::Value decoded = DecodeState(state);
  const std::string digest = Member(decoded, kMember);
  if (digest.empty() || digest != Digest(key) || (!sent->empty() && *sent != state)) {
    throw std::runtime_error("state does not belong to this login");
  }
  return decoded;
}

std::string Expire() {
  return cgi::Cookie(kCookie, "");
}

}  // namespace binding
