// What other programs of the device may know of single sign-on: whether it is on, which
// provider is chosen, and that provider's settings.
#pragma once

#include <string>

#include "sso/common.h"
#include "sso/sso.h"

namespace QOVA {
namespace SSO {

// SSOProfile carries the profile file and the chosen provider's settings, as they were when it
// was constructed. It is a carrier of settings, not a login engine: a login goes through
// OIDCLogin.
class SSOCLIENT_API SSOProfile {
 public:
  // Reads "/usr/qova/etc/ssoclient/profile.conf" and, if single sign-on is on and the profile is
  // "azure" or "websphere", that provider's settings, both under raised privileges. A missing or
  // bad file is not an error: single sign-on is then off. An unknown profile name is written to
  // the system log.
  SSOProfile();

  bool SSOIsEnable();           // "sso_enable" of the profile file
  std::string GetSSOProfile();  // "sso_profile" as read; empty if there is none

  // GetSSOClient returns the held client; it lives as long as the profile, which owns it. It is
  // a plain SSOClient: its accessors answer the provider's settings, its hooks are not
  // implemented. For "websphere" its isEnable() is always false. Empty while single sign-on is
  // off.
  SSOClient* GetSSOClient();

  virtual ~SSOProfile();

 private:
  bool enable = false;
  std::string profile;
  SSOClient client;
};

}  // namespace SSO
}  // namespace QOVA
