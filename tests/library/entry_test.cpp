// OIDCLogin: the profile file, the choice of the client, and a login of either kind.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <ctime>
#include <ostream>

#include "sso/sso.h"
#include "support/device.h"
#include "support/ids_spy.h"
#include "support/log.h"
#include "support/provider.h"
#include "support/throws.h"
#include "support/tokens.h"

namespace {

using namespace QOVA::SSO;
using Calls = std::vector<std::string>;

void login(std::string* user) {
  OIDCLogin("the code", *user);
}

const char* const kUnreadable = "read profile file failed.";
const char* const kOff = "sso does not enable.";
const char* const kNoProfile = "not specify sso profile";

struct Refusal {
  const char* name;
  const char* file;
  const char* message;
};
void PrintTo(const Refusal& each, std::ostream* out) {
  *out << each.name;
}

const Refusal kRefusals[] = {
    {"Empty", "", kUnreadable},
    {"Blank", " \n", kUnreadable},
    {"NotJson", "sso_enable=true", kUnreadable},
    {"CutOff", R"({"sso_enable":true,"sso_profile":"azure")", kUnreadable},
    {"EmptyObject", "{}", kOff},
    {"Array", R"(["sso_enable"])", kOff},
    {"Number", "5", kOff},
    {"Text", R"("sso_enable")", kOff},
    {"True", "true", kOff},
    {"Null", "null", kOff},
    {"EnableFalse", R"({"sso_enable":false,"sso_profile":"azure"})", kOff},
    {"EnableNull", R"({"sso_enable":null,"sso_profile":"azure"})", kOff},
    {"EnableText", R"({"sso_enable":"true","sso_profile":"azure"})", kOff},
    {"EnableNumber", R"({"sso_enable":1,"sso_profile":"azure"})", kOff},
    {"EnableObject", R"({"sso_enable":{},"sso_profile":"azure"})", kOff},
    {"EnableMissing", R"({"sso_profile":"azure"})", kOff},
    {"EnableMissingAndUnknownProfile", R"({"sso_profile":"other"})", kOff},
    {"EnableOfAnotherCase", R"({"SSO_ENABLE":true,"sso_profile":"azure"})", kOff},
    {"ProfileMissing", R"({"sso_enable":true})", kNoProfile},
    {"ProfileNull", R"({"sso_enable":true,"sso_profile":null})", kNoProfile},
    {"ProfileNumber", R"({"sso_enable":true,"sso_profile":5})", kNoProfile},
    {"ProfileTrue", R"({"sso_enable":true,"sso_profile":true})", kNoProfile},
    {"ProfileArray", R"({"sso_enable":true,"sso_profile":["azure"]})", kNoProfile},
};

class Refused : public testing::TestWithParam<Refusal> {};
INSTANTIATE_TEST_SUITE_P(, Refused, testing::ValuesIn(kRefusals),
                         [](const auto& each) { return std::string(each.param.name); });

TEST_P(Refused, EndsWithItsMessage) {
  test::writeConfig("profile.conf", GetParam().file);
  test::Log log;
  std::string user = "before";
  EXPECT_TRUE(test::throws<sso_op_failed>(GetParam().message, [&] { login(&user); }));
  EXPECT_EQ(user, "before");
  EXPECT_TRUE(log.isEmpty());
}

TEST(OIDCLogin, NeedsAProfileFile) {
  std::string user = "before";
  test::Log log;
  EXPECT_TRUE(test::throws<sso_op_failed>(kUnreadable, [&] { login(&user); }));
  EXPECT_EQ(user, "before");
  EXPECT_TRUE(log.isEmpty());
}

TEST(OIDCLogin, DoesNotReadADirectory) {
  ASSERT_EQ(mkdir(test::configPath("profile.conf").c_str(), 0755), 0);
  std::string user;
  EXPECT_TRUE(test::throws<sso_op_failed>(kUnreadable, [&] { login(&user); }));
}

TEST(OIDCLogin, DoesNotGetOverABrokenRead) {
  ASSERT_EQ(symlink("/proc/self/mem", test::configPath("profile.conf").c_str()), 0);
  std::string user;
  EXPECT_TRUE(test::throws<sso_op_failed>(kUnreadable, [&] { login(&user); }));
}

// jsoncpp has its own exception for this; it counts as a failed parse.
TEST(OIDCLogin, DoesNotReadAFileThatIsNestedTooDeep) {
  for (const char* const text : {"[", R"({"a":)"}) {
    std::string file = R"({"sso_enable":true,"sso_profile":"azure","a":)";
    for (int i = 0; i < 5000; ++i) file += text;
    test::writeConfig("profile.conf", file);
    std::string user;
    EXPECT_TRUE(test::throws<sso_op_failed>(kUnreadable, [&] { login(&user); }));
  }
}

TEST(OIDCLogin, KnowsTheSupportedProfilesByTheirExactNames) {
  for (const std::string name : {"", "Azure", "AZURE", "azure ", " azure", "azur", "azure\\u0000",
                                 "WebSphere", "websphere\\n", "azure,websphere", "google"}) {
    test::writeConfig("profile.conf",
                      R"({"sso_enable":true,"sso_profile":")" + std::string(name) + "\"}");
    test::Log log;
    std::string user = "before";
    EXPECT_TRUE(test::throws<sso_exception>("profile not support.", [&] { login(&user); })) << name;
    EXPECT_EQ(user, "before");
    EXPECT_TRUE(log.isEmpty());
  }
}

