// The state that comes back with the code, and the relay URL made from it.
#include "sso/sso.h"

#include "support/independent.h"
#include "support/target.h"

namespace {

const std::string kStart = "ssoclient/relay.html#";
const std::string kEnd = "success=true";
const std::string kOrigin = "origin=";

// What is between start and end; never anything that could end the fragment or the line.
std::string between(const std::string& url) {
  fuzz::require(url.size() >= kStart.size() + kEnd.size(), "a short URL");
  fuzz::require(url.compare(0, kStart.size(), kStart) == 0, "another start");
  fuzz::require(url.compare(url.size() - kEnd.size(), kEnd.size(), kEnd) == 0, "another end");
  return url.substr(kStart.size(), url.size() - kStart.size() - kEnd.size());
}

}  // namespace

FUZZ_TARGET(relay_state) {
  const std::string middle = between(QOVA::SSO::GetSSORelayURL(true, input, "reason\r\n"));
  Json::Value parameters;
  const auto bytes = fuzz::strictBase64(input);
  const bool known = bytes && bytes->size() <= 1024 &&
                     fuzz::readJson(fuzz::cString(*bytes), parameters) && parameters.isObject();
  const bool hasOrigin = known && parameters["origin"].isString();
  if (hasOrigin) fuzz::require(!middle.empty(), "the origin was lost");
  if (middle.empty()) return false;

  fuzz::require(middle.compare(0, kOrigin.size(), kOrigin) == 0 && middle.back() == '&',
                "another parameter");
  const std::string value = middle.substr(kOrigin.size(), middle.size() - kOrigin.size() - 1);
  fuzz::require(fuzz::isEscaped(value), "an origin that is not encoded");
  if (hasOrigin) {
    fuzz::require(fuzz::percentDecoded(value) == fuzz::cString(parameters["origin"].asString()),
                  "another origin");
  }
  return true;
}
