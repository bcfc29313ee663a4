// SSOProfile: what it takes from the profile file and from the chosen provider's file.
#include <gtest/gtest.h>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <unistd.h>

#include <ostream>
#include <typeinfo>

#include "sso/azuresso.h"
#include "sso/profile.h"
#include "sso/webspheresso.h"
#include "support/device.h"
#include "support/ids_spy.h"
#include "support/log.h"
#include "support/throws.h"

namespace {

using namespace QOVA::SSO;
using Calls = std::vector<std::string>;

const char* const kAzureFile =
    R"({"azure_sso_enable":true,"azure_wellknown":"az wellknown","azure_client_id":"az client",)"
    R"("azure_client_secret":"az secret","azure_tenant_id":"az tenant",)"
    R"("azure_authorization_endpoint":"az auth","azure_token_endpoint":"az token",)"
    R"("azure_redirect_uri":"az redirect","azure_logout_endpoint":"az logout"})";
const char* const kWebSphereFile =
    R"({"sso_enable":true,"azure_sso_enable":true,"websphere_sso_enable":true,)"
    R"("websphere_wellknown":"ws wellknown","websphere_client_id":"ws client",)"
    R"("websphere_client_secret":"ws secret","websphere_authorization_endpoint":"ws auth",)"
    R"("websphere_token_endpoint":"ws token","websphere_redirect_uri":"ws redirect",)"
    R"("websphere_logout_endpoint":"ws logout"})";

// All settings of a client, in one line.
std::string settingsOf(SSOClient* client) {
  std::string all = client->isEnable() ? "on" : "off";
  for (const std::string& each :
       {client->GetClientID(), client->GetClientSecret(), client->GetRedirectURI(),
        client->GetAuthEndpoint(), client->GetTokenEndpoint(), client->GetWellknownEndpoint(),
        client->GetLogoutEndpoint(), client->GetToken()}) {
    all += "|" + each;
  }
  return all;
}
const char* const kNothing = "off||||||||";
const char* const kAzure =
    "on|az client|az secret|az redirect|az auth|az token|az wellknown|az logout|";
const char* const kWebSphere =
    "off|ws client|ws secret|ws redirect|ws auth|ws token|ws wellknown|ws logout|";

struct Case {
  const char* name;
  const char* file;
  bool enable;
  const char* profile;
  const char* client;
  bool unsupported;  // one line in the log
};
void PrintTo(const Case& each, std::ostream* out) {
  *out << each.name;
}

const Case kCases[] = {
    {"Azure", R"({"sso_enable":true,"sso_profile":"azure"})", true, "azure", kAzure, false},
    // The client's own switch is always off; its file has none.
    {"WebSphere", R"({"sso_enable":true,"sso_profile":"websphere"})", true, "websphere", kWebSphere,
     false},
    {"OtherMembers", R"({"x":1,"sso_profile":"azure","azure_client_id":"x","sso_enable":true})",
     true, "azure", kAzure, false},
    {"Off", R"({"sso_enable":false,"sso_profile":"azure"})", false, "azure", kNothing, false},
    {"OffUnknown", R"({"sso_enable":false,"sso_profile":"other"})", false, "other", kNothing,
     false},
    {"EnableMissing", R"({"sso_profile":"azure"})", false, "azure", kNothing, false},
    {"EnableText", R"({"sso_enable":"true","sso_profile":"azure"})", false, "azure", kNothing,
     false},
    {"EnableNumber", R"({"sso_enable":1,"sso_profile":"azure"})", false, "azure", kNothing, false},
    {"EnableNull", R"({"sso_enable":null,"sso_profile":"azure"})", false, "azure", kNothing, false},
    {"EnableArray", R"({"sso_enable":[true],"sso_profile":"azure"})", false, "azure", kNothing,
     false},
    {"ProfileMissing", R"({"sso_enable":true})", true, "", kNothing, true},
    {"ProfileNumber", R"({"sso_enable":true,"sso_profile":5})", true, "", kNothing, true},
    {"ProfileNull", R"({"sso_enable":true,"sso_profile":null})", true, "", kNothing, true},
    {"ProfileArray", R"({"sso_enable":true,"sso_profile":["azure"]})", true, "", kNothing, true},
    {"ProfileEmpty", R"({"sso_enable":true,"sso_profile":""})", true, "", kNothing, true},
    {"ProfileCapital", R"({"sso_enable":true,"sso_profile":"Azure"})", true, "Azure", kNothing,
     true},
    {"ProfileBlank", R"({"sso_enable":true,"sso_profile":"azure "})", true, "azure ", kNothing,
     true},
    {"ProfileFormat", R"({"sso_enable":true,"sso_profile":"%s%n %d"})", true, "%s%n %d", kNothing,
     true},
    {"EmptyFile", "", false, "", kNothing, false},
    {"EmptyObject", "{}", false, "", kNothing, false},
    {"NotJson", "sso_enable", false, "", kNothing, false},
    {"CutOff", R"({"sso_enable":true,"sso_profile":"azure")", false, "", kNothing, false},
    {"Array", R"(["sso_enable","sso_profile"])", false, "", kNothing, false},
    {"Number", "502 Bad Gateway", false, "", kNothing, false},
    {"Text", R"("sso_enable")", false, "", kNothing, false},
    {"True", "true", false, "", kNothing, false},
    {"Null", "null", false, "", kNothing, false},
};

class Profile : public testing::TestWithParam<Case> {};
INSTANTIATE_TEST_SUITE_P(, Profile, testing::ValuesIn(kCases),
                         [](const auto& each) { return std::string(each.param.name); });

TEST_P(Profile, HoldsWhatTheFilesSay) {
  const Case& expected = GetParam();
  test::writeConfig("profile.conf", expected.file);
  test::writeConfig("azure.conf", kAzureFile);
  test::writeConfig("websphere.conf", kWebSphereFile);
  test::Log log;
  SSOProfile profile;
  EXPECT_EQ(profile.SSOIsEnable(), expected.enable);
  EXPECT_EQ(profile.GetSSOProfile(), expected.profile);
  EXPECT_EQ(settingsOf(profile.GetSSOClient()), expected.client);
  const std::string line = "Profile '" + std::string(expected.profile) + "' not support";
  if (expected.unsupported) {
    EXPECT_TRUE(log.is({{LOG_ERR, "profile.cpp", line}}));
  } else {
    EXPECT_TRUE(log.isEmpty());
  }
}

TEST(SSOProfile, WithoutAFileIsOff) {
  test::writeConfig("azure.conf", kAzureFile);
  test::Log log;
  SSOProfile profile;
  EXPECT_FALSE(profile.SSOIsEnable());
  EXPECT_EQ(profile.GetSSOProfile(), "");
  EXPECT_EQ(settingsOf(profile.GetSSOClient()), kNothing);
  EXPECT_TRUE(log.isEmpty());
}

TEST(SSOProfile, WithADirectoryInsteadOfAFileIsOff) {
  ASSERT_EQ(mkdir(test::configPath("profile.conf").c_str(), 0755), 0);
  SSOProfile profile;
  EXPECT_FALSE(profile.SSOIsEnable());
  EXPECT_EQ(profile.GetSSOProfile(), "");
}

// It can be opened and not be read.
TEST(SSOProfile, WithABrokenReadIsOff) {
  ASSERT_EQ(symlink("/proc/self/mem", test::configPath("profile.conf").c_str()), 0);
  test::Log log;
  SSOProfile profile;
  EXPECT_FALSE(profile.SSOIsEnable());
  EXPECT_EQ(profile.GetSSOProfile(), "");
  EXPECT_TRUE(log.isEmpty());
}

TEST(SSOProfile, WithAFileThatIsNestedTooDeepIsOff) {
  test::writeConfig("profile.conf",
                    R"({"sso_enable":true,"sso_profile":"azure","a":)" + std::string(5000, '['));
  test::Log log;
  SSOProfile profile;
  EXPECT_FALSE(profile.SSOIsEnable());
  EXPECT_EQ(profile.GetSSOProfile(), "");
  EXPECT_TRUE(log.isEmpty());
}

TEST(SSOProfile, WithoutTheProvidersFileHasAnEmptyClient) {
  for (const char* const name : {"azure", "websphere"}) {
    test::writeConfig("profile.conf",
                      R"({"sso_enable":true,"sso_profile":")" + std::string(name) + "\"}");
    test::Log log;
    SSOProfile profile;
    EXPECT_TRUE(profile.SSOIsEnable());
    EXPECT_EQ(profile.GetSSOProfile(), name);
    EXPECT_EQ(settingsOf(profile.GetSSOClient()), kNothing);
    EXPECT_TRUE(log.isEmpty());
  }
}

