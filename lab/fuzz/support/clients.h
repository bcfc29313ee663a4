// Clients with the settings of device.h and an ID token that did not come by way of a response.
#pragma once

#include <string>

#include "sso/azuresso.h"
#include "sso/webspheresso.h"
#include "support/device.h"

namespace fuzz {

template <typename Base>
class ClientWith : public Base {
 public:
  explicit ClientWith(const std::string& stored) : Base(configured()) { this->token = stored; }

 private:
  // The files are read once: most targets are not about them.
  static const Base& configured() {
    static const Base one = [] {
      const auto files = device().files;
      writeSettings();
      const Base client;
      device().files = files;
      return client;
    }();
    return one;
  }
};

using Azure = ClientWith<QOVA::SSO::AzureSSOClient>;
using WebSphere = ClientWith<QOVA::SSO::WebSphereSSOClient>;

}  // namespace fuzz
