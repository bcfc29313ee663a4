// Whole logins over HTTPS: a provider, a device that is configured for it, and the token that the
// provider gives for the code.
#pragma once

#include <curl/curl.h>
#include <gtest/gtest.h>
#include <json/value.h>
#include <syslog.h>

#include <memory>
#include <string>
#include <utility>

#include "sso/sso.h"
#include "support/ca.h"
#include "support/device.h"
#include "support/log.h"
#include "support/provider.h"
#include "support/throws.h"

namespace test {

class Login : public testing::Test {
 protected:
  static constexpr char kDiscovery[] = "/tenant/v2.0/.well-known/openid-configuration";

  // `clientName` is the profile, and the prefix of the settings.
  explicit Login(std::string clientName) : name(std::move(clientName)) {
    authority.trust();
    writeConfig("profile.conf", R"({"sso_enable":true, "sso_profile":")" + name + "\"}", 0644);
    body["exp"] = Json::Int64{4102444800};
    body["aud"] = "the device";
  }

  // The ID token of `header` and `body`, signed.
  virtual std::string token() const = 0;
  // What else the provider answers, and further settings.
  virtual void prepare(Json::Value& /*settings*/) {}

  static Answer tokenResponse(const std::string& token) {
    Json::Value response;
    response["token_type"] = "Bearer";
    response["access_token"] = "opaque";
    response["id_token"] = token;
    return ok(response.toStyledString());
  }

  // Starts a provider that gives this answer to the code exchange, and points the device at it.
  void provide(const Identity& identity, const Answer& response) {
    provider = std::make_unique<Provider>(identity);
    provider->answer("/token", response);
    Json::Value settings;
    settings[name + "_wellknown"] = provider->url(kDiscovery);
    settings[name + "_token_endpoint"] = provider->url("/token");
    settings[name + "_client_id"] = "the device";
    settings[name + "_client_secret"] = secret;
    settings[name + "_redirect_uri"] = "https://device.example.net/login";
    prepare(settings);
    provider->start();
    writeConfig(name + ".conf", settings.toStyledString());
    log.clear();
  }
  void provide(const Answer& response) { provide(authority.issue({"localhost"}), response); }
  void provideToken() { provide(tokenResponse(token())); }

  // A device whose token endpoint is a port on which no server listens.
  void provideNothing() {
    provideToken();
    Json::Value settings;
    settings[name + "_token_endpoint"] =
        "https://localhost:" + std::to_string(unusedPort()) + "/token";
    writeConfig(name + ".conf", settings.toStyledString());
  }

  // A login that fails with this exception, after so many requests.
  template <typename Error>
  void expectRefused(const std::string& message, std::size_t requests) {
    EXPECT_TRUE(throws<Error>(message, [&] { QOVA::SSO::OIDCLogin("the code", user); }));
    EXPECT_EQ(user, "before");
    EXPECT_EQ(provider->requests().size(), requests);
  }

  // The log line of a code exchange that failed.
  static Expected exchangeLine(CURLcode code) {
    return {LOG_ERR, "sso.cpp", std::string("request token uri ") + curl_easy_strerror(code) + "."};
  }

  std::string host() const {
    return "Host: localhost:" + std::to_string(provider->port()) + "\r\n";
  }

  // The request that exchanges the code "0.AX&y=/+", byte for byte.
  std::string codeExchange() const {
    const std::string form =
        "client_id=the%20device&client_secret=s3cr%26t&code=0.AX%26y%3D%2F%2B"
        "&grant_type=authorization_code&redirect_uri=https%3A%2F%2Fdevice.example.net%2Flogin";
    return "POST /token HTTP/1.1\r\n" + host() +
           "Accept: */*\r\nContent-Length: " + std::to_string(form.size()) +
           "\r\nContent-Type: application/x-www-form-urlencoded\r\n\r\n" + form;
  }

  // A login under a saved root identity names this user, and logs one guarded read.
  void expectLoginWithSavedRoot(const std::string& expected) {
    const std::string unit = name + "sso.cpp";
    const std::string named = asProcess({1000, 1001, 0}, {1000, 1001, 0}, [&] {
      Log child_log;
      QOVA::SSO::OIDCLogin("the code", user);
      EXPECT_TRUE(child_log.is({{LOG_AUTH | LOG_INFO, unit, "WARNING: setresgid(-1, 0, -1)"},
                                {LOG_AUTH | LOG_INFO, unit, "WARNING: setresuid(-1, 0, -1)"},
                                {LOG_AUTH | LOG_INFO, unit, "WARNING: setresuid(-1, 0, -1)"}}));
      return user;
    });
    EXPECT_EQ(named, expected);
  }

  const std::string name;
  const Ca authority;
  std::unique_ptr<Provider> provider;
  std::string secret = "s3cr&t";
  Json::Value header;
  Json::Value body;
  std::string user = "before";
  Log log;
};

}  // namespace test
