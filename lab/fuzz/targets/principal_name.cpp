// The claim that names an Azure user, any bytes that JSON can carry.
#include "sso/common.h"

#include <json/writer.h>

#include <algorithm>

#include "support/clients.h"
#include "support/independent.h"
#include "support/target.h"

namespace {

std::string upper(std::string text) {
  for (char& c : text) c = c >= 'a' && c <= 'z' ? static_cast<char>(c - 'a' + 'A') : c;
  return text;
}

}  // namespace

FUZZ_TARGET(principal_name) {
  Json::Value claims;
  claims["unique_name"] = input;
  claims["email"] = "never@used";
  const std::string body = Json::writeString(Json::StreamWriterBuilder(), claims);
  Json::Value read;
  if (!fuzz::readJson(body, read)) return false;
  const std::string principal = read["unique_name"].asString();  // as UTF-8

  fuzz::Azure client("e30." + fuzz::base64url(body) + ".");
  std::string user = "nobody";
  const bool named =
      fuzz::returns({{typeid(std::invalid_argument), "cannot get the user name!"},
                     {typeid(QOVA::SSO::sso_op_failed), "QOVAWinsUserNameFqdn2Netbios failed."}},
                    [&] { client.GetUserName(user); });

  const bool split = std::count(principal.begin(), principal.end(), '@') == 1;
  fuzz::require(split || user == "nobody", "a user out of a name that is none");
  if (!split) return false;
  const std::size_t at = principal.find('@');
  const std::string expected = upper(principal.substr(at + 1)) + "\\" + principal.substr(0, at);
  fuzz::require(named == (fuzz::cString(expected).size() < 1023), "the platform's limit");
  fuzz::require(user == (named ? fuzz::cString(expected) : expected), "another user");
  return named;
}
