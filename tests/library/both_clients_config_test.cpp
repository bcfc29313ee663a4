// The provider clients as their files make them.
#include <dlfcn.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <memory>
#include <ostream>
#include <string>
#include <type_traits>
#include <vector>

#include "support/both_clients.h"
#include "support/device.h"
#include "support/faults.h"
#include "support/log.h"

// A signal comes before the first byte.
extern "C" ssize_t read(int file, void* bytes, size_t size) {
  static auto* const next =
      reinterpret_cast<ssize_t (*)(int, void*, size_t)>(dlsym(RTLD_NEXT, "read"));
  if (!test::failsNow("read", __builtin_return_address(0))) return next(file, bytes, size);
  errno = EINTR;
  return -1;
}

namespace {

using test::Azure;
using test::Setting;
using test::WebSphere;
using test::writeConfig;

template <typename Provider>
class ClientConfig : public testing::Test {
 protected:
  using Client = typename Provider::Client;

  static std::string file() { return Provider::name() + ".conf"; }
  static std::vector<Setting> Settings() { return test::settingsOf(Provider::name()); }

  // A file in which every setting is its own key.
  static Json::Value everything() {
    Json::Value file(Json::objectValue);
    for (const Setting& setting : Settings()) file[setting.key] = setting.key;
    return file;
  }

  static void expectEmpty(Client& client) {
    EXPECT_FALSE(client.isEnable());
    for (const Setting& setting : Settings()) EXPECT_EQ((client.*setting.get)(), "") << setting.key;
    EXPECT_EQ(client.GetToken(), "");
  }

  void TearDown() override {
    EXPECT_TRUE(log.isEmpty());
    std::remove(test::configPath(file()).c_str());
  }

  test::Log log;
};
TYPED_TEST_SUITE(ClientConfig, test::Clients, test::ClientName);

TYPED_TEST(ClientConfig, TakesEverySettingFromItsKey) {
  writeConfig(this->file(), this->everything().toStyledString());
  typename TypeParam::Client client;
  for (const Setting& setting : this->Settings())
    EXPECT_EQ((client.*setting.get)(), setting.key) << setting.key;
  EXPECT_EQ(client.GetToken(), "");
}

TYPED_TEST(ClientConfig, IsReadOnAfterAnInterruption) {
  writeConfig(this->file(), this->everything().toStyledString());
  const test::Fault interruption("read");
  typename TypeParam::Client client;
  EXPECT_TRUE(interruption.wasHit());
  for (const Setting& setting : this->Settings())
    EXPECT_EQ((client.*setting.get)(), setting.key) << setting.key;
}

// The number that the next file to be opened gets.
int nextDescriptor() {
  const int descriptor = open("/dev/null", O_RDONLY | O_CLOEXEC);
  close(descriptor);
  return descriptor;
}

TYPED_TEST(ClientConfig, LeavesNoFileOpen) {
  const int before = nextDescriptor();
  writeConfig(this->file(), "{}");
  typename TypeParam::Client client;
  EXPECT_GE(before, 0);
  EXPECT_EQ(nextDescriptor(), before);
}

TYPED_TEST(ClientConfig, WithoutAFileIsEmpty) {
  typename TypeParam::Client client;
  this->expectEmpty(client);
}

TYPED_TEST(ClientConfig, IsEmptyForAFileThatIsNotAnObject) {
  std::vector<std::string> texts = {"{}", "[]", "[{}]", "null", "true", "502", "\"text\""};
  // As is one that is not JSON at all.
  texts.insert(texts.end(), {"", "{", "hello", "{\"a\":}", "\xff\xfe", std::string(5, '\0')});
  texts.push_back(std::string(2000, '['));
  texts.push_back("{\"" + TypeParam::name() + "_client_id\":\"x\",");
  for (const std::string& text : texts) {
    SCOPED_TRACE(testing::PrintToString(text.substr(0, 40)));
    writeConfig(this->file(), text);
    typename TypeParam::Client client;
    this->expectEmpty(client);
  }
}

TYPED_TEST(ClientConfig, IsEmptyForADirectory) {
  ASSERT_EQ(mkdir(test::configPath(this->file()).c_str(), 0700), 0);
  typename TypeParam::Client client;
  this->expectEmpty(client);
}

TYPED_TEST(ClientConfig, IgnoresASettingOfAnotherType) {
  std::vector<Json::Value> wrong = {42, 0, -1, 1.5, true, false, Json::Value()};
  wrong.emplace_back(Json::arrayValue);
  wrong.emplace_back(Json::objectValue);
  for (const Setting& odd : this->Settings()) {
    for (const Json::Value& value : wrong) {
      SCOPED_TRACE(odd.key + ": " + value.toStyledString());
      Json::Value file = this->everything();
      file[odd.key] = value;
      writeConfig(this->file(), file.toStyledString());
      typename TypeParam::Client client;
      for (const Setting& setting : this->Settings())
        EXPECT_EQ((client.*setting.get)(), setting.key == odd.key ? "" : setting.key);
    }
  }
}

TYPED_TEST(ClientConfig, LeavesOutWhatIsMissing) {
  for (const Setting& only : this->Settings()) {
    SCOPED_TRACE(only.key);
    Json::Value file(Json::objectValue);
    file[only.key] = "x";
    writeConfig(this->file(), file.toStyledString());
    typename TypeParam::Client client;
    for (const Setting& setting : this->Settings())
      EXPECT_EQ((client.*setting.get)(), setting.key == only.key ? "x" : "");
  }
}

TYPED_TEST(ClientConfig, TakesValuesAsTheyAre) {
  for (const std::string& value :
       std::vector<std::string>{" not a URL ", "", "https://a/b?c=d#e", "M\xc3\xbcnchen",
                                "line\nfeed", std::string("a\0b", 3), std::string(100000, 'x')}) {
    SCOPED_TRACE(testing::PrintToString(value.substr(0, 40)));
    Json::Value file(Json::objectValue);
    for (const Setting& setting : this->Settings()) file[setting.key] = value;
    writeConfig(this->file(), file.toStyledString());
    typename TypeParam::Client client;
    for (const Setting& setting : this->Settings()) EXPECT_EQ((client.*setting.get)(), value);
  }
}

TYPED_TEST(ClientConfig, IgnoresKeysThatAreNotItsOwn) {
  writeConfig(this->file(), R"({"azure_":"x", "websphere_":"x", "client_id":"x", "CLIENT_ID":"x",
      "sso_profile":"x", "code":"x", "token":"x", "id_token":"x",)"
                            R"("Azure_client_id":"x", "WebSphere_client_id":"x"})");
  typename TypeParam::Client client;
  this->expectEmpty(client);
}

