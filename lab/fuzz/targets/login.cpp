// All that a provider says during a login. Parts: "azure" or "websphere", token response,
// discovery document, key set. Only the user that the honest provider signed for gets in.
#include "sso/common.h"
#include "sso/sso.h"

#include "support/device.h"
#include "support/independent.h"
#include "support/known.h"
#include "support/target.h"
#include "support/transport.h"

namespace {

using namespace QOVA;

bool signsIn(std::string* user) {
  try {
    SSO::OIDCLogin("code-1", *user);
    return true;
  } catch (const SSO::sso_exception&) {
  } catch (const JWT::jwt_exception&) {
  } catch (const std::logic_error&) {  // std::invalid_argument is one
  } catch (const Json::Exception&) {
  }
  return false;
}

// Whether plain OpenSSL finds the token signed: under the secret, or under the key that the key set
// holds for it. Texts that the other JSON reader cannot read count as unknown, hence as signed.
bool isSignedFor(const std::string& response, const std::string& keys) {
  Json::Value document;
  Json::Value set;
  if (!fuzz::readJson(response, document)) return true;
  const std::string token = fuzz::textOf(document, "id_token");
  if (keys.empty()) return fuzz::isHonest(token);
  if (!fuzz::readJson(keys, set)) return true;
  for (const Json::Value& key : set["keys"]) {
    if (fuzz::isSigned(token, fuzz::textOf(key, "n"), fuzz::textOf(key, "e"))) return true;
  }
  return false;
}

}  // namespace

FUZZ_TARGET(login) {
  const auto part = fuzz::parts(input, 4);
  const bool websphere = part[0] == "websphere";
  fuzz::writeSettings();
  fuzz::device().files["profile.conf"] = R"({"sso_enable":true,"sso_profile":")" +
                                         std::string(websphere ? "websphere" : "azure") + R"("})";
  const fuzz::Answer response = fuzz::inChunks(part[1], 1000);
  const fuzz::Answer keys = fuzz::inChunks(part[3], 100);
  fuzz::transport().answers = {response, fuzz::inChunks(part[2]), keys};
  std::string user = "nobody";
  if (!signsIn(&user)) return false;
  const std::string set = websphere ? "" : fuzz::received(keys);
  fuzz::require(isSignedFor(fuzz::received(response), set), "a token that was not signed");
  fuzz::require(fuzz::transport().requests.size() == (websphere ? 1 : 3), "other requests");
  if (websphere) fuzz::require(user == fuzz::kWebSphereUser, "somebody else was signed in");
  return user == (websphere ? fuzz::kWebSphereUser : fuzz::kAzureUser);
}
