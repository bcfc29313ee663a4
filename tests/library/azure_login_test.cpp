// Whole logins of the Azure client over HTTPS.
#include <curl/curl.h>
#include <gtest/gtest.h>
#include <json/value.h>

#include <memory>
#include <string>
#include <vector>

#include "sso/azuresso.h"
#include "sso/sso.h"
#include "support/ca.h"
#include "support/device.h"
#include "support/log.h"
#include "support/provider.h"
#include "support/throws.h"
#include "support/tokens.h"

namespace {

using QOVA::JWT::jwt_not_support;
using QOVA::JWT::jwt_verify_failed;
using QOVA::SSO::OIDCLogin;
using QOVA::SSO::sso_err_resp;
using QOVA::SSO::sso_op_failed;
using test::throws;

const char kDiscovery[] = "/tenant/v2.0/.well-known/openid-configuration";

class AzureLogin : public testing::Test {
 protected:
  AzureLogin() {
    authority.trust();
    test::writeConfig("profile.conf", R"({"sso_enable":true, "sso_profile":"azure"})", 0644);
    header["alg"] = "RS256";
    header["kid"] = "the key";
    body["exp"] = Json::Int64{4102444800};
    body["tid"] = "the tenant";
    body["aud"] = "the device";
    body["unique_name"] = "Alice@corp.example.com";
  }

  std::string Token() const {
    return test::rsaToken(test::anyRsaKey(), header.toStyledString(), body.toStyledString());
  }

  static test::Answer Response(const std::string& token) {
    Json::Value response;
    response["token_type"] = "Bearer";
    response["access_token"] = "opaque";
    response["id_token"] = token;
    return test::ok(response.toStyledString());
  }

  // Starts a provider that gives this answer to the code exchange, and points the device at it.
  void Provide(const test::Identity& identity, const test::Answer& response) {
    provider = std::make_unique<test::Provider>(identity);
    provider->answer("/token", response);
    provider->answer(kDiscovery, test::ok("{\"jwks_uri\":\"" + provider->url("/keys") + "\"}"));
    provider->answer("/keys", test::ok("{\"keys\":[" + test::anyRsaKey().jwk("the key") + "]}"));
    provider->start();
    Json::Value file;
    file["azure_sso_enable"] = false;  // not asked by a login
    file["azure_wellknown"] = provider->url(kDiscovery);
    file["azure_token_endpoint"] = provider->url("/token");
    file["azure_client_id"] = "the device";
    file["azure_client_secret"] = "s3cr&t";
    file["azure_tenant_id"] = "the tenant";
    file["azure_redirect_uri"] = "https://nas.example.com/login";
    test::writeConfig("azure.conf", file.toStyledString());
    log.clear();
  }
  void Provide(const test::Answer& response) { Provide(authority.issue({"localhost"}), response); }

  // A login that fails with this exception, after so many requests.
  template <typename Error>
  void ExpectRefused(const std::string& message, size_t requests) {
    EXPECT_TRUE(throws<Error>(message, [&] { OIDCLogin("the code", user); }));
    EXPECT_EQ(user, "before");
    EXPECT_EQ(provider->requests().size(), requests);
  }

  std::string Host() const {
    return "Host: localhost:" + std::to_string(provider->port()) + "\r\n";
  }