// A provider for both clients, and the files that lead there.
class Login : public testing::Test {
 protected:
  Login() {
    test::writeConfig("azure.conf",
                      R"({"azure_wellknown":")" + provider.url("/wellknown") +
                          R"(","azure_client_id":"az id","azure_client_secret":"az&secret",)" +
                          R"("azure_tenant_id":"tenant","azure_token_endpoint":")" +
                          provider.url("/azure") + R"(","azure_redirect_uri":"https://d/r"})");
    test::writeConfig("websphere.conf",
                      R"({"websphere_client_id":"ws id","websphere_client_secret":"ws&secret",)"
                      R"("websphere_token_endpoint":")" +
                          provider.url("/websphere") +
                          R"(","websphere_redirect_uri":"https://d/r"})");
    provider.answer("/azure", tokenAnswer(azureToken()))
        .answer("/websphere", tokenAnswer(websphereToken()))
        .answer("/wellknown", test::ok(R"({"jwks_uri":")" + provider.url("/keys") + "\"}"))
        .answer("/keys", test::ok(R"({"keys":[)" + test::anyRsaKey().jwk("key-1") + "]}"));
    provider.start();
  }

  static void choose(const std::string& profile, mode_t mode = 0644) {
    test::writeConfig("profile.conf", R"({"sso_enable":true,"sso_profile":")" + profile + "\"}",
                      mode);
  }
  static std::string soon() { return std::to_string(std::time(nullptr) + 600); }
  static test::Answer tokenAnswer(const std::string& token) {
    return test::ok(R"({"token_type":"Bearer","id_token":")" + token + "\"}");
  }
  static std::string azureToken() {
    return test::rsaToken(test::anyRsaKey(), R"({"alg":"RS256","kid":"key-1"})",
                          R"({"aud":"az id","tid":"tenant","exp":)" + soon() +
                              R"(,"unique_name":"Alice@corp.example"})");
  }
  static std::string websphereToken() {
    return test::hmacToken("ws&secret", R"({"alg":"HS256"})",
                           R"({"aud":"ws id","exp":)" + soon() + R"(,"sub":"bob"})");
  }
  Calls targets() const {
    Calls all;
    for (const auto& each : provider.requests()) all.push_back(each.target);
    return all;
  }

  test::Provider provider;
  test::Log log;
  std::string user = "before";
};

