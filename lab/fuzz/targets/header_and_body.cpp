// JSON of a token's header and body, rightly signed: what the claims alone decide.
#include <json/writer.h>

#include "sso/common.h"
#include "support/clients.h"
#include "support/independent.h"
#include "support/known.h"
#include "support/target.h"

namespace {

using namespace QOVA;

// Every way out that the claims can lead to. (The type of jsoncpp's error is not looked at.)
template <typename Client>
bool accepts(Client& client) {
  try {
    client.VerifyIDToken();
    return true;
  } catch (const JWT::jwt_exception&) {
  } catch (const SSO::sso_exception&) {
  } catch (const std::invalid_argument&) {
  } catch (const std::logic_error& e) {
    fuzz::require(std::string(e.what()).find("basic_string") == 0, "an unknown logic error");
  } catch (const Json::Exception&) {
  }
  return false;
}

// What the claims must say, by the other JSON reader.
void requireGoodClaims(const std::string& header, const std::string& body) {
  Json::Value head;
  Json::Value claims;
  if (!fuzz::readJson(fuzz::cString(header), head)) return;
  if (!fuzz::readJson(fuzz::cString(body), claims)) return;
  fuzz::require(fuzz::digestOf(fuzz::textOf(head, "alg")) != "", "an unknown algorithm");
  fuzz::require(fuzz::textOf(claims, "aud") == fuzz::kClientID, "another audience");
  const Json::Value& exp = claims["exp"];
  fuzz::require(!exp.isNumeric() || exp.asDouble() >= fuzz::kNow, "expired");
  fuzz::require(!exp.isBool() && !exp.isNull(), "no expiry");
}

// Its text, without comments: the two readers differ in the line ends of those, and in whether a
// number is signed.
std::string textWithoutComments(const Json::Value& value) {
  Json::StreamWriterBuilder builder;
  builder["commentStyle"] = "None";
  return Json::writeString(builder, value);
}

template <typename Client>
void requireSameClaims(Client& client, const std::string& body) {
  Json::Value info;
  Json::Value claims;
  client.GetUserInfo(info);
  if (fuzz::readJson(fuzz::cString(body), claims)) {
    fuzz::require(textWithoutComments(info) == textWithoutComments(claims), "other claims");
  }
}

bool named(fuzz::WebSphere& client, const std::string& body) {
  std::string user = "nobody";
  const bool found = fuzz::returns({{typeid(std::invalid_argument), "cannot find the user name!"}},
                                   [&] { client.GetUserName(user); });
  Json::Value claims;
  if (!found) fuzz::require(user == "nobody", "a user written before a failure");
  if (found && fuzz::readJson(fuzz::cString(body), claims)) {
    fuzz::require(user == fuzz::textOf(claims, "sub"), "another user");
  }
  return found;
}

}  // namespace

FUZZ_TARGET(header_and_body) {
  const auto part = fuzz::parts(input, 2);
  const std::string token = fuzz::hmacToken(part[0], part[1]);
  fuzz::Azure azure(token);
  fuzz::require(!accepts(azure), "accepted without a key set");
  fuzz::WebSphere websphere(token);
  if (!accepts(websphere)) return false;
  requireGoodClaims(part[0], part[1]);
  requireSameClaims(websphere, part[1]);
  return named(websphere, part[1]);
}
