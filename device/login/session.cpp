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

std::string User(const cgi::Request& request) {
  return Sessions().Get(cgi::Value(request.cookies, kCookie)).value_or("");
}

std::string Close(const cgi::Request& request) {
  Sessions().Take(cgi::Value(request.cookies, kCookie));
  return cgi::Cookie(kCookie, "");
}

}  // namespace session
