// A sign-in's two halves, as a login program does them: set-id root, with the web server's user.
//   sign_in url         prints the URL that the browser is sent to
//   sign_in user CODE   prints the user that the code gives, or what the library throws
#include <unistd.h>

#include <cstdlib>
#include <exception>
#include <iostream>
#include <stdexcept>
#include <string>

#include "sso/azuresso.h"
#include "sso/profile.h"
#include "sso/sso.h"
#include "sso/webspheresso.h"

using namespace QOVA::SSO;

namespace {

// Without root, as after a faulty installation, the library meets what it meets.
void stepDown() {
  if (geteuid() != 0) return;
  const gid_t group = getgid();
  if (setresgid(group, group, 0) != 0) throw std::runtime_error("cannot keep the group root");
  if (setresuid(getuid(), getuid(), 0) != 0) throw std::runtime_error("cannot keep the user root");
}

template <class Client>
std::string authorizationUrl() {
  return Client().GetAccessTokenReqURI(Json::Value(Json::objectValue));
}

std::string answer(const std::string& what, const std::string& code) {
  SSOProfile profile;
  if (what == "user") {
    std::string user;
    OIDCLogin(code, user);
    return "signed in as " + user;
  }
  if (!profile.SSOIsEnable()) return "sign-in is off";
  if (profile.GetSSOProfile() == "azure") return authorizationUrl<AzureSSOClient>();
  if (profile.GetSSOProfile() == "websphere") return authorizationUrl<WebSphereSSOClient>();
  return "profile not support.";
}

}  // namespace

int main(int argc, char** argv) {
  try {
    if (argc < 2) throw std::runtime_error("url, or user and a code");
    stepDown();
    std::cout << answer(argv[1], argc > 2 ? argv[2] : "") << "\n";
    return EXIT_SUCCESS;
  } catch (const std::exception& error) {
    std::cout << "thrown: " << error.what() << "\n";
    return EXIT_FAILURE;
  }
}