TEST_F(Login, AzureSignsIn) {
  choose("azure");
  login(&user);
  EXPECT_EQ(user, "CORP.EXAMPLE\\Alice");
  EXPECT_EQ(targets(), (Calls{"/azure", "/wellknown", "/keys"}));
  EXPECT_EQ(provider.requests()[0].body,
            "client_id=az%20id&client_secret=az%26secret&code=the%20code"
            "&grant_type=authorization_code&redirect_uri=https%3A%2F%2Fd%2Fr");
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(Login, WebSphereSignsIn) {
  choose("websphere");
  login(&user);
  EXPECT_EQ(user, "bob");
  EXPECT_EQ(targets(), (Calls{"/websphere"}));
  EXPECT_EQ(provider.requests()[0].body,
            "client_id=ws%20id&client_secret=ws%26secret&code=the%20code"
            "&grant_type=authorization_code&redirect_uri=https%3A%2F%2Fd%2Fr");
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(Login, AnEmptyCodeIsSentAsItIs) {
  choose("websphere");
  OIDCLogin("", user);
  EXPECT_NE(provider.requests()[0].body.find("&code=&"), std::string::npos);
}

// The switch of the profile file alone decides: neither client above says that it is enabled.
TEST_F(Login, TheClientsOwnSwitchIsNotConsulted) {
  test::writeConfig("azure.conf", R"({"azure_sso_enable":false,"azure_token_endpoint":")" +
                                      provider.url("/azure") + "\"}");
  choose("azure");
  EXPECT_TRUE(test::throws<std::invalid_argument>("tenant ID invalid", [&] { login(&user); }));
  EXPECT_EQ(targets(), (Calls{"/azure"}));
}

TEST_F(Login, OtherMembersOfTheProfileFileAreIgnored) {
  test::writeConfig("profile.conf", R"({"azure_client_id":"x","a":[1],"sso_profile":"websphere",)"
                                    R"("sso_enable":true})");
  login(&user);
  EXPECT_EQ(user, "bob");
}

TEST_F(Login, FailuresOfTheClientPassUnchanged) {
  test::removeConfig("azure.conf");
  test::removeConfig("websphere.conf");
  for (const char* const profile : {"azure", "websphere"}) {
    choose(profile);
    log.clear();
    EXPECT_TRUE(test::throws<std::invalid_argument>("parse json falied", [&] { login(&user); }));
    EXPECT_EQ(user, "before");
    // There is no token endpoint: one line in the log says so.
    EXPECT_EQ(log.lines().size(), 1u);
  }
}

TEST_F(Login, ReadsTheProfileFileWithTheCallersOwnPrivileges) {
  choose("websphere", 0600);
  test::runAs({1001, 1001, 0}, {2002, 2002, 0}, [&] {
    test::IdsSpy spy;
    EXPECT_TRUE(test::throws<sso_op_failed>(kUnreadable, [&] { login(&user); }));
    EXPECT_EQ(spy.all, Calls{});
    EXPECT_TRUE(log.isEmpty());
  });
}

// As installed: the profile for everyone, the providers' files for root.
TEST_F(Login, WorksForALoginProgramThatHoldsRootInReserve) {
  for (const char* const profile : {"azure", "websphere"}) {
    choose(profile, 0644);
    for (const test::Ids& ids : {test::Ids{1001, 1001, 0}, test::Ids{0, 1001, 1001}}) {
      test::asProcess(ids, [&] {
        test::IdsSpy spy;
        login(&user);
        EXPECT_EQ(user, profile == std::string("azure") ? "CORP.EXAMPLE\\Alice" : "bob");
        EXPECT_EQ(spy.changes.size(), 5u);
        EXPECT_EQ(log.lines().size(), 3u);
        EXPECT_EQ(geteuid(), 1001u);
        EXPECT_EQ(getegid(), 1001u);
      });
    }
  }
}

TEST_F(Login, WithoutRootTheProvidersFileStaysClosed) {
  choose("websphere", 0644);
  test::asProcess({1001, 1001, 1001}, [&] {
    EXPECT_TRUE(test::throws<std::invalid_argument>("parse json falied", [&] { login(&user); }));
    EXPECT_TRUE(targets().empty());
  });
}

}  // namespace
