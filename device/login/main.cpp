// The login program: started by the web server for each request of the browser.
//   GET  ?action=start&origin=PATH   starts a login; PATH is the page to come back to
//   GET  ?code=...&state=...         the redirect URI: the provider's answer
//   POST ?action=logout              ends the session here and at the provider
#include <exception>
#include <iostream>
#include <stdexcept>

#include "identity.h"
#include "login.h"

namespace {

void Dispatch(const cgi::Request& request) {
  const std::string action = cgi::Value(request.query, "action");
  if (request.method == "GET" && action == "start") return Start(request);
  if (request.method == "POST" && action == "logout") return Logout(request);
  if (request.method == "GET" && action.empty()) return Callback(request);
  throw std::invalid_argument("unknown request");
}

void Serve(const cgi::Request& request) {
  try {
    StepDown();
    Dispatch(request);
  } catch (const std::exception& error) {
    Fail(request, error.what());
  }
}

}  // namespace

int main() {
  try {
    Serve(cgi::ReadRequest());
  } catch (const std::exception&) {
    // Not even the failure could be told, for want of memory: the page is static.
    std::cout << "Status: 302 Found\nLocation: /webman/ssoclient/relay.html#success=false\n\n";
  }
  std::cout.flush();
}
