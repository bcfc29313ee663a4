// The address of the page that asks for the logout.
#include "sso/azuresso.h"

#include <stdexcept>

#include "support/device.h"
#include "support/independent.h"
#include "support/target.h"

namespace {

bool endsWith(const std::string& text, const std::string& end) {
  return text.size() >= end.size() && text.compare(text.size() - end.size(), end.size(), end) == 0;
}

std::string relayPage(std::string address) {
  if (endsWith(address, "/index.cgi")) address.resize(address.size() - 10);
  if (endsWith(address, "/")) address.pop_back();
  return address + "/webman/ssoclient/relay.html";
}

}  // namespace

FUZZ_TARGET(logout_address) {
  fuzz::writeSettings();
  const std::string endpoint = "https://provider.example/logout";
  std::string url;
  const bool built = fuzz::returns({{typeid(std::out_of_range), ""}},
                                   [&] { url = QOVA::SSO::GetAzureSSOLogoutURL(input); });
  fuzz::require(built == (input.empty() || input.size() >= 10), "another limit");
  if (!built) return false;
  if (input.empty()) {
    fuzz::require(url == endpoint, "another endpoint");
    return true;
  }
  const std::string start = endpoint + "?post_logout_redirect_uri=";
  fuzz::require(url.compare(0, start.size(), start) == 0, "another start");
  const std::string value = url.substr(start.size());
  fuzz::require(fuzz::isEscaped(value), "an address that is not encoded");
  fuzz::require(fuzz::percentDecoded(value) == fuzz::cString(relayPage(input)), "another address");
  return true;
}
