// The three configuration files. Parts: profile.conf, azure.conf, websphere.conf. A part that is
// "missing" is not a file, and one that is "folder" is a folder of that name.
#include "sso/azuresso.h"
#include "sso/common.h"
#include "sso/profile.h"
#include "sso/sso.h"
#include "sso/webspheresso.h"

#include "support/device.h"
#include "support/independent.h"
#include "support/target.h"

namespace {

using namespace QOVA::SSO;

// What a file says, by the other JSON reader. Not known if it cannot read the file.
struct File {
  bool known = false;
  Json::Value root;

  std::string text(const char* name) const { return fuzz::textOf(root, name); }
  bool flag(const char* name) const {
    return root.isObject() && root[name].isBool() && root[name].asBool();
  }
};

File write(const char* name, const std::string& text) {
  File file;
  if (text == "folder") fuzz::device().folders.push_back(name);
  if (text == "folder" || text == "missing") {
    file.known = true;
    return file;
  }
  fuzz::device().files[name] = text;
  file.known = fuzz::readJson(text, file.root);
  return file;
}

void requireSettings(SSOClient& client, const File& file, const std::string& prefix) {
  if (!file.known) return;
  const auto same = [&](const std::string& value, const char* name) {
    fuzz::require(value == file.text((prefix + name).c_str()), name);
  };
  same(client.GetClientID(), "client_id");
  same(client.GetClientSecret(), "client_secret");
  same(client.GetRedirectURI(), "redirect_uri");
  same(client.GetAuthEndpoint(), "authorization_endpoint");
  same(client.GetTokenEndpoint(), "token_endpoint");
  same(client.GetLogoutEndpoint(), "logout_endpoint");
  same(client.GetWellknownEndpoint(), "wellknown");
  fuzz::require(client.GetToken().empty(), "a token out of a file");
}

// Without a provider to talk to no user is signed in, whatever the files say.
void requireNoLogin() {
  std::string user = "nobody";
  try {
    OIDCLogin("code", user);
    fuzz::require(false, "signed in without a provider");
  } catch (const sso_exception&) {
  } catch (const std::invalid_argument& e) {
    fuzz::require(std::string(e.what()) == "parse json falied", "another message");
  }
  fuzz::require(user == "nobody", "a user without a provider");
}

}  // namespace

FUZZ_TARGET(configuration) {
  const auto part = fuzz::parts(input, 3);
  const File profile = write("profile.conf", part[0]);
  const File azure = write("azure.conf", part[1]);
  const File websphere = write("websphere.conf", part[2]);

  AzureSSOClient azureClient;
  requireSettings(azureClient, azure, "azure_");
  WebSphereSSOClient websphereClient;
  requireSettings(websphereClient, websphere, "websphere_");
  fuzz::require(!websphereClient.isEnable(), "WebSphere has no switch");
  if (azure.known) fuzz::require(azureClient.isEnable() == azure.flag("azure_sso_enable"), "on");

  SSOProfile held;
  const std::string name = held.GetSSOProfile();
  if (profile.known) {
    fuzz::require(held.SSOIsEnable() == profile.flag("sso_enable"), "sso_enable");
    fuzz::require(name == profile.text("sso_profile"), "sso_profile");
  }
  const bool on = held.SSOIsEnable();
  const std::string id = on && name == kAzureProfile       ? azureClient.GetClientID()
                         : on && name == kWebSphereProfile ? websphereClient.GetClientID()
                                                           : "";
  fuzz::require(held.GetSSOClient()->GetClientID() == id, "the profile's client");
  requireNoLogin();
  return !id.empty();
}
