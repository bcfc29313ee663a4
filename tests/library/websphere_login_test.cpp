// Whole logins of the WebSphere client over HTTPS.
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

class WebSphereLogin : public test::Login {
 protected:
  WebSphereLogin() : Login("websphere") {
    header["alg"] = "HS256";
    body["sub"] = "alice@ad.example.net";
  }

  std::string token() const override {
    return test::hmacToken(secret, header.toStyledString(), body.toStyledString());
  }
};

TEST_F(WebSphereLogin, ExchangesTheCodeAndFetchesNothingElse) {
  provideToken();
  OIDCLogin("0.AX&y=/+", user);
  EXPECT_EQ(user, "alice@ad.example.net");
  EXPECT_TRUE(log.isEmpty());
  const auto requests = provider->requests();
  ASSERT_EQ(requests.size(), 1u);
  EXPECT_EQ(requests[0].raw, codeExchange());
}

TEST_F(WebSphereLogin, WorksForAProgramThatKeepsRootAsItsSavedIdentity) {
  provideToken();
  expectLoginWithSavedRoot("alice@ad.example.net");
}

TEST_F(WebSphereLogin, EndsWithAResponseThatIsNoTokenResponse) {
  provide(test::failed(502, "<html>502 Bad Gateway</html>"));
  expectRefused<std::invalid_argument>("parse json falied", 1);
  const std::string no_token = "we cannot find key 'id_token' in response!";
  provide(test::failed(502, "502 Bad Gateway"));
  expectRefused<sso_err_resp>(no_token, 1);
  provide(test::failed(400, R"({"error":"invalid_grant", "error_description":"expired"})"));
  expectRefused<sso_err_resp>(no_token, 1);
  provide(tokenResponse(""));
  expectRefused<std::invalid_argument>("token cannot be empty", 1);
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(WebSphereLogin, EndsWhenTheTokenEndpointIsNotReached) {
  provideNothing();
  expectRefused<std::invalid_argument>("parse json falied", 0);
  EXPECT_TRUE(log.is({exchangeLine(CURLE_COULDNT_CONNECT)}));
}

TEST_F(WebSphereLogin, EndsWhenTheProviderCannotBeTrusted) {
  provide(test::selfSigned({"localhost"}), tokenResponse(token()));
  expectRefused<std::invalid_argument>("parse json falied", 0);
  EXPECT_TRUE(log.is({exchangeLine(CURLE_PEER_FAILED_VERIFICATION)}));
}

TEST_F(WebSphereLogin, EndsWithATokenThatIsNotAcceptable) {
  provide(tokenResponse("not a token"));
  expectRefused<std::invalid_argument>("bad jwt format!", 1);
  const Json::Value right = body;
  body["exp"] = 1;
  provideToken();
  expectRefused<std::invalid_argument>("id_token expired.", 1);
  body = right;
  body["aud"] = "another";
  provideToken();
  expectRefused<std::invalid_argument>("client ID invalid", 1);
  body = right;
  header["alg"] = "RS256";
  provideToken();
  expectRefused<jwt_not_support>("RS256 algorithm is not supported", 1);
  header["alg"] = "HS512";
  provideToken();
  expectRefused<jwt_verify_failed>("verify hmac signature failed", 1);
  header["alg"] = "HS256";
  secret = std::string(766, 's');
  provideToken();
  expectRefused<sso_op_failed>("encode base64 failed.", 1);
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(WebSphereLogin, EndsWithATokenWithoutAUserName) {
  body["sub"] = 5;
  provideToken();
  expectRefused<std::invalid_argument>("cannot find the user name!", 1);
}

TEST_F(WebSphereLogin, EndsWithoutSettings) {
  provideToken();
  test::removeConfig("websphere.conf");
  expectRefused<std::invalid_argument>("parse json falied", 0);
  EXPECT_TRUE(log.is({exchangeLine(CURLE_URL_MALFORMAT)}));
}

}  // namespace
