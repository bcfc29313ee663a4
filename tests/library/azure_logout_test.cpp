// The URL that signs a user out at Azure and brings the browser back.
#include <gtest/gtest.h>
#include <json/value.h>
#include <unistd.h>

#include <stdexcept>
#include <string>
#include <typeinfo>

#include "sso/azuresso.h"
#include "support/device.h"
#include "support/log.h"

namespace {

using QOVA::SSO::GetAzureSSOLogoutURL;

const std::string kEndpoint = "https://login.example.com/tenant/logout";
const std::string kQuery = "?post_logout_redirect_uri=";
const std::string kRelay = "%2Fwebman%2Fssoclient%2Frelay.html";

class AzureLogout : public testing::Test {
 protected:
  static void configure(const std::string& endpoint) {
    Json::Value file;
    file["azure_logout_endpoint"] = endpoint;
    test::writeConfig("azure.conf", file.toStyledString());
  }

  void SetUp() override { configure(kEndpoint); }
  void TearDown() override { EXPECT_TRUE(log.isEmpty()); }

  test::Log log;
};

TEST_F(AzureLogout, WithoutAnAddressIsTheEndpointAlone) {
  for (const std::string& endpoint : {kEndpoint, kEndpoint + "?a=b", std::string()}) {
    configure(endpoint);
    EXPECT_EQ(GetAzureSSOLogoutURL(""), endpoint);
  }
}

struct Address {
  const char* address;
  const char* site;  // what is put before the relay page, encoded
};

// One "/index.cgi" at the end, then one "/" at the end, are taken off.
TEST_F(AzureLogout, LeadsBackToTheRelayPageOfTheSameSite) {
  const Address cases[] = {
      {"https://nas.example.com", "https%3A%2F%2Fnas.example.com"},
      {"https://nas.example.com/", "https%3A%2F%2Fnas.example.com"},
      {"https://nas.example.com/index.cgi", "https%3A%2F%2Fnas.example.com"},
      {"https://nas.example.com//", "https%3A%2F%2Fnas.example.com%2F"},
      {"https://nas.example.com//index.cgi", "https%3A%2F%2Fnas.example.com"},
      {"https://nas.example.com///index.cgi", "https%3A%2F%2Fnas.example.com%2F"},
      {"https://nas.example.com/index.cgi/", "https%3A%2F%2Fnas.example.com%2Findex.cgi"},
      {"https://nas.example.com/index.cgi/index.cgi", "https%3A%2F%2Fnas.example.com%2Findex.cgi"},
      {"https://nas.example.com/INDEX.CGI", "https%3A%2F%2Fnas.example.com%2FINDEX.CGI"},
      {"https://nas.example.com/myindex.cgi", "https%3A%2F%2Fnas.example.com%2Fmyindex.cgi"},
      {"https://nas.example.com/index.cgi?x", "https%3A%2F%2Fnas.example.com%2Findex.cgi%3Fx"},
      {"https://nas.example.com:5001/webman/index.cgi",
       "https%3A%2F%2Fnas.example.com%3A5001%2Fwebman"},
      {"not an \xc3\xbc-URL", "not%20an%20%C3%BC-URL"},
      {"/index.cgi", ""},
      {"//index.cgi", ""},
      {"x/index.cgi", "x"},
      {"http://a.b", "http%3A%2F%2Fa.b"},
      {"123456789/", "123456789"},
      {"//////////", "%2F%2F%2F%2F%2F%2F%2F%2F%2F"}};
  for (const Address& c : cases)
    EXPECT_EQ(GetAzureSSOLogoutURL(c.address), kEndpoint + kQuery + c.site + kRelay) << c.address;
}

// Deliberate: the tail of the address is compared before its length.
TEST_F(AzureLogout, ThrowsForAnAddressShorterThanTheSuffix) {
  for (size_t length = 1; length <= 9; ++length) {
    try {
      GetAzureSSOLogoutURL(std::string("/////////", length));
      ADD_FAILURE() << length;
    } catch (const std::exception& e) {
      EXPECT_TRUE(typeid(e) == typeid(std::out_of_range)) << e.what();
      EXPECT_EQ(std::string(e.what()).find("basic_string::substr"), 0u) << e.what();
    }
  }
}

TEST_F(AzureLogout, UsesTheEndpointAsItIs) {
  for (const char* endpoint : {"", "https://a/b?c=d", "not a URL"}) {
    configure(endpoint);
    EXPECT_EQ(GetAzureSSOLogoutURL("http://a.b"), endpoint + kQuery + "http%3A%2F%2Fa.b" + kRelay);
  }
}

TEST_F(AzureLogout, WorksWithoutAConfiguration) {
  test::removeConfig("azure.conf");
  EXPECT_EQ(GetAzureSSOLogoutURL("http://a.b"), kQuery + "http%3A%2F%2Fa.b" + kRelay);
  EXPECT_EQ(GetAzureSSOLogoutURL(""), "");
}

TEST_F(AzureLogout, DoesNotAskWhetherTheClientIsEnabled) {
  test::writeConfig("azure.conf", R"({"azure_sso_enable":false, "azure_logout_endpoint":"x"})");
  EXPECT_EQ(GetAzureSSOLogoutURL(""), "x");
}

TEST_F(AzureLogout, ReadsTheConfigurationAsRoot) {
  test::asProcess({1000, 1000, 0}, [] {
    test::Log child_log;
    EXPECT_EQ(GetAzureSSOLogoutURL(""), kEndpoint);
    EXPECT_EQ(geteuid(), 1000u);
    EXPECT_TRUE(
        child_log.is({{LOG_AUTH | LOG_INFO, "azuresso.cpp", "WARNING: setresgid(-1, 0, -1)"},
                      {LOG_AUTH | LOG_INFO, "azuresso.cpp", "WARNING: setresuid(-1, 0, -1)"},
                      {LOG_AUTH | LOG_INFO, "azuresso.cpp", "WARNING: setresuid(-1, 0, -1)"}}));
  });
}

}  // namespace
