// A key set, and a token that is verified with it.
#include "sso/common.h"
#include "support/clients.h"
#include "support/independent.h"
#include "support/known.h"
#include "support/target.h"
#include "support/transport.h"

namespace {

using namespace QOVA;

const std::string& token() {
  static const std::string one = fuzz::rsaToken(R"({"alg":"RS256","kid":"key-1"})", fuzz::kClaims);
  return one;
}

bool accepts(fuzz::Azure& client) {
  try {
    client.VerifyIDToken();
    return true;
  } catch (const JWT::jwt_verify_failed&) {
  } catch (const std::invalid_argument&) {
  } catch (const Json::LogicError&) {
  }
  return false;
}

// The first key of that name, by the other JSON reader; null if there is none, or if a name is not
// one that this reader is sure about.
Json::Value firstKey(const Json::Value& set) {
  if (!set.isObject() || !set["keys"].isArray()) return {};
  for (const Json::Value& key : set["keys"]) {
    if (!key.isObject() || !key.isMember("kid")) continue;
    if (!key["kid"].isString()) return {};
    if (key["kid"].asString() == fuzz::kKeyID) return key;
  }
  return {};
}

// What plain OpenSSL says of the token and that key.
bool verifies(const Json::Value& key) {
  const auto three = fuzz::segments(token());
  const auto n = fuzz::strictBase64url(fuzz::cString(fuzz::textOf(key, "n")));
  const auto e = fuzz::strictBase64url(fuzz::cString(fuzz::textOf(key, "e")));
  return n && e && !n->empty() && !e->empty() &&
         fuzz::verifyRsa(*n, *e, "SHA256", three[0] + "." + three[1], fuzz::decoded(three[2]));
}

}  // namespace

FUZZ_TARGET(key_set) {
  fuzz::transport().answers = {fuzz::inChunks(fuzz::kDiscovery), fuzz::inChunks(input, 700)};
  fuzz::Azure client(token());
  const bool accepted = accepts(client);
  const auto& requests = fuzz::transport().requests;
  fuzz::require(requests.size() == 2 && requests[0].url == fuzz::kWellknownURL &&
                    requests[1].url == fuzz::kKeysURL,
                "other requests");
  fuzz::require(
      !requests[0].post && !requests[1].post && requests[0].verified && requests[1].verified,
      "requests of another kind");

  Json::Value set;
  const bool whole = input.find('\0') == std::string::npos && fuzz::readJson(input, set);
  const Json::Value key = whole ? firstKey(set) : Json::Value();
  if (!key.isNull() && verifies(key)) fuzz::require(accepted, "the right key was refused");
  if (accepted && !key.isNull()) {
    const bool strict = fuzz::strictBase64url(fuzz::textOf(key, "n")).has_value() &&
                        fuzz::strictBase64url(fuzz::textOf(key, "e")).has_value();
    fuzz::require(!strict || verifies(key), "a wrong key was accepted");
  }
  return accepted;
}
