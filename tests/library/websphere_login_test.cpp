// Whole logins of the WebSphere client over HTTPS.
#include <curl/curl.h>
#include <gtest/gtest.h>
#include <json/value.h>

#include <memory>
#include <string>

#include "sso/sso.h"
#include "sso/webspheresso.h"
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

class WebSphereLogin : public testing::Test {
 protected:
  WebSphereLogin() {
    authority.trust();
    test::writeConfig("profile.conf", R"({"sso_enable":true, "sso_profile":"websphere"})", 0644);
    header["alg"] = "HS256";
    body["exp"] = Json::Int64{4102444800};
    body["aud"] = "the device";
    body["sub"] = "Alice@corp.example.com";
  }

  std::string Token() const {
    return test::hmacToken(secret, header.toStyledString(), body.toStyledString());
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
    provider->answer("/token", response).start();
    Json::Value file;
    file["websphere_wellknown"] = provider->url("/discovery");
    file["websphere_token_endpoint"] = provider->url("/token");
    file["websphere_client_id"] = "the device";
    file["websphere_client_secret"] = secret;
    file["websphere_redirect_uri"] = "https://nas.example.com/login";
    test::writeConfig("websphere.conf", file.toStyledString());
    log.clear();
  }
  void Provide(const test::Answer& response) { Provide(authority.issue({"localhost"}), response); }

  template <typename Error>
  void ExpectRefused(const std::string& message, size_t requests = 1) {
    EXPECT_TRUE(throws<Error>(message, [&] { OIDCLogin("the code", user); }));
    EXPECT_EQ(user, "before");
    EXPECT_EQ(provider->requests().size(), requests);
  }

  test::Ca authority;
  std::unique_ptr<test::Provider> provider;
  std::string secret = "s3cr&t";
  Json::Value header;
  Json::Value body;
  std::string user = "before";
  test::Log log;
};

TEST_F(WebSphereLogin, ExchangesTheCodeAndFetchesNothingElse) {
  Provide(Response(Token()));
  OIDCLogin("0.AX&y=/+", user);
  EXPECT_EQ(user, "Alice@corp.example.com");
  EXPECT_TRUE(log.isEmpty());
  const std::string form =
      "client_id=the%20device&client_secret=s3cr%26t&code=0.AX%26y%3D%2F%2B"
      "&grant_type=authorization_code&redirect_uri=https%3A%2F%2Fnas.example.com%2Flogin";
  const auto requests = provider->requests();
  ASSERT_EQ(requests.size(), 1u);
  EXPECT_EQ(requests[0].raw,
            "POST /token HTTP/1.1\r\nHost: localhost:" + std::to_string(provider->port()) +
                "\r\nAccept: */*\r\nContent-Length: " + std::to_string(form.size()) +
                "\r\nContent-Type: application/x-www-form-urlencoded\r\n\r\n" + form);
}

TEST_F(WebSphereLogin, WorksForAProgramThatKeepsRootAsItsSavedIdentity) {
  Provide(Response(Token()));
  const std::string name = test::asProcess({1000, 1001, 0}, {1000, 1001, 0}, [&] {
    test::Log child_log;
    OIDCLogin("the code", user);
    EXPECT_TRUE(
        child_log.is({{LOG_AUTH | LOG_INFO, "webspheresso.cpp", "WARNING: setresgid(-1, 0, -1)"},
                      {LOG_AUTH | LOG_INFO, "webspheresso.cpp", "WARNING: setresuid(-1, 0, -1)"},
                      {LOG_AUTH | LOG_INFO, "webspheresso.cpp", "WARNING: setresuid(-1, 0, -1)"}}));
    return user;
  });
  EXPECT_EQ(name, "Alice@corp.example.com");
}

TEST_F(WebSphereLogin, EndsWithAResponseThatIsNoTokenResponse) {
  Provide(test::failed(502, "<html>502 Bad Gateway</html>"));
  ExpectRefused<std::invalid_argument>("parse json falied");
  const std::string no_token = "we cannot find key 'id_token' in response!";
  Provide(test::failed(502, "502 Bad Gateway"));
  ExpectRefused<sso_err_resp>(no_token);
  Provide(test::failed(400, R"({"error":"invalid_grant", "error_description":"expired"})"));
  ExpectRefused<sso_err_resp>(no_token);
  Provide(Response(""));
  ExpectRefused<std::invalid_argument>("token cannot be empty");
  EXPECT_TRUE(log.isEmpty());
}

test::Expected TokenLine(CURLcode code) {
  return {LOG_ERR, "sso.cpp", std::string("request token uri ") + curl_easy_strerror(code) + "."};
}

TEST_F(WebSphereLogin, EndsWhenTheTokenEndpointIsNotReached) {
  Provide(Response(Token()));
  Json::Value file;
  file["websphere_token_endpoint"] =
      "https://localhost:" + std::to_string(test::unusedPort()) + "/token";
  test::writeConfig("websphere.conf", file.toStyledString());
  ExpectRefused<std::invalid_argument>("parse json falied", 0);
  EXPECT_TRUE(log.is({TokenLine(CURLE_COULDNT_CONNECT)}));
}

TEST_F(WebSphereLogin, EndsWhenTheProviderCannotBeTrusted) {
  Provide(test::selfSigned({"localhost"}), Response(Token()));
  ExpectRefused<std::invalid_argument>("parse json falied", 0);
  EXPECT_TRUE(log.is({TokenLine(CURLE_PEER_FAILED_VERIFICATION)}));
}

TEST_F(WebSphereLogin, EndsWithATokenThatIsNotAcceptable) {
  Provide(Response("not a token"));
  ExpectRefused<std::invalid_argument>("bad jwt format!");
  const Json::Value right = body;
  body["exp"] = 1;
  Provide(Response(Token()));
  ExpectRefused<std::invalid_argument>("id_token expired.");
  body = right;
  body["aud"] = "another";
  Provide(Response(Token()));
  ExpectRefused<std::invalid_argument>("client ID invalid");
  body = right;
  header["alg"] = "RS256";
  Provide(Response(Token()));
  ExpectRefused<jwt_not_support>("RS256 algorithm is not supported");
  header["alg"] = "HS512";
  Provide(Response(Token()));
  ExpectRefused<jwt_verify_failed>("verify hmac signature failed");
  header["alg"] = "HS256";
  secret = std::string(766, 's');
  Provide(Response(Token()));
  ExpectRefused<sso_op_failed>("encode base64 failed.");
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(WebSphereLogin, EndsWithATokenThatNamesNobody) {
  body["sub"] = 5;
  Provide(Response(Token()));
  ExpectRefused<std::invalid_argument>("cannot find the user name!");
}

TEST_F(WebSphereLogin, EndsWithoutSettings) {
  Provide(Response(Token()));
  test::removeConfig("websphere.conf");
  ExpectRefused<std::invalid_argument>("parse json falied", 0);
  EXPECT_TRUE(log.is({TokenLine(CURLE_URL_MALFORMAT)}));
}

}  // namespace
