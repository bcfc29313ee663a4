// The shortest login program: it works and withstands little. For the test of scripts/check login.
#include <cstdlib>
#include <exception>
#include <iostream>
#include <string>

#include "sso/azuresso.h"
#include "sso/utils.h"

// A parameter of the query, decoded.
static std::string Parameter(const std::string& name) {
  const char* variable = std::getenv("QUERY_STRING");
  const std::string query = std::string("&") + (variable == nullptr ? "" : variable) + "&";
  const size_t at = query.find("&" + name + "=");
  if (at == std::string::npos) return "";
  const size_t begin = at + name.size() + 2;
  std::string value;
  for (size_t i = begin; i < query.find('&', begin); ++i) {
    if (query[i] == '%') {
      value += static_cast<char>(std::stoi(query.substr(i + 1, 2), nullptr, 16));
      i += 2;
    } else {
      value += query[i] == '+' ? ' ' : query[i];
    }
  }
  return value;
}

static void SignIn(const std::string& user) {
  std::cout << "Set-Cookie: user=" << user << "\n";
}

int main() {
  using namespace QOVA::SSO;
  const std::string code = Parameter("code");
  if (code.empty()) {  // before login: send the browser to the provider
    Json::Value parameters;
    parameters["origin"] = "/webman/index.cgi";  // where to go back to
    AzureSSOClient().RedirectAuthEndpoint(parameters);
    return EXIT_SUCCESS;
  }
  std::string relay;  // after login: the browser comes back with code and state
  try {
    std::string user;
    OIDCLogin(code, user);
    SignIn(user);
    relay = GetSSORelayURL(true, Parameter("state"), "");
  } catch (const std::exception& e) {  // the reason is not encoded by the library
    relay = GetSSORelayURL(false, "", URLEncode(e.what()));
  }
  std::cout << "Location: /webman/" << relay << "\n\n";
}
