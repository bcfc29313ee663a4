// A compact token, as it comes in a token response: split, read, and verified under the secret.
#include "sso/jwt.h"
#include "support/clients.h"
#include "support/independent.h"
#include "support/target.h"

namespace {

using QOVA::JWT::Jwt;

bool read(Jwt& jwt, Json::Value (Jwt::*part)(), const std::string& segment, const char* failure) {
  const bool empty = fuzz::cString(segment).empty();
  const std::vector<fuzz::Thrown> expected = {
      empty ? fuzz::Thrown{typeid(std::logic_error), ""}
            : fuzz::Thrown{typeid(std::invalid_argument), failure}};
  return fuzz::returns(expected, [&] { (jwt.*part)(); });
}

bool verifies(const std::string& token) {
  fuzz::WebSphere client(token);
  try {
    client.VerifyIDToken();
  } catch (const std::exception&) {
    return false;
  }
  fuzz::require(fuzz::isHonest(token), "a token that was not signed was accepted");
  return true;
}

}  // namespace

FUZZ_TARGET(token) {
  const auto three = fuzz::segments(input);
  bool both = false;
  const bool split = fuzz::returns({{typeid(std::invalid_argument), "bad jwt format!"}}, [&] {
    Jwt jwt(input);
    fuzz::require(!three.empty(), "not three segments");
    fuzz::require(jwt.GetSignature() == three[2], "another signature");
    const bool header = read(jwt, &Jwt::GetHeader, three[0], "bad jwt header format!");
    const bool body = read(jwt, &Jwt::GetBody, three[1], "bad jwt body format!");
    both = header && body;
  });
  fuzz::require(split == !three.empty(), "three segments refused");
  return verifies(input) && both;
}
