// The discovery document: what is read from it, and where the keys are then asked for.
#include "support/clients.h"
#include "support/independent.h"
#include "support/known.h"
#include "support/target.h"
#include "support/transport.h"

namespace {

const std::string& token() {
  static const std::string one = fuzz::rsaToken(R"({"alg":"RS256","kid":"key-1"})", fuzz::kClaims);
  return one;
}

// The URL that the keys were asked for at; what is left when nothing was asked is an error.
bool verified(const std::string& document) {
  fuzz::transport().answers = {fuzz::inChunks(document, 100), fuzz::inChunks(fuzz::keySet())};
  fuzz::Azure client(token());
  try {
    client.VerifyIDToken();
  } catch (const Json::LogicError&) {
    fuzz::require(fuzz::transport().requests.size() == 1, "an address that is not a text");
    return false;
  }
  return true;
}

}  // namespace

FUZZ_TARGET(discovery) {
  if (!verified(input)) return false;
  Json::Value document;
  const std::string url = fuzz::transport().requests.at(1).url;
  if (input.find('\0') == std::string::npos && fuzz::readJson(input, document)) {
    const bool text = document.isObject() && document["jwks_uri"].isString();
    fuzz::require(!text || url == fuzz::cString(document["jwks_uri"].asString()),
                  "keys from elsewhere");
  }
  return url == fuzz::kKeysURL;
}
