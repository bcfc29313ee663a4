// What all units of the library share: the export mark, the exception classes through which
// every failure reaches the caller, and the keys of the profile file.
//
// Every header of a unit includes this one.
#pragma once

#include <stdexcept>
#include <string>

#if defined(__GNUC__)
#define SSOCLIENT_API __attribute__((visibility("default")))
#else
#define SSOCLIENT_API
#endif

namespace QOVA {

namespace SSO {

// sso_exception is the root of the single-sign-on errors. It is thrown itself for a profile
// that is not supported ("profile not support.").
class SSOCLIENT_API sso_exception : public std::runtime_error {
 public:
  explicit sso_exception(const std::string& message);
  ~sso_exception() override;
};

// sso_err_resp: the remote side failed or answered badly (transport failure, unparsable or
// error response).
class SSOCLIENT_API sso_err_resp : public sso_exception {
 public:
  explicit sso_err_resp(const std::string& message);
  ~sso_err_resp() override;
};

// sso_op_failed: a local operation or precondition failed (configuration, state).
class SSOCLIENT_API sso_op_failed : public sso_exception {
 public:
  explicit sso_op_failed(const std::string& message);
  ~sso_op_failed() override;
};

// sso_not_implemented: a hook of SSOClient that the provider client did not override.
class SSOCLIENT_API sso_not_implemented : public sso_exception {
 public:
  explicit sso_not_implemented(const std::string& message);
  ~sso_not_implemented() override;
};

// The profile file, its keys, and the profile names. Constants here and in the providers'
// headers have internal linkage: each unit holds its own, and none is built at load time.
constexpr char kProfilePath[] = "/usr/qova/etc/ssoclient/profile.conf";
constexpr char kEnableKey[] = "sso_enable";
constexpr char kProfileKey[] = "sso_profile";
constexpr char kAzureProfile[] = "azure";
constexpr char kWebSphereProfile[] = "websphere";
constexpr const char* kSupportedProfiles[] = {kAzureProfile, kWebSphereProfile};

// Names of OAuth 2.0 (RFC 6749) and OpenID Connect parameters that both providers use. The
// providers' headers list them in the order of their own protocol.
namespace oauth {
constexpr char kResponseType[] = "response_type";
constexpr char kScope[] = "scope";
constexpr char kRedirectURI[] = "redirect_uri";
constexpr char kClientID[] = "client_id";
constexpr char kNonce[] = "nonce";
constexpr char kState[] = "state";
constexpr char kGrantType[] = "grant_type";
constexpr char kCode[] = "code";
constexpr char kClientSecret[] = "client_secret";
constexpr char kTokenType[] = "token_type";
constexpr char kExpiresIn[] = "expires_in";
constexpr char kAccessToken[] = "access_token";
constexpr char kRefreshToken[] = "refresh_token";
constexpr char kIDToken[] = "id_token";
constexpr char kStateAnswer[] = "state";  // the state as it comes back with the code
}  // namespace oauth

}  // namespace SSO

namespace JWT {

// jwt_exception is the root of the JSON Web Token errors. It is not an sso_exception.
class SSOCLIENT_API jwt_exception : public std::runtime_error {
 public:
  explicit jwt_exception(const std::string& message);
  ~jwt_exception() override;
};

// jwt_not_support: the token's algorithm is not supported.
class SSOCLIENT_API jwt_not_support : public jwt_exception {
 public:
  explicit jwt_not_support(const std::string& message);
  ~jwt_not_support() override;
};

// jwt_verify_failed: the token's signature did not verify.
class SSOCLIENT_API jwt_verify_failed : public jwt_exception {
 public:
  explicit jwt_verify_failed(const std::string& message);
  ~jwt_verify_failed() override;
};

}  // namespace JWT

}  // namespace QOVA
