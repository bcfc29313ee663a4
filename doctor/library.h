// The questions that the doctor asks the library, each through the exported API alone.
#pragma once

#include <json/value.h>

#include <functional>
#include <string>

#include "doctor/ask.h"
#include "sso/sso.h"

namespace doctor {

enum class Provider { kNone, kAzure, kWebSphere };

Provider ProviderOf(const std::string& profile);

// Settings are the chosen provider's, as the library's accessors give them.
struct Settings {
  std::string client_id;
  std::string client_secret;
  std::string redirect_uri;
  std::string authorization_endpoint;
  std::string token_endpoint;
  std::string logout_endpoint;
  std::string wellknown;
};

class Library {
 public:
  // No question takes longer than `seconds`.
  explicit Library(int deadline) : seconds(deadline) {}

  void Choose(Provider chosen) { provider = chosen; }

  Settings ReadSettings() const;

  // OIDCLogin, for a profile file that keeps it from going on to the provider. With any other it
  // is not called and nothing is thrown: it would send the client secret.
  Reply Login(const Caller* caller = nullptr) const;

  // SSOProfile, which reads the profile file with raised privileges.
  Reply Profile(const Caller* caller = nullptr) const;

  // Posts `body` to the token endpoint and processes the answer. The empty body carries no
  // credentials.
  Reply TokenRequest(const std::string& body) const;
  // The body of a code exchange, client secret included, with a code that no provider gave out.
  std::string ExchangeBody() const;
  // The authorization endpoint with the query of a sign-in.
  std::string AuthorizationRequest() const;

  Reply Split(const std::string& token) const;   // Jwt: {"header", "body", "signature"}
  Reply Header(const std::string& token) const;  // Jwt::GetHeader
  Reply Body(const std::string& token) const;    // Jwt::GetBody

  // VerifyIDToken for a token that came as a provider's answer. Offline the Azure client finds
  // no discovery document, and so no key.
  Reply Verify(const std::string& token) const;
  Reply VerifyOffline(const std::string& token) const;

  // The signature alone.
  Reply VerifyRSA(const std::string& token, const std::string& n, const std::string& e,
                  const std::string& algorithm) const;
  Reply VerifyHMAC(const std::string& token, const std::string& secret,
                   const std::string& algorithm) const;

  Reply UserName(const std::string& token) const;  // GetUserName; the result is the name
  // Winbind, if the library converts names with it: {"ping": true} and, of a user DOMAIN\account,
  // {"known": true}; null without winbind.
  Reply Winbind(const std::string& user) const;

 private:
  // Asks a new client of the provider.
  Reply AskClient(const std::function<Json::Value(QOVA::SSO::SSOClient&)>& question) const;

  int seconds;
  Provider provider = Provider::kNone;
};

}  // namespace doctor
