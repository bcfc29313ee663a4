// What the provider clients ask of the device platform, and what its failures do to them.
#include <gtest/gtest.h>
#include <json/reader.h>

#include <cstring>
#include <string>
#include <vector>

#include "support/both_clients.h"
#include "support/device.h"
#include "support/log.h"
#include "support/platform_spy.h"
#include "support/query.h"
#include "support/throws.h"
#include "support/tokens.h"

namespace {

using QOVA::JWT::jwt_not_support;
using QOVA::JWT::jwt_verify_failed;
using QOVA::SSO::AzureSSOClient;
using QOVA::SSO::sso_op_failed;
using QOVA::SSO::WebSphereSSOClient;
using test::platformSpy;
using test::throws;

template <typename Provider>
class ClientPlatform : public testing::Test {
 protected:
  void SetUp() override {
    platformSpy() = {};
    Json::Value settings;
    for (const char* key : {"authorization_endpoint", "client_id", "client_secret", "redirect_uri"})
      settings[key] = std::string("the ") + key;
    test::configure<Provider>(settings);
  }

  void TearDown() override { EXPECT_TRUE(log.isEmpty()); }

  static std::vector<std::string> Encoded() {
    std::vector<std::string> texts;
    for (const test::PlatformCall& call : platformSpy().urlEncode) {
      EXPECT_EQ(call.capacity, 3 * call.input.size()) << call.input;
      EXPECT_TRUE(call.zeroed) << call.input;
      texts.push_back(call.input);
    }
    return texts;
  }

  test::Log log;
};
TYPED_TEST_SUITE(ClientPlatform, test::Clients, test::ClientName);

TYPED_TEST(ClientPlatform, EncodesTheStateIntoAZeroedBufferOf1024) {
  typename TypeParam::Client client;
  client.GetAccessTokenReqURI(Json::Value());
  ASSERT_EQ(platformSpy().base64Encode.size(), 1u);
  const test::PlatformCall& call = platformSpy().base64Encode[0];
  EXPECT_EQ(call.capacity, 1024u);
  EXPECT_EQ(call.option, 1);
  EXPECT_TRUE(call.zeroed);
  EXPECT_EQ(call.input.find("{\"nonce\":\""), 0u);
  EXPECT_EQ(call.input.size(), std::string(R"({"nonce":""})").size() + 32 + 1);
  EXPECT_EQ(call.input.back(), '\n');
}

TYPED_TEST(ClientPlatform, TakesTheStateUpToItsFirstZero) {
  platformSpy().onBase64Encode = [](const std::string&, char* text, size_t) {
    std::memcpy(text, "sta/te\0behind", 13);
    return 7;
  };
  typename TypeParam::Client client;
  const std::string url = client.GetAccessTokenReqURI(Json::Value());
  EXPECT_EQ(url.substr(url.find("&state=")), "&state=sta%2Fte");
}

TYPED_TEST(ClientPlatform, ThrowsWhenTheStateCannotBeEncoded) {
  platformSpy().onBase64Encode = [](const std::string&, char*, size_t) { return 0; };
  typename TypeParam::Client client;
  EXPECT_TRUE(throws<sso_op_failed>("encode base64 failed.",
                                    [&] { client.GetAccessTokenReqURI(Json::Value()); }));
  test::CoutRecorder out;
  EXPECT_TRUE(throws<sso_op_failed>("encode base64 failed.",
                                    [&] { client.RedirectAuthEndpoint(Json::Value()); }));
  EXPECT_TRUE(out.writes.empty());
}

TYPED_TEST(ClientPlatform, EncodesEveryValueOfTheRequestInTheOrderOfTheNames) {
  typename TypeParam::Client client;
  const std::string url = client.GetAccessTokenReqURI(Json::Value());
  const auto sent = test::parametersOf(url.substr(url.find('?') + 1));
  std::vector<std::string> values;
  for (const auto& parameter : sent) values.push_back(test::percentDecoded(parameter.second));
  EXPECT_EQ(this->Encoded(), values);
  ASSERT_EQ(values.size(), 6u);
  EXPECT_EQ(values[0], "the client_id");
}

TYPED_TEST(ClientPlatform, EncodesEveryValueOfTheCodeExchangeInTheOrderOfTheNames) {
  typename TypeParam::Client client;
  client.SetCode("the code");
  client.GetIDTokenReqParams();
  EXPECT_EQ(this->Encoded(),
            (std::vector<std::string>{"the client_id", "the client_secret", "the code",
                                      "authorization_code", "the redirect_uri"}));
}

// Deliberate: the caller of URLEncode cannot tell.
TYPED_TEST(ClientPlatform, SendsValuesAsTheyAreWhenTheyCannotBeEncoded) {
  platformSpy().onURLEncode = [](const std::string&, char* encoded, size_t) {
    std::strcpy(encoded, "x");
    return -1;
  };
  typename TypeParam::Client client;
  client.SetCode("the code");
  EXPECT_EQ(client.GetIDTokenReqParams(),
            "client_id=the client_id&client_secret=the client_secret&code=the code"
            "&grant_type=authorization_code&redirect_uri=the redirect_uri");
}

class AzureUserPlatform : public testing::Test {
 protected:
  AzureUserPlatform() {
    platformSpy() = {};
    const std::string body = R"({"unique_name":"Alice@corp.example.com"})";
    client.ProcessTokenResponse(R"({"id_token":")" + test::signingInput("{}", body) + R"(.sig"})");
  }

