// The provider clients when memory runs out: each allocation fails once and comes out as
// std::bad_alloc; what was taken is released (the address check says so).
#include <curl/curl.h>
#include <gtest/gtest.h>

#include <string>

#include "support/both_clients.h"
#include "support/device.h"
#include "support/log.h"
#include "support/memory_spy.h"
#include "support/provider.h"
#include "support/tokens.h"

namespace {

using test::failEachNew;

template <typename Provider>
class ClientMemory : public testing::Test {
 protected:
  void SetUp() override {
    Json::Value settings;
    for (const test::Setting& setting : test::settingsOf(""))
      settings[setting.key.substr(1)] = "https://nas.example.com/a/long/text/for/" + setting.key;
    settings["client_id"] = kAudience;
    test::configure<Provider>(settings);
  }

  void TearDown() override { EXPECT_TRUE(log.isEmpty()); }

  const std::string kAudience = "a client identifier of many characters";
  test::Log log;
};
TYPED_TEST_SUITE(ClientMemory, test::Clients, test::ClientName);

TYPED_TEST(ClientMemory, IsNeededForTheSettings) {
  EXPECT_GE(failEachNew([] { typename TypeParam::Client client; }), 7);
}

TYPED_TEST(ClientMemory, IsNeededForTheRequests) {
  typename TypeParam::Client client;
  client.SetCode("a code of some length, longer than a string holds in itself");
  Json::Value parameters;
  parameters["origin"] = "https://nas.example.com/index.cgi";
  EXPECT_GE(failEachNew([&] { client.GetAccessTokenReqURI(parameters); }), 6);
  EXPECT_GE(failEachNew([&] { client.GetIDTokenReqParams(); }), 5);
  test::CoutRecorder out;
  test::failNew(3);
  EXPECT_THROW(client.RedirectAuthEndpoint(parameters), std::bad_alloc);
  test::failNew(0);
  EXPECT_TRUE(out.writes.empty());
}

TYPED_TEST(ClientMemory, IsNeededForTheIdToken) {
  typename TypeParam::Client client;
  const std::string claims = "{\"exp\":4102444800, \"aud\":\"" + this->kAudience +
                             "\", \"sub\":\"a subject of many, many characters\","
                             "\"unique_name\":\"alice.of.the.long.name@corp.example.com\"}";
  const std::string secret = client.GetClientSecret();
  const std::string response =
      "{\"id_token\":\"" + test::hmacToken(secret, R"({"alg":"HS256"})", claims) + "\"}";
  EXPECT_GE(failEachNew([&] { client.ProcessTokenResponse(response); }), 2);
  EXPECT_NE(client.GetToken(), "");
  std::string user;
  EXPECT_GE(failEachNew([&] { client.GetUserName(user); }), 3);
  EXPECT_GT(user.size(), 20u);
  Json::Value info;
  EXPECT_GE(failEachNew([&] { client.GetUserInfo(info); }), 3);
  EXPECT_EQ(info["exp"].asString(), "4102444800");
}

// A chunk that there is no memory for ends the transfer, be it a single byte.
TYPED_TEST(ClientMemory, IsNeededForEachChunkOfAnAnswer) {
  test::Answer chunks = test::ok("a body longer than a string holds in itself");
  chunks.chunked = true;
  chunks.piece = 1;
  test::Provider provider;
  provider.answer("/", chunks).start();
  Json::Value settings;
  settings["token_endpoint"] = provider.url("/");
  test::configure<TypeParam>(settings);
  typename TypeParam::Client client;
  const std::string line =
      std::string("request token uri ") + curl_easy_strerror(CURLE_WRITE_ERROR) + ".";
  int ended = 0;
  bool failed = true;
  for (std::size_t nth = 1; nth <= 100 && failed; ++nth) {
    std::string response;
    test::failNew(nth);
    client.RequestTokenEndpoint(response, "a=1");
    failed = test::newFailed();
    test::failNew(0);
    if (response != chunks.body) {
      EXPECT_EQ(this->log.lines().size(), 1u) << "operator new " << nth << ": " << response;
      ended += !response.empty() && this->log.is({{LOG_ERR, "sso.cpp", line}});
    }
    this->log.clear();
  }
  EXPECT_FALSE(failed);
  EXPECT_GE(ended, 2);
}

using WebSphereMemory = ClientMemory<test::WebSphere>;

TEST_F(WebSphereMemory, IsNeededForTheSignature) {
  QOVA::SSO::WebSphereSSOClient client;
  const std::string claims = "{\"exp\":4102444800, \"aud\":\"" + kAudience + "\"}";
  client.ProcessTokenResponse(
      "{\"id_token\":\"" + test::hmacToken(client.GetClientSecret(), R"({"alg":"HS256"})", claims) +
      "\"}");
  EXPECT_GE(failEachNew([&] { client.VerifyIDToken(); }), 5);
}

using AzureMemory = ClientMemory<test::Azure>;

TEST_F(AzureMemory, IsNeededForTheLogoutURL) {
  const std::string address = "https://nas.example.com/index.cgi";
  EXPECT_GE(failEachNew([&] { QOVA::SSO::GetAzureSSOLogoutURL(address); }), 8);
}

}  // namespace