// The held client is the base part of the provider's: a carrier of settings, not a login engine.
TEST(SSOProfile, HeldClientHasTheHooksOfTheBase) {
  test::writeConfig("azure.conf", kAzureFile);
  test::writeConfig("websphere.conf", kWebSphereFile);
  for (const char* const name : {"azure", "websphere"}) {
    test::writeConfig("profile.conf",
                      R"({"sso_enable":true,"sso_profile":")" + std::string(name) + "\"}");
    SSOProfile profile;
    SSOClient* const client = profile.GetSSOClient();
    std::string user = "before";
    EXPECT_TRUE(typeid(*client) == typeid(SSOClient));
    EXPECT_TRUE(test::throws<sso_not_implemented>("GetIDTokenReqParams not implemented",
                                                  [&] { client->GetIDTokenReqParams(); }));
    EXPECT_TRUE(test::throws<sso_not_implemented>("GetUserName not implemented",
                                                  [&] { client->GetUserName(user); }));
    EXPECT_TRUE(test::throws<sso_not_implemented>("VerifyIDToken not implemented",
                                                  [&] { client->VerifyIDToken(); }));
    EXPECT_TRUE(test::throws<sso_not_implemented>("ProcessTokenResponse not implemented",
                                                  [&] { client->ProcessTokenResponse("{}"); }));
    EXPECT_TRUE(test::throws<sso_not_implemented>(
        "GetIDTokenReqParams not implemented", [&] { client->OpenIDConnectLogin("code", user); }));
    EXPECT_EQ(user, "before");
  }
}

