// A host that does nothing for its own safety: what the variables of the environment do then.
#include <syslog.h>

#include <exception>

#include "sso/azuresso.h"

int main() {
  QOVA::SSO::AzureSSOClient client;
  std::string response;
  client.RequestTokenEndpoint(response, "code=x");
  syslog(LOG_INFO, "host: %zu bytes", response.size());
}
