#include "signin.h"

#include <exception>

#include "failure.h"
#include "identity.h"
#include "names.h"
#include "process.h"
#include "report.h"
#include "sso/azuresso.h"
#include "sso/sso.h"
#include "sso/utils.h"
#include "sso/webspheresso.h"
#include "state.h"

using namespace QOVA::SSO;

namespace {

std::string NameClaim(const AzureSSOClient&, const Json::Value& claims) {
  const std::string name = Member(claims, "unique_name");
  return claims["unique_name"].isString() ? name : Member(claims, "email");
}

std::string NameClaim(const WebSphereSSOClient&, const Json::Value& claims) {
  return Member(claims, "sub");
}

// Calls a step, and gives its exceptions a code and a text without secrets.
template <class Step>
void Guard(FailureCode code, const std::vector<std::string>& secrets, const std::string& response,
           const Step& step) {
  try {
    step();
  } catch (const Failure&) {
    throw;
  } catch (const std::exception& error) {
    const ProviderError provider = FindError(response);
    throw Failure(code, Redact(error.what(), secrets),
                  {Redact(provider.error, secrets), Redact(provider.description, secrets)});
  }
}

// The ID token must be the answer to the very request whose state came back.
void CheckNonce(const Json::Value& claims, const Json::Value& state) {
  const std::string digest = MD5Digest(Member(claims, "nonce"));
  if (digest.empty() || digest != Member(state, "nonce")) {
    throw Failure(FailureCode::kNotVerified, "nonce does not belong to this login");
  }
}

// What OpenIDConnectLogin does, step by step: with the checks that it leaves to its caller, and a
// look at the provider's answer, which the WebSphere client drops when it is an error.
template <class Client>
SignedIn SignInWith(const SignIn& work) {
  Loaded<Client> client;
  DropRoot();
  process::DieWithParent(work.parent);
  std::vector<std::string> secrets = {client->GetClientSecret()};
  if (IsLikeCode(work.code)) secrets.push_back(work.code);

  std::string response;
  std::string user;
  Json::Value claims;
  client->SetCode(work.code);
  client->RequestTokenEndpoint(response, client->GetIDTokenReqParams());
  const FailureCode code =
      response.empty() ? FailureCode::kUnreachable : FailureCode::kProviderError;
  Guard(code, secrets, response, [&] { client->ProcessTokenResponse(response); });
  Guard(FailureCode::kNotVerified, secrets, "", [&] {
    client->VerifyIDToken();
    client->GetUserInfo(claims);
    if (work.settings.nonce_check) CheckNonce(claims, work.state);
  });
  Guard(FailureCode::kUnknownUser, secrets, "", [&] {
    // The platform may cut what it gets: the claim is checked before, the name behind it.
    if (const std::string claim = NameClaim(*client, claims); !claim.empty()) {
      CheckUserName(claim, "claim");
    }
    client->GetUserName(user);
    CheckUserName(user, "on this device");
    LookUp(user, work.settings);
  });
  return {user, client->GetToken()};
}

}  // namespace

SignedIn Run(const SignIn& work) {
  if (work.profile == "azure") return SignInWith<AzureSSOClient>(work);
  if (work.profile == "websphere") return SignInWith<WebSphereSSOClient>(work);
  throw Failure(FailureCode::kNotSetUp, "profile not support.");
}