TEST(SSOProfile, HandsOutItsOwnClient) {
  SSOProfile profile;
  EXPECT_EQ(profile.GetSSOClient(), profile.GetSSOClient());
  profile.GetSSOClient()->SetRedirectURI("new");
  EXPECT_EQ(profile.GetSSOClient()->GetRedirectURI(), "new");
}

TEST(SSOProfile, ReturnsACopyOfTheName) {
  test::writeConfig("profile.conf", R"({"sso_profile":"azure"})");
  SSOProfile profile;
  profile.GetSSOProfile() += "changed";
  EXPECT_EQ(profile.GetSSOProfile(), "azure");
}

TEST(SSOProfile, IsReadOnceAndNotAgain) {
  test::writeConfig("profile.conf", R"({"sso_enable":true,"sso_profile":"azure"})");
  test::writeConfig("azure.conf", kAzureFile);
  SSOProfile profile;
  test::writeConfig("profile.conf", R"({"sso_enable":false,"sso_profile":"websphere"})");
  test::removeConfig("azure.conf");
  EXPECT_TRUE(profile.SSOIsEnable());
  EXPECT_EQ(profile.GetSSOProfile(), "azure");
  EXPECT_EQ(settingsOf(profile.GetSSOClient()), kAzure);
}

TEST(SSOProfile, CanBeDerivedFromAndDestroyedThroughItsOwnType) {
  struct Derived : SSOProfile {
    explicit Derived(bool* flag) : gone(flag) {}
    ~Derived() override { *gone = true; }
    bool* gone;
  };
  bool gone = false;
  SSOProfile* const profile = new Derived(&gone);
  delete profile;
  EXPECT_TRUE(gone);
}

