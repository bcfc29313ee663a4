// The client of a Microsoft Azure AD tenant: ID tokens signed with RSA keys that the tenant
// publishes (RS256, RS384, RS512).
#pragma once

#include <json/value.h>

#include <string>

#include "sso/common.h"
#include "sso/sso.h"

namespace QOVA {
namespace SSO {

// Names of request and response parameters, in the order of the provider's protocol.
namespace azure {
using oauth::kClientID;
using oauth::kClientSecret;
using oauth::kCode;
using oauth::kExpiresIn;
using oauth::kGrantType;
using oauth::kNonce;
using oauth::kRedirectURI;
using oauth::kResponseType;
using oauth::kScope;
using oauth::kState;
using oauth::kTokenType;
constexpr char kExtExpiresIn[] = "ext_expires_in";
constexpr char kExpiresOn[] = "expires_on";
using oauth::kAccessToken;
using oauth::kIDToken;
using oauth::kRefreshToken;
using oauth::kStateAnswer;
constexpr char kPostLogoutRedirectURI[] = "post_logout_redirect_uri";

// Members of an error response.
constexpr char kError[] = "error";
constexpr char kErrorDescription[] = "error_description";
constexpr char kErrorCodes[] = "error_codes";
constexpr char kTimestamp[] = "timestamp";
constexpr char kTraceID[] = "trace_id";
constexpr char kCorrelationID[] = "correlation_id";

// Error codes that the provider may give under "error".
constexpr char kInvalidRequest[] = "invalid_request";
constexpr char kInvalidGrant[] = "invalid_grant";
constexpr char kUnauthorizedClient[] = "unauthorized_client";
constexpr char kInvalidClient[] = "invalid_client";
constexpr char kUnsupportedGrantType[] = "unsupported_grant_type";
constexpr char kInvalidResource[] = "invalid_resource";
constexpr char kInteractionRequired[] = "interaction_required";
constexpr char kTemporarilyUnavailable[] = "temporarily_unavailable";
}  // namespace azure

// AzureSSOClient takes its settings from "/usr/qova/etc/ssoclient/azure.conf", read once by the
// constructor under raised privileges. It keeps no more between calls than the code and the ID
// token of the login in progress.
class SSOCLIENT_API AzureSSOClient : public SSOClient {
 public:
  // Reads the settings. A missing, unreadable or malformed file gives a disabled client with
  // empty strings; a member of the wrong JSON type is ignored. Needs root as the real or saved
  // identity to read a file that only root can read; the effective ids are put back.
  AzureSSOClient();

  // VerifyIDToken checks the stored ID token: expiry, tenant, audience, then, with the key set
  // that the discovery document names, the signature. It does not check issuer and nonce.
  // Throws:
  // - std::invalid_argument "token cannot be empty", "bad jwt format!",
  //   "bad jwt header format!", "bad jwt body format!", "id_token expired.",
  //   "tenant ID invalid", "client ID invalid", "kid does not exist in Azure verified kyes",
  //   "RSA public 'n' cannot be found!", "RSA public 'e' cannot be found!"
  // - std::logic_error: the header or body segment is empty
  // - Json::LogicError: a member that is read as text is an array or an object
  // - JWT::jwt_not_support: the "alg" text and " algorithm is not supported"
  // - JWT::jwt_verify_failed "verify rsa signature failed"
  void VerifyIDToken() override;

  // GetIDTokenReqParams returns the form-encoded body of the code exchange (RFC 6749, section
  // 4.1.3), client secret included.
  std::string GetIDTokenReqParams() override;

  // GetUserName sets `user` to the local account of the stored ID token: "unique_name", or else
  // "email", account@dns.domain, as the platform's NetBIOS form DOMAIN\account. It does not
  // verify the token. Throws:
  // - std::invalid_argument "please request a id_token first.", "cannot find the user name!",
  //   "cannot get the user name!" (not exactly one "@"); `user` is unchanged
  // - sso_op_failed "QOVAWinsUserNameFqdn2Netbios failed."; `user` holds DNS.DOMAIN\account
  // - what the constructor and GetBody of JWT::Jwt throw
  void GetUserName(std::string& user) override;

  // ProcessTokenResponse stores the ID token of a token response (JSON, RFC 6749, section 5).
  // A token stored before is gone, whatever happens. Throws:
  // - std::invalid_argument "parse json falied"
  // - sso_err_resp, for an error response: the whole response on one line, with a line feed
  // - sso_err_resp "we cannot find key 'id_token' in response!"
  void ProcessTokenResponse(std::string response) override;

  virtual ~AzureSSOClient();

  // GetUserInfo replaces `info` with the claims of the stored ID token, without verifying it.
  // Throws std::invalid_argument "please request a id_token first.", and what the constructor
  // and GetBody of JWT::Jwt throw.
  void GetUserInfo(Json::Value& info);

  // RequestKeysInfo fetches the key set (RFC 7517) at `uri` into `keys`. Failures are written to
  // the system log and do not leave the function; `keys` is then null, or has no "keys".
  void RequestKeysInfo(std::string uri, Json::Value& keys);

  // GetAccessTokenReqURI returns the URL of an authorization request (RFC 6749, section 4.1.1)
  // with a fresh nonce. Its state is the base64 text of `params` (an object; anything else
  // counts as null) with the MD5 digest of the nonce as member "nonce". Throws sso_op_failed
  // "encode base64 failed." if the state is too long (765 bytes of JSON fit).
  std::string GetAccessTokenReqURI(const Json::Value& params);

  // RedirectAuthEndpoint writes "Location: ", the URL of GetAccessTokenReqURI and two line feeds
  // to std::cout, in one write, without flushing. This ends a CGI header: write others before.
  // Throws as GetAccessTokenReqURI does; nothing is written then.
  void RedirectAuthEndpoint(const Json::Value& params);

 private:
  std::string tenantID;
};

// GetAzureSSOLogoutURL returns the provider's end-session URL, which sends the browser back to
// the relay page of the site of `address` (the URL of the page that asked for the logout; a
// trailing "/index.cgi" or "/" is taken off). An empty address gives the configured logout
// endpoint alone. Reads the Azure settings as the constructor of AzureSSOClient does.
//
// Throws std::out_of_range for an address of 1 to 9 bytes.
SSOCLIENT_API std::string GetAzureSSOLogoutURL(const std::string& address);

}  // namespace SSO
}  // namespace QOVA
