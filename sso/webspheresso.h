// The client of an IBM WebSphere OpenID Connect provider: ID tokens signed with HMAC under the
// client secret (HS256, HS384, HS512).
#pragma once

#include <json/value.h>

#include <string>

#include "sso/common.h"
#include "sso/sso.h"

namespace QOVA {
namespace SSO {

// Names of request and response parameters, in the order of the provider's protocol.
namespace websphere {
using oauth::kAccessToken;
using oauth::kClientID;
using oauth::kClientSecret;
using oauth::kCode;
using oauth::kExpiresIn;
using oauth::kGrantType;
using oauth::kIDToken;
using oauth::kNonce;
using oauth::kRedirectURI;
using oauth::kRefreshToken;
using oauth::kResponseType;
using oauth::kScope;
using oauth::kState;
using oauth::kStateAnswer;
using oauth::kTokenType;
}  // namespace websphere

// WebSphereSSOClient takes its settings from "/usr/qova/etc/ssoclient/websphere.conf", read once
// by the constructor under raised privileges. The file has no enable switch: isEnable() is
// always false, and the profile file alone says whether single sign-on is on.
class SSOCLIENT_API WebSphereSSOClient : public SSOClient {
 public:
  // Reads the settings. A missing, unreadable or malformed file gives empty strings; a member of
  // the wrong JSON type is ignored. Identities are as for AzureSSOClient.
  WebSphereSSOClient();

  // VerifyIDToken checks the stored ID token: expiry, audience, then the signature under the
  // client secret. It does not check issuer and nonce. Throws:
  // - std::invalid_argument "token cannot be empty", "bad jwt format!",
  //   "bad jwt header format!", "bad jwt body format!", "id_token expired.",
  //   "client ID invalid"
  // - std::logic_error: the header or body segment is empty
  // - Json::LogicError: a member that is read as text is an array or an object
  // - JWT::jwt_not_support: the "alg" text and " algorithm is not supported"
  // - sso_op_failed "encode base64 failed.": the client secret is too long (765 bytes fit)
  // - JWT::jwt_verify_failed "verify hmac signature failed"
  void VerifyIDToken() override;

  // GetIDTokenReqParams returns the form-encoded body of the code exchange (RFC 6749, section
  // 4.1.3), client secret included.
  std::string GetIDTokenReqParams() override;

  // GetUserName sets `user` to the "sub" claim of the stored ID token. It does not verify the
  // token. Throws std::invalid_argument "please request a id_token first." or
  // "cannot find the user name!", and what the constructor and GetBody of JWT::Jwt throw.
  void GetUserName(std::string& user) override;

  // ProcessTokenResponse stores the ID token of a token response (JSON, RFC 6749, section 5).
  // A token stored before is gone, whatever happens. Throws:
  // - std::invalid_argument "parse json falied"
  // - sso_err_resp "we cannot find key 'id_token' in response!", for error responses too
  void ProcessTokenResponse(std::string response) override;

  virtual ~WebSphereSSOClient();

  // GetUserInfo replaces `info` with the claims of the stored ID token, without verifying it.
  // Throws std::invalid_argument "please request a id_token first.", and what the constructor
  // and GetBody of JWT::Jwt throw.
  void GetUserInfo(Json::Value& info);

  // GetAccessTokenReqURI returns the URL of an authorization request, as for AzureSSOClient but
  // with the scope "openid profile email". Throws sso_op_failed "encode base64 failed.".
  std::string GetAccessTokenReqURI(const Json::Value& stateInfo);

  // RedirectAuthEndpoint writes the CGI redirect header, as for AzureSSOClient.
  void RedirectAuthEndpoint(const Json::Value& stateInfo);
};

}  // namespace SSO
}  // namespace QOVA
