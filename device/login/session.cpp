#include "session.h"

#include "store.h"

namespace session {
namespace {

// The prefix makes browsers refuse the cookie from any other host, path or transport.
constexpr char kCookie[] = "__Host-session";

Store Sessions() {
  return Store("sessions", 12 * 3600, 1000);
}

}  // namespace

std::string Open(const std::string& user) {
  const std::string key = Store::NewKey();
  Sessions().Put(key, user);
  return cgi::Cookie(kCookie, key);
}

std::optional<Session> Current(const cgi::Request& request) {
  const std::optional<std::string> user = Sessions().Get(cgi::Value(request.cookies, kCookie));
  if (!user) return std::nullopt;
  return Session{*user, time(nullptr), ""};
}

std::string Close(const cgi::Request& request) {
  Sessions().Take(cgi::Value(request.cookies, kCookie));
  return cgi::Cookie(kCookie, "");
}

}  // namespace session
