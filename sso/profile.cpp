#include "sso/profile.h"

#include <syslog.h>

#include <utility>

#include "sso/azuresso.h"
#include "sso/internal/json.h"
#include "sso/privilege.h"
#include "sso/webspheresso.h"

namespace QOVA {
namespace SSO {

namespace {

constexpr char kUnit[] = "profile.cpp";

}  // namespace

SSOProfile::SSOProfile() {
  Json::Value root;
  CriticalSection guard(kUnit);
  guard.Enter(__LINE__);
  const bool read = ReadJsonFile(kProfilePath, root);
  guard.Leave(__LINE__);
  if (!read) return;

  TakeSetting(root, kEnableKey, enable);
  TakeSetting(root, kProfileKey, profile);
  if (!enable) return;

  // Only the settings are taken over, so the held client has no provider's hooks: a profile
  // must not be able to sign anyone in.
  if (profile == kAzureProfile) {
    client = AzureSSOClient();
  } else if (profile == kWebSphereProfile) {
    client = WebSphereSSOClient();
  } else {
    syslog(LOG_ERR, "%s:%d Profile '%s' not support", kUnit, __LINE__, profile.c_str());
  }
}

SSOProfile::~SSOProfile() = default;

bool SSOProfile::SSOIsEnable() {
  return enable;
}

std::string SSOProfile::GetSSOProfile() {
  return profile;
}

SSOClient* SSOProfile::GetSSOClient() {
  return &client;
}

}  // namespace SSO
}  // namespace QOVA