TYPED_TEST(ClientConfig, IsReadWithTheSettingsOfThatMoment) {
  writeConfig(this->file(), this->everything().toStyledString());
  typename TypeParam::Client client;
  writeConfig(this->file(), "{}");
  EXPECT_EQ(client.GetClientID(), TypeParam::name() + "_client_id");
}

TYPED_TEST(ClientConfig, AnswersWithCopies) {
  writeConfig(this->file(), this->everything().toStyledString());
  typename TypeParam::Client client;
  client.GetClientID() += "changed";
  EXPECT_EQ(client.GetClientID(), TypeParam::name() + "_client_id");
}

TYPED_TEST(ClientConfig, IsReadAsRootAndTheIdentityPutBack) {
  writeConfig(this->file(), this->everything().toStyledString(), 0600);
  const test::Ids cgi = {1000, 1001, 0};
  const std::string unit = TypeParam::unit();
  test::asProcess(cgi, [&] {
    test::Log child_log;
    typename TypeParam::Client client;
    EXPECT_EQ(client.GetClientID(), TypeParam::name() + "_client_id");
    EXPECT_EQ(geteuid(), 1001u);
    EXPECT_EQ(getegid(), 1001u);
    EXPECT_TRUE(child_log.is({{LOG_AUTH | LOG_INFO, unit, "WARNING: setresgid(-1, 0, -1)"},
                              {LOG_AUTH | LOG_INFO, unit, "WARNING: setresuid(-1, 0, -1)"},
                              {LOG_AUTH | LOG_INFO, unit, "WARNING: setresuid(-1, 0, -1)"}}));
  });
}

TYPED_TEST(ClientConfig, StaysEmptyWithoutTheRightToReadIt) {
  writeConfig(this->file(), this->everything().toStyledString(), 0600);
  const std::string unit = TypeParam::unit();
  test::asProcess({1000, 1000, 1000}, [&] {
    test::Log child_log;
    typename TypeParam::Client client;
    this->expectEmpty(client);
    EXPECT_TRUE(child_log.is(
        {{LOG_AUTH | LOG_ERR, unit, "ERROR: setresgid(-1, 0, -1) [Operation not permitted]"},
         {LOG_AUTH | LOG_ERR, unit, "ERROR: ENTERCriticalSection"}}));
  });
}