  test::Ca authority;
  std::unique_ptr<test::Provider> provider;
  Json::Value header;
  Json::Value body;
  std::string user = "before";
  test::Log log;
};

TEST_F(AzureLogin, ExchangesTheCodeAndFetchesTheKeysToNameTheUser) {
  Provide(Response(Token()));
  OIDCLogin("0.AX&y=/+", user);
  EXPECT_EQ(user, "CORP.EXAMPLE.COM\\Alice");
  EXPECT_TRUE(log.isEmpty());
  const std::string form =
      "client_id=the%20device&client_secret=s3cr%26t&code=0.AX%26y%3D%2F%2B"
      "&grant_type=authorization_code&redirect_uri=https%3A%2F%2Fnas.example.com%2Flogin";
  const auto requests = provider->requests();
  ASSERT_EQ(requests.size(), 3u);
  EXPECT_EQ(requests[0].raw, "POST /token HTTP/1.1\r\n" + Host() +
                                 "Accept: */*\r\nContent-Length: " + std::to_string(form.size()) +
                                 "\r\nContent-Type: application/x-www-form-urlencoded\r\n\r\n" +
                                 form);
  EXPECT_EQ(requests[1].raw,
            std::string("GET ") + kDiscovery + " HTTP/1.1\r\n" + Host() + "Accept: */*\r\n\r\n");
  EXPECT_EQ(requests[2].raw, "GET /keys HTTP/1.1\r\n" + Host() + "Accept: */*\r\n\r\n");
}

TEST_F(AzureLogin, WorksForAProgramThatKeepsRootAsItsSavedIdentity) {
  Provide(Response(Token()));
  const std::string name = test::asProcess({1000, 1001, 0}, {1000, 1001, 0}, [&] {
    test::Log child_log;
    OIDCLogin("the code", user);
    EXPECT_TRUE(
        child_log.is({{LOG_AUTH | LOG_INFO, "azuresso.cpp", "WARNING: setresgid(-1, 0, -1)"},
                      {LOG_AUTH | LOG_INFO, "azuresso.cpp", "WARNING: setresuid(-1, 0, -1)"},
                      {LOG_AUTH | LOG_INFO, "azuresso.cpp", "WARNING: setresuid(-1, 0, -1)"}}));
    return user;
  });
  EXPECT_EQ(name, "CORP.EXAMPLE.COM\\Alice");
}

TEST_F(AzureLogin, EndsWithAnErrorResponse) {
  Provide(test::failed(400, R"({"error":"invalid_grant", "error_description":"expired"})"));
  ExpectRefused<sso_err_resp>("{\"error\":\"invalid_grant\",\"error_description\":\"expired\"}\n",
                              1);
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(AzureLogin, EndsWithAResponseThatIsNoTokenResponse) {
  Provide(test::failed(502, "<html>502 Bad Gateway</html>"));
  ExpectRefused<std::invalid_argument>("parse json falied", 1);
  Provide(test::failed(502, "502 Bad Gateway"));
  ExpectRefused<sso_err_resp>("we cannot find key 'id_token' in response!", 1);
  Provide(test::ok(R"({"access_token":"opaque"})"));
  ExpectRefused<sso_err_resp>("we cannot find key 'id_token' in response!", 1);
  Provide(Response(""));
  ExpectRefused<std::invalid_argument>("token cannot be empty", 1);
  EXPECT_TRUE(log.isEmpty());
}

test::Expected TokenLine(CURLcode code) {
  return {LOG_ERR, "sso.cpp", std::string("request token uri ") + curl_easy_strerror(code) + "."};
}

TEST_F(AzureLogin, EndsWhenTheTokenEndpointIsNotReached) {
  Provide(Response(Token()));
  Json::Value file;
  file["azure_token_endpoint"] =
      "https://localhost:" + std::to_string(test::unusedPort()) + "/token";
  test::writeConfig("azure.conf", file.toStyledString());
  ExpectRefused<std::invalid_argument>("parse json falied", 0);
  EXPECT_TRUE(log.is({TokenLine(CURLE_COULDNT_CONNECT)}));
}

TEST_F(AzureLogin, EndsWhenTheProviderCannotBeTrusted) {
  for (const test::Identity& identity :
       {test::selfSigned({"localhost"}), authority.issue({"other.example.com"}),
        authority.issue({"localhost"}, test::Validity::kExpired)}) {
    Provide(identity, Response(Token()));
    ExpectRefused<std::invalid_argument>("parse json falied", 0);
    EXPECT_TRUE(log.is({TokenLine(CURLE_PEER_FAILED_VERIFICATION)}));
  }
}

TEST_F(AzureLogin, EndsWhenTheResponseBreaksOff) {
  test::Answer answer = Response(Token());
  answer.contentLength = static_cast<long long>(answer.body.size());
  answer.body.resize(answer.body.size() / 2);
  Provide(answer);
  ExpectRefused<std::invalid_argument>("parse json falied", 1);
  EXPECT_TRUE(log.is({TokenLine(CURLE_PARTIAL_FILE)}));
}

// What had arrived is taken for the response.
TEST_F(AzureLogin, GoesOnWhenAWholeResponseCameBeforeTheFailure) {
  test::Answer answer = Response(Token());
  answer.contentLength = static_cast<long long>(answer.body.size()) + 1;
  Provide(answer);
  OIDCLogin("the code", user);
  EXPECT_EQ(user, "CORP.EXAMPLE.COM\\Alice");
  EXPECT_TRUE(log.is({TokenLine(CURLE_PARTIAL_FILE)}));
}

TEST_F(AzureLogin, EndsWithATokenWhoseClaimsAreWrongBeforeTheKeysAreFetched) {
  Provide(Response("not a token"));
  ExpectRefused<std::invalid_argument>("bad jwt format!", 1);
  const Json::Value right = body;
  body["exp"] = 1;
  Provide(Response(Token()));
  ExpectRefused<std::invalid_argument>("id_token expired.", 1);
  body = right;
  body["tid"] = "another";
  Provide(Response(Token()));
  ExpectRefused<std::invalid_argument>("tenant ID invalid", 1);
  body = right;
  body["aud"] = "another";
  Provide(Response(Token()));
  ExpectRefused<std::invalid_argument>("client ID invalid", 1);
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(AzureLogin, EndsWithATokenThatTheKeysDoNotConfirm) {
  header["kid"] = "unknown";
  Provide(Response(Token()));
  ExpectRefused<std::invalid_argument>("kid does not exist in Azure verified kyes", 3);
  header["kid"] = "the key";
  header["alg"] = "HS256";
  Provide(Response(Token()));
  ExpectRefused<jwt_not_support>("HS256 algorithm is not supported", 3);
  header["alg"] = "RS384";
  Provide(Response(Token()));
  ExpectRefused<jwt_verify_failed>("verify rsa signature failed", 3);
  EXPECT_TRUE(log.is({{LOG_ERR, "jwt.cpp", "EVP_DigestVerifyFinal failed"}}));
}

TEST_F(AzureLogin, EndsWithATokenThatNamesNobody) {
  body.removeMember("unique_name");
  Provide(Response(Token()));
  ExpectRefused<std::invalid_argument>("cannot find the user name!", 3);
  body["email"] = "alice";
  Provide(Response(Token()));
  ExpectRefused<std::invalid_argument>("cannot get the user name!", 3);
}

TEST_F(AzureLogin, EndsWithAUserThatThePlatformDoesNotKnow) {
  body["unique_name"] = std::string(1022, 'a') + "@x";
  Provide(Response(Token()));
  EXPECT_TRUE(throws<sso_op_failed>("QOVAWinsUserNameFqdn2Netbios failed.",
                                    [&] { OIDCLogin("the code", user); }));
  EXPECT_EQ(user, "X\\" + std::string(1022, 'a'));
}

TEST_F(AzureLogin, EndsWithoutSettings) {
  Provide(Response(Token()));
  test::removeConfig("azure.conf");
  ExpectRefused<std::invalid_argument>("parse json falied", 0);
  EXPECT_TRUE(log.is({TokenLine(CURLE_URL_MALFORMAT)}));
}

}  // namespace
