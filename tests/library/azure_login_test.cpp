// Whole logins of the Azure client over HTTPS.
#include <curl/curl.h>
#include <gtest/gtest.h>
#include <json/value.h>

#include <string>

#include "support/login.h"
#include "support/tokens.h"

namespace {

using QOVA::JWT::jwt_not_support;
using QOVA::JWT::jwt_verify_failed;
using QOVA::SSO::OIDCLogin;
using QOVA::SSO::sso_err_resp;
using QOVA::SSO::sso_op_failed;
using test::throws;

class AzureLogin : public test::Login {
 protected:
  AzureLogin() : Login("azure") {
    header["alg"] = "RS256";
    header["kid"] = "the key";
    body["tid"] = "the tenant";
    body["unique_name"] = "alice@ad.example.net";
  }

  std::string token() const override {
    return test::rsaToken(test::anyRsaKey(), header.toStyledString(), body.toStyledString());
  }

  void prepare(Json::Value& settings) override {
    provider->answer(kDiscovery, test::ok("{\"jwks_uri\":\"" + provider->url("/keys") + "\"}"));
    provider->answer("/keys", test::ok("{\"keys\":[" + test::anyRsaKey().jwk("the key") + "]}"));
    settings["azure_sso_enable"] = false;  // not asked by a login
    settings["azure_tenant_id"] = "the tenant";
  }
};

TEST_F(AzureLogin, ExchangesTheCodeAndFetchesTheKeysToNameTheUser) {
  provideToken();
  OIDCLogin("0.AX&y=/+", user);
  EXPECT_EQ(user, "AD.EXAMPLE.NET\\alice");
  EXPECT_TRUE(log.isEmpty());
  const auto requests = provider->requests();
  ASSERT_EQ(requests.size(), 3u);
  EXPECT_EQ(requests[0].raw, codeExchange());
  EXPECT_EQ(requests[1].raw,
            std::string("GET ") + kDiscovery + " HTTP/1.1\r\n" + host() + "Accept: */*\r\n\r\n");
  EXPECT_EQ(requests[2].raw, "GET /keys HTTP/1.1\r\n" + host() + "Accept: */*\r\n\r\n");
}

TEST_F(AzureLogin, WorksForAProgramThatKeepsRootAsItsSavedIdentity) {
  provideToken();
  expectLoginWithSavedRoot("AD.EXAMPLE.NET\\alice");
}

TEST_F(AzureLogin, EndsWithAnErrorResponse) {
  provide(test::failed(400, R"({"error":"invalid_grant", "error_description":"expired"})"));
  expectRefused<sso_err_resp>("{\"error\":\"invalid_grant\",\"error_description\":\"expired\"}\n",
                              1);
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(AzureLogin, EndsWithAResponseThatIsNoTokenResponse) {
  provide(test::failed(502, "<html>502 Bad Gateway</html>"));
  expectRefused<std::invalid_argument>("parse json falied", 1);
  provide(test::failed(502, "502 Bad Gateway"));
  expectRefused<sso_err_resp>("we cannot find key 'id_token' in response!", 1);
  provide(test::ok(R"({"access_token":"opaque"})"));
  expectRefused<sso_err_resp>("we cannot find key 'id_token' in response!", 1);
  provide(tokenResponse(""));
  expectRefused<std::invalid_argument>("token cannot be empty", 1);
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(AzureLogin, EndsWhenTheTokenEndpointIsNotReached) {
  provideNothing();
  expectRefused<std::invalid_argument>("parse json falied", 0);
  EXPECT_TRUE(log.is({exchangeLine(CURLE_COULDNT_CONNECT)}));
}

TEST_F(AzureLogin, EndsWhenTheProviderCannotBeTrusted) {
  for (const test::Identity& identity :
       {test::selfSigned({"localhost"}), authority.issue({"other.example.org"}),
        authority.issue({"localhost"}, test::Validity::kExpired)}) {
    provide(identity, tokenResponse(token()));
    expectRefused<std::invalid_argument>("parse json falied", 0);
    EXPECT_TRUE(log.is({exchangeLine(CURLE_PEER_FAILED_VERIFICATION)}));
  }
}

TEST_F(AzureLogin, EndsWhenTheResponseBreaksOff) {
  test::Answer answer = tokenResponse(token());
  answer.contentLength = static_cast<long long>(answer.body.size());
  answer.body.resize(answer.body.size() / 2);
  provide(answer);
  expectRefused<std::invalid_argument>("parse json falied", 1);
  EXPECT_TRUE(log.is({exchangeLine(CURLE_PARTIAL_FILE)}));
}

// What had arrived is taken for the response.
TEST_F(AzureLogin, GoesOnWhenAWholeResponseCameBeforeTheFailure) {
  test::Answer answer = tokenResponse(token());
  answer.contentLength = static_cast<long long>(answer.body.size()) + 1;
  provide(answer);
  OIDCLogin("the code", user);
  EXPECT_EQ(user, "AD.EXAMPLE.NET\\alice");
  EXPECT_TRUE(log.is({exchangeLine(CURLE_PARTIAL_FILE)}));
}

TEST_F(AzureLogin, EndsWithATokenWhoseClaimsAreWrongBeforeTheKeysAreFetched) {
  provide(tokenResponse("not a token"));
  expectRefused<std::invalid_argument>("bad jwt format!", 1);
  const Json::Value right = body;
  body["exp"] = 1;
  provideToken();
  expectRefused<std::invalid_argument>("id_token expired.", 1);
  body = right;
  body["tid"] = "another";
  provideToken();
  expectRefused<std::invalid_argument>("tenant ID invalid", 1);
  body = right;
  body["aud"] = "another";
  provideToken();
  expectRefused<std::invalid_argument>("client ID invalid", 1);
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(AzureLogin, EndsWithATokenThatTheKeysDoNotConfirm) {
  header["kid"] = "unknown";
  provideToken();
  expectRefused<std::invalid_argument>("kid does not exist in Azure verified kyes", 3);
  header["kid"] = "the key";
  header["alg"] = "HS256";
  provideToken();
  expectRefused<jwt_not_support>("HS256 algorithm is not supported", 3);
  header["alg"] = "RS384";
  provideToken();
  expectRefused<jwt_verify_failed>("verify rsa signature failed", 3);
  EXPECT_TRUE(log.is({{LOG_ERR, "jwt.cpp", "EVP_DigestVerifyFinal failed"}}));
}

TEST_F(AzureLogin, EndsWithATokenWithoutAUserName) {
  body.removeMember("unique_name");
  provideToken();
  expectRefused<std::invalid_argument>("cannot find the user name!", 3);
  body["email"] = "alice";
  provideToken();
  expectRefused<std::invalid_argument>("cannot get the user name!", 3);
}

TEST_F(AzureLogin, EndsWithAUserThatThePlatformDoesNotKnow) {
  body["unique_name"] = std::string(1022, 'a') + "@x";
  provideToken();
  EXPECT_TRUE(throws<sso_op_failed>("QOVAWinsUserNameFqdn2Netbios failed.",
                                    [&] { OIDCLogin("the code", user); }));
  EXPECT_EQ(user, "X\\" + std::string(1022, 'a'));
}

TEST_F(AzureLogin, EndsWithoutSettings) {
  provideToken();
  test::removeConfig("azure.conf");
  expectRefused<std::invalid_argument>("parse json falied", 0);
  EXPECT_TRUE(log.is({exchangeLine(CURLE_URL_MALFORMAT)}));
}

}  // namespace