  AzureSSOClient client;
  std::string user = "before";
};

TEST_F(AzureUserPlatform, IsAskedOnceForTheName) {
  client.GetUserName(user);
  ASSERT_EQ(platformSpy().userName.size(), 1u);
  EXPECT_EQ(platformSpy().userName[0].input, "CORP.EXAMPLE.COM\\Alice");
  EXPECT_EQ(platformSpy().userName[0].capacity, 1023u);
  EXPECT_TRUE(platformSpy().userName[0].zeroed) << "all 1024 bytes";
}

TEST_F(AzureUserPlatform, DecidesTheName) {
  for (int result : {0, 1, 12345}) {
    platformSpy().onUserName = [result](const std::string&, char* text, size_t) {
      std::memcpy(text, "CORP\\alice\0behind", 17);
      return result;
    };
    client.GetUserName(user);
    EXPECT_EQ(user, "CORP\\alice") << result;
  }
}

TEST_F(AzureUserPlatform, MayAnswerWithNothing) {
  platformSpy().onUserName = [](const std::string&, char*, size_t) { return 0; };
  client.GetUserName(user);
  EXPECT_EQ(user, "");
}

TEST_F(AzureUserPlatform, MayFillAllItWasOffered) {
  platformSpy().onUserName = [](const std::string&, char* text, size_t size) {
    std::memset(text, 'n', size);
    return 0;
  };
  client.GetUserName(user);
  EXPECT_EQ(user, std::string(1023, 'n'));
}

TEST_F(AzureUserPlatform, FailsWithTheQualifiedNameLeftInPlace) {
  for (int result : {-1, -12345}) {
    platformSpy().onUserName = [result](const std::string&, char* text, size_t) {
      std::memcpy(text, "CORP\\alice", 11);
      return result;
    };
    user = "before";
    EXPECT_TRUE(throws<sso_op_failed>("QOVAWinsUserNameFqdn2Netbios failed.",
                                      [&] { client.GetUserName(user); }));
    EXPECT_EQ(user, "CORP.EXAMPLE.COM\\Alice");
  }
}

class WebSphereKeyPlatform : public testing::Test {
 protected:
  WebSphereKeyPlatform() { platformSpy() = {}; }

  // Verifies a token under the configured secret "s3cret".
  static void verify(const std::string& header, const std::string& body) {
    test::writeConfig("websphere.conf",
                      R"({"websphere_client_id":"id", "websphere_client_secret":"s3cret"})");
    WebSphereSSOClient client;
    client.ProcessTokenResponse(R"({"id_token":")" + test::hmacToken("s3cret", header, body) +
                                R"("})");
    client.VerifyIDToken();
  }

  const std::string header = R"({"alg":"HS256"})";
  const std::string body = R"({"aud":"id", "exp":4102444800})";
};

TEST_F(WebSphereKeyPlatform, EncodesTheClientSecretIntoAZeroedBufferOf1024) {
  EXPECT_NO_THROW(verify(header, body));
  ASSERT_EQ(platformSpy().base64Encode.size(), 1u);
  const test::PlatformCall& call = platformSpy().base64Encode[0];
  EXPECT_EQ(call.input, "s3cret");
  EXPECT_EQ(call.capacity, 1024u);
  EXPECT_EQ(call.option, 1);
  EXPECT_TRUE(call.zeroed);
}

TEST_F(WebSphereKeyPlatform, ThrowsWhenTheClientSecretCannotBeEncoded) {
  platformSpy().onBase64Encode = [](const std::string&, char*, size_t) { return 0; };
  EXPECT_TRUE(throws<sso_op_failed>("encode base64 failed.", [&] { verify(header, body); }));
}

TEST_F(WebSphereKeyPlatform, TakesTheKeyFromWhatThePlatformWrote) {
  platformSpy().onBase64Encode = [](const std::string&, char* text, size_t) {
    std::strcpy(text, test::base64("another").c_str());
    return 1;
  };
  EXPECT_TRUE(
      throws<jwt_verify_failed>("verify hmac signature failed", [&] { verify(header, body); }));
}

TEST_F(WebSphereKeyPlatform, IsNotAskedBeforeTheOtherChecks) {
  EXPECT_TRUE(throws<std::invalid_argument>("id_token expired.",
                                            [&] { verify(header, R"({"aud":"id", "exp":1})"); }));
  EXPECT_TRUE(throws<std::invalid_argument>(
      "client ID invalid", [&] { verify(header, R"({"aud":"x", "exp":4102444800})"); }));
  EXPECT_TRUE(throws<jwt_not_support>("none algorithm is not supported",
                                      [&] { verify(R"({"alg":"none"})", body); }));
  EXPECT_TRUE(platformSpy().base64Encode.empty());
}

}  // namespace