// The names of the files in the configuration folder that were opened during `call`, in order.
Calls openedDuring(const std::function<void()>& call) {
  const int watch = inotify_init1(IN_NONBLOCK | IN_CLOEXEC);
  EXPECT_GE(inotify_add_watch(watch, "/usr/qova/etc/ssoclient", IN_OPEN), 0);
  call();
  Calls names;
  alignas(inotify_event) char events[4096];
  const ssize_t size = read(watch, events, sizeof events);
  for (ssize_t at = 0; at < size;) {
    const auto* const event = reinterpret_cast<const inotify_event*>(events + at);
    names.push_back(event->len > 0 ? event->name : "");
    at += static_cast<ssize_t>(sizeof(inotify_event) + event->len);
  }
  close(watch);
  return names;
}

TEST(ConfigurationFiles, AreOpenedOnceEachAndOnlyIfNeeded) {
  test::writeConfig("azure.conf", kAzureFile);
  test::writeConfig("websphere.conf", kWebSphereFile);
  const struct {
    const char* profile;
    Calls files;
  } table[] = {
      {R"({"sso_enable":true,"sso_profile":"azure"})", {"profile.conf", "azure.conf"}},
      {R"({"sso_enable":true,"sso_profile":"websphere"})", {"profile.conf", "websphere.conf"}},
      {R"({"sso_enable":false,"sso_profile":"azure"})", {"profile.conf"}},
      {R"({"sso_enable":true,"sso_profile":"other"})", {"profile.conf"}},
  };
  for (const auto& each : table) {
    test::writeConfig("profile.conf", each.profile);
    EXPECT_EQ(openedDuring([] { SSOProfile(); }), each.files) << each.profile;
  }
  EXPECT_EQ(openedDuring([] { AzureSSOClient(); }), Calls{"azure.conf"});
  EXPECT_EQ(openedDuring([] { WebSphereSSOClient(); }), Calls{"websphere.conf"});
}

// Two guards, one after the other: one for the profile file, one for the provider's.
TEST(SSOProfile, RaisesItsPrivilegesOncePerFile) {
  const Calls once = {"setresgid(-1, 0, -1)", "setresuid(-1, 0, -1)", "setresuid(-1, 0, -1)",
                      "setresgid(-1, 1001, -1)", "setresuid(-1, 1001, -1)"};
  Calls twice = once;
  twice.insert(twice.end(), once.begin(), once.end());
  const struct {
    const char* profile;
    Calls calls;
    const char* client;
  } table[] = {
      {R"({"sso_enable":true,"sso_profile":"azure"})", twice, kAzure},
      {R"({"sso_enable":true,"sso_profile":"websphere"})", twice, kWebSphere},
      {R"({"sso_enable":false,"sso_profile":"azure"})", once, kNothing},
  };
  test::writeConfig("azure.conf", kAzureFile);
  test::writeConfig("websphere.conf", kWebSphereFile);
  for (const auto& each : table) {
    test::writeConfig("profile.conf", each.profile);
    test::asProcess({1001, 1001, 0}, [&] {
      test::IdsSpy spy;
      SSOProfile profile;
      EXPECT_EQ(spy.changes, each.calls);
      EXPECT_EQ(settingsOf(profile.GetSSOClient()), each.client);
    });
  }
}

TEST(SSOProfile, GuardLinesNameTheUnitOfEachFile) {
  test::writeConfig("profile.conf", R"({"sso_enable":true,"sso_profile":"websphere"})", 0644);
  test::asProcess({1001, 1001, 1001}, [] {
    test::Log log;
    SSOProfile profile;
    const std::string denied = "ERROR: setresgid(-1, 0, -1) [Operation not permitted]";
    const std::string enter = "ERROR: ENTERCriticalSection";
    const int priority = LOG_AUTH | LOG_ERR;
    EXPECT_TRUE(log.is({{priority, "profile.cpp", denied},
                        {priority, "profile.cpp", enter},
                        {priority, "webspheresso.cpp", denied},
                        {priority, "webspheresso.cpp", enter}}));
  });
}

}  // namespace
