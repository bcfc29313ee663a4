// The base class of the provider clients, and the two entry functions of a login program.
#pragma once

#include <json/value.h>

#include <string>

#include "sso/common.h"

namespace QOVA {
namespace SSO {

// SSOClient holds the settings of an OpenID Connect relying party, talks to the discovery and
// token endpoints, and runs the login sequence of the authorization-code flow (OpenID Connect
// Core 1.0, section 3.1) over four hooks that a provider client overrides.
//
// Construct a provider client (AzureSSOClient, WebSphereSSOClient), not this class.
//
// The destructor is not virtual, and that is part of the ABI: the dispatch table holds exactly
// the 18 operations below, in this order. Destroy a provider client through its own type,
// never through a pointer to SSOClient.
#if defined(__GNUC__)
#pragma GCC diagnostic push
// A virtual destructor would take a slot in the table that device programs were built against.
#pragma GCC diagnostic ignored "-Wnon-virtual-dtor"
#endif
class SSOCLIENT_API SSOClient {
 public:
  // Single sign-on is off and every string is empty.
  SSOClient();
  SSOClient(const SSOClient& other);
  SSOClient(SSOClient&& other) noexcept;
  SSOClient& operator=(const SSOClient& other);
  SSOClient& operator=(SSOClient&& other) noexcept;
  ~SSOClient();

  // Accessors: each returns its own copy of the setting; none fails.
  virtual bool isEnable();                     // single sign-on is enabled for this provider
  virtual std::string GetClientID();           // OAuth client identifier
  virtual std::string GetClientSecret();       // OAuth client secret
  virtual std::string GetRedirectURI();        // this device's redirect URI
  virtual std::string GetToken();              // the ID token, in compact form; empty before login
  virtual std::string GetAuthEndpoint();       // URL of the authorization endpoint
  virtual std::string GetTokenEndpoint();      // URL of the token endpoint
  virtual std::string GetWellknownEndpoint();  // URL of the discovery document
  virtual std::string GetLogoutEndpoint();     // URL of the end-session endpoint

  // Setters: plain assignments, without a check.
  virtual void SetRedirectURI(std::string uri);
  virtual void SetCode(std::string code);  // the authorization code of the login in progress

  // RequestWellknownInfo fetches the discovery document (OpenID Connect Discovery 1.0) from the
  // well-known endpoint and parses it into `out`. Failures of the transport and of parsing are
  // written to the system log and do not leave the function: look for the members you need.
  virtual void RequestWellknownInfo(Json::Value& out);

  // RequestTokenEndpoint posts `params`, a form-encoded body, to the token endpoint and appends
  // the body of the answer to `response`, whatever its HTTP status. Failures of the transport are
  // written to the system log and do not leave the function.
  virtual void RequestTokenEndpoint(std::string& response, const std::string& params);

  // The hooks of a provider client. Here each throws sso_not_implemented with its name and
  // " not implemented", for example "VerifyIDToken not implemented".
  virtual void VerifyIDToken();               // returns if the stored ID token can be trusted
  virtual std::string GetIDTokenReqParams();  // the form-encoded body of the code exchange
  virtual void GetUserName(std::string& user);
  virtual void ProcessTokenResponse(std::string response);  // stores the ID token of an answer

  // OpenIDConnectLogin turns an authorization code into the name of the user to sign in, by
  // calling SetCode, GetIDTokenReqParams, RequestTokenEndpoint, ProcessTokenResponse,
  // VerifyIDToken and GetUserName. It catches nothing: the exception of a hook ends the
  // sequence. `user` is written by GetUserName alone.
  virtual void OpenIDConnectLogin(std::string code, std::string& user);

 protected:
  bool enable = false;
  std::string clientID;
  std::string clientSecret;
  std::string redirectURI;
  std::string authEndpoint;
  std::string tokenEndpoint;
  std::string logoutEndpoint;
  std::string wellknownEndpoint;
  std::string code;
  std::string token;
};
#if defined(__GNUC__)
#pragma GCC diagnostic pop
#endif

// OIDCLogin signs a user in from the authorization code that the provider gave the redirect
// URI. On success `user` holds the name under which the device signs the user in.
//
// It reads "/usr/qova/etc/ssoclient/profile.conf" with the caller's own privileges, and uses
// its "sso_enable" alone, not isEnable() of the client. Throws:
// - sso_op_failed "read profile file failed.": the file is missing, unreadable or not JSON
// - sso_op_failed "sso does not enable.": "sso_enable" is not the boolean true
// - sso_op_failed "not specify sso profile": "sso_profile" is not a string
// - sso_exception "profile not support.": "sso_profile" is neither "azure" nor "websphere"
// - what OpenIDConnectLogin of the provider's client throws
SSOCLIENT_API void OIDCLogin(const std::string& code, std::string& user);

// GetSSORelayURL returns the relative URL of the relay page, with the outcome of a login in its
// fragment.
//
// On success `state` is the value that came back with the code (base64 of a JSON object); its
// member "origin", if it is a string, is carried along, URL-encoded. On failure `reason`, if it
// is not empty, is carried along AS IT IS: encode it first if it may hold more than plain
// letters. Does not fail; a state without a usable origin gives none.
SSOCLIENT_API std::string GetSSORelayURL(bool success, const std::string& state,
                                         const std::string& reason);

}  // namespace SSO
}  // namespace QOVA
