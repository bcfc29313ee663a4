#include "binding.h"

#include <cstdlib>

#include "failure.h"
#include "random.h"
#include "redeemed.h"
#include "seal.h"
#include "state.h"

namespace binding {
namespace {

// The prefix makes browsers refuse the cookie from any other host, path or transport.
const std::string kPrefix = "__Host-login-";

constexpr size_t kNameSize = 16;
constexpr int kLifetime = 600;  // seconds: a person has ten minutes to type name and password
constexpr size_t kMostCookies = 8;

bool IsHex(const std::string& text, size_t size) {
  return text.size() == size && text.find_first_not_of("0123456789abcdef") == std::string::npos;
}

std::string SealOf(const std::string& name, const std::string& time, const std::string& state) {
  return Seal("login " + name + " " + time + " " + state);
}

// When a ticket was made, by its cookie's word.
time_t TimeOf(const std::string& cookie) {
  return static_cast<time_t>(std::strtoll(cookie.c_str(), nullptr, 10));
}

[[noreturn]] void Refuse(const char* text) {
  throw Failure(FailureCode::kExpired, text);
}

}  // namespace

std::string NewName() {
  return Hex(RandomBytes(kNameSize / 2));
}

std::vector<std::string> Cookies(const cgi::Request& request, const std::string& name,
                                 const std::string& state) {
  std::multimap<time_t, std::string> others;
  for (const auto& [cookie, value] : request.cookies) {
    if (cookie.compare(0, kPrefix.size(), kPrefix) == 0) others.emplace(TimeOf(value), cookie);
  }
  std::vector<std::string> cookies;
  for (auto oldest = others.begin(); others.size() - cookies.size() >= kMostCookies; ++oldest) {
    cookies.push_back(cgi::Cookie(oldest->second, ""));
  }
  const std::string time = std::to_string(std::time(nullptr));
  cookies.push_back(cgi::Cookie(kPrefix + name, time + "-" + SealOf(name, time, state), kLifetime));
  return cookies;
}

Ticket Find(const cgi::Request& request) {
  const std::string state = cgi::Value(request.query, "state");
  const Json::Value decoded = DecodeState(state);
  const std::string name = Member(decoded, kMember);
  if (!IsHex(name, kNameSize)) Refuse("state does not belong to a login of this device");
  const std::string cookie = cgi::Value(request.cookies, kPrefix + name);
  if (cookie.empty()) Refuse("login was not started in this browser, or is used up");
  const std::string time = cookie.substr(0, cookie.find('-'));
  const std::string seal = SealOf(name, time, state);
  if (!SameText(cookie, time + "-" + seal)) Refuse("state does not belong to this login");
  const time_t made = TimeOf(time);
  const time_t now = std::time(nullptr);
  if (now > made + kLifetime || now < made - kLifetime) Refuse("login was started too long ago");
  return {decoded, seal, made + kLifetime, cgi::Cookie(kPrefix + name, "")};
}

void Redeem(const Ticket& ticket) {
  if (!UseUp(ticket.seal, ticket.expiry)) Refuse("login is used up");
}

}  // namespace binding
