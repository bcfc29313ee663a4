// A login program against the installed package: without a code the redirect, with one the sign-in.
#include <exception>
#include <iostream>

#include "sso/utils.h"
#include "sso/webspheresso.h"

int main(int count, char** arguments) {
  using namespace QOVA::SSO;
  if (count < 2) {
    Json::Value parameters;
    parameters["origin"] = "/index.cgi";
    WebSphereSSOClient().RedirectAuthEndpoint(parameters);
    return 0;
  }
  try {
    std::string user;
    OIDCLogin(arguments[1], user);
    std::cout << "signed in: " << user << '\n';
    return 0;
  } catch (const std::exception& e) {
    std::cout << "refused: " << e.what() << '\n';
    return 1;
  }
}
