// A program as a firmware engineer would write it, against the installed library alone.
#include <iostream>

#include "sso/azuresso.h"
#include "sso/jwt.h"
#include "sso/profile.h"
#include "sso/sso.h"
#include "sso/utils.h"
#include "sso/webspheresso.h"

int main() {
  using namespace QOVA::SSO;
  std::string user;
  try {
    OIDCLogin("code", user);
  } catch (const sso_op_failed& e) {
    std::cout << GetSSORelayURL(false, "", URLEncode(e.what())) << '\n';
  }
  AzureSSOClient azure;
  WebSphereSSOClient websphere;
  SSOProfile profile;
  Json::Value state(Json::objectValue);
  state["origin"] = "/webman/";
  const bool built = azure.GetAccessTokenReqURI(state).rfind("?client_id=&nonce=", 0) == 0 &&
                     websphere.GetAccessTokenReqURI(state).rfind("?client_id=&nonce=", 0) == 0;
  return built && !profile.SSOIsEnable() && user.empty() && MD5Digest("").size() == 32 &&
                 QOVA::JWT::Jwt("a.b.c").GetSignature() == "c"
             ? 0
             : 1;
}