// The table that device programs were built against, found through the names of its entries.
TYPED_TEST(ClientConfig, KeepsTheSlotsOfTheBaseAndPutsItsDestructorBehindThem) {
  const std::string base = "_ZN4QOVA3SSO9SSOClient";
  const std::string own = TypeParam::name() == "azure" ? "_ZN4QOVA3SSO14AzureSSOClient"
                                                       : "_ZN4QOVA3SSO18WebSphereSSOClient";
  const std::string text = "NSt7__cxx1112basic_stringIcSt11char_traitsIcESaIcEEE";
  const std::vector<std::string> slots = {base + "8isEnableEv",
                                          base + "11GetClientIDB5cxx11Ev",
                                          base + "15GetClientSecretB5cxx11Ev",
                                          base + "14GetRedirectURIB5cxx11Ev",
                                          base + "8GetTokenB5cxx11Ev",
                                          base + "15GetAuthEndpointB5cxx11Ev",
                                          base + "16GetTokenEndpointB5cxx11Ev",
                                          base + "20GetWellknownEndpointB5cxx11Ev",
                                          base + "17GetLogoutEndpointB5cxx11Ev",
                                          base + "14SetRedirectURIE" + text,
                                          base + "7SetCodeE" + text,
                                          base + "20RequestWellknownInfoERN4Json5ValueE",
                                          base + "20RequestTokenEndpointER" + text + "RKS7_",
                                          own + "13VerifyIDTokenEv",
                                          own + "19GetIDTokenReqParamsB5cxx11Ev",
                                          own + "11GetUserNameER" + text,
                                          own + "20ProcessTokenResponseE" + text,
                                          base + "18OpenIDConnectLoginE" + text + "RS7_",
                                          own + "D1Ev",
                                          own + "D0Ev"};
  typename TypeParam::Client client;
  void* const* const table = *reinterpret_cast<void* const* const*>(&client);
  for (size_t i = 0; i < slots.size(); ++i) {
    void* const function = dlsym(RTLD_DEFAULT, slots[i].c_str());
    ASSERT_NE(function, nullptr) << slots[i];
    EXPECT_EQ(table[i], function) << i << ' ' << slots[i];
  }
}

TYPED_TEST(ClientConfig, IsDestroyedThroughItsOwnType) {
  using Own = typename TypeParam::Client;
  EXPECT_TRUE((std::is_base_of_v<QOVA::SSO::SSOClient, Own>));
  EXPECT_TRUE(std::has_virtual_destructor_v<Own>);
  EXPECT_FALSE(std::has_virtual_destructor_v<QOVA::SSO::SSOClient>);
  writeConfig(this->file(), this->everything().toStyledString());
  std::make_unique<Own>().reset();
}

TEST(ClientSize, IsThatOfTheBaseButForTheTenant) {
  EXPECT_EQ(sizeof(QOVA::SSO::WebSphereSSOClient), sizeof(QOVA::SSO::SSOClient));
  EXPECT_EQ(sizeof(QOVA::SSO::AzureSSOClient), sizeof(QOVA::SSO::SSOClient) + sizeof(std::string));
}

struct Switch {
  const char* file;
  bool on;
};

void PrintTo(const Switch& each, std::ostream* out) {
  *out << each.file;
}

class AzureSwitchParam : public testing::TestWithParam<Switch> {};

INSTANTIATE_TEST_SUITE_P(, AzureSwitchParam,
                         testing::Values(Switch{R"({"azure_sso_enable":true})", true},
                                         Switch{R"({"azure_sso_enable":false})", false},
                                         Switch{R"({"azure_sso_enable":"true"})", false},
                                         Switch{R"({"azure_sso_enable":1})", false},
                                         Switch{R"({"azure_sso_enable":null})", false},
                                         Switch{R"({"azure_sso_enable":[true]})", false},
                                         Switch{R"({"azure_sso_enable":{"true":true}})", false},
                                         Switch{R"({"sso_enable":true})", false},
                                         Switch{R"({"azure_enable":true})", false},
                                         Switch{"true", false}));

TEST_P(AzureSwitchParam, IsOnForTheBooleanTrueAlone) {
  writeConfig("azure.conf", GetParam().file);
  QOVA::SSO::AzureSSOClient client;
  EXPECT_EQ(client.isEnable(), GetParam().on);
  for (const Setting& setting : test::settingsOf("azure")) EXPECT_EQ((client.*setting.get)(), "");
}

TEST(AzureSwitch, DoesNotHinderTheSettings) {
  writeConfig("azure.conf", R"({"azure_sso_enable":"yes", "azure_client_id":"id"})");
  QOVA::SSO::AzureSSOClient client;
  EXPECT_FALSE(client.isEnable());
  EXPECT_EQ(client.GetClientID(), "id");
}

TEST(WebSphereSwitch, IsAlwaysOff) {
  writeConfig("websphere.conf", R"({"sso_enable":true, "websphere_sso_enable":true,
      "azure_sso_enable":true, "websphere_enable":true, "websphere_client_id":"id"})");
  QOVA::SSO::WebSphereSSOClient client;
  EXPECT_FALSE(client.isEnable());
  EXPECT_EQ(client.GetClientID(), "id");
}

}  // namespace
