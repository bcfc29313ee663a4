// A login program that the library serves.
//   cgi_library redirect|profile|logout|login
#include <exception>
#include <functional>
#include <iostream>
#include <map>
#include <string>

#include "sso/azuresso.h"
#include "sso/profile.h"

namespace {

void redirect() {
  Json::Value parameters;
  parameters["origin"] = "https://device.example.net/webman/index.cgi";
  QOVA::SSO::AzureSSOClient().RedirectAuthEndpoint(parameters);
}

void profile() {
  QOVA::SSO::SSOProfile profile;
  std::cout << profile.SSOIsEnable() << profile.GetSSOClient()->GetAuthEndpoint() << "\n";
}

void logout() {
  std::cout << QOVA::SSO::GetAzureSSOLogoutURL("https://device.example.net/webman/index.cgi");
}

void login() {
  std::string user;
  QOVA::SSO::OIDCLogin("0.AXoAcode", user);
  std::cout << user << "\n";
}

}  // namespace

int main(int count, char** arguments) try {
  const std::map<std::string, std::function<void()>> programs = {
      {"redirect", redirect}, {"profile", profile}, {"logout", logout}, {"login", login}};
  programs.at(count > 1 ? arguments[1] : "")();
} catch (const std::exception& e) {
  std::cerr << "cgi_library: " << e.what() << "\n";
  return 1;
}
