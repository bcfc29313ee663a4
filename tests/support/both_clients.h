// The two provider clients, for what holds for both of them: typed tests run over Clients.
#pragma once

#include <gtest/gtest.h>
#include <json/value.h>

#include <string>
#include <vector>

#include "sso/azuresso.h"
#include "sso/webspheresso.h"
#include "support/device.h"

namespace test {

using Accessor = std::string (QOVA::SSO::SSOClient::*)();

struct Setting {
  std::string key;
  Accessor get;
};

// The settings of a client in the order of its file; `prefix` is that of the keys.
inline std::vector<Setting> settingsOf(const std::string& prefix) {
  using QOVA::SSO::SSOClient;
  return {{prefix + "_wellknown", &SSOClient::GetWellknownEndpoint},
          {prefix + "_client_id", &SSOClient::GetClientID},
          {prefix + "_client_secret", &SSOClient::GetClientSecret},
          {prefix + "_authorization_endpoint", &SSOClient::GetAuthEndpoint},
          {prefix + "_token_endpoint", &SSOClient::GetTokenEndpoint},
          {prefix + "_redirect_uri", &SSOClient::GetRedirectURI},
          {prefix + "_logout_endpoint", &SSOClient::GetLogoutEndpoint}};
}

struct Azure {
  using Client = QOVA::SSO::AzureSSOClient;
  static std::string name() { return "azure"; }
  static std::string unit() { return "azuresso.cpp"; }
  static std::string scope() { return "openid"; }
};

struct WebSphere {
  using Client = QOVA::SSO::WebSphereSSOClient;
  static std::string name() { return "websphere"; }
  static std::string unit() { return "webspheresso.cpp"; }
  static std::string scope() { return "openid%20profile%20email"; }
};

using Clients = testing::Types<Azure, WebSphere>;

struct ClientName {
  template <typename Provider>
  static std::string GetName(int) {
    return Provider::name();
  }
};

// Writes a provider's file: members of `settings`, which carry no prefix in their names.
template <typename Provider>
void configure(const Json::Value& settings) {
  Json::Value file(Json::objectValue);
  for (const std::string& key : settings.getMemberNames()) {
    file[Provider::name() + "_" + key] = settings[key];
  }
  writeConfig(Provider::name() + ".conf", file.toStyledString());
}

}  // namespace test
