// What the clients take out of a token response.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "support/both_clients.h"
#include "support/log.h"
#include "support/throws.h"

namespace {

using QOVA::SSO::AzureSSOClient;
using QOVA::SSO::sso_err_resp;
using QOVA::SSO::WebSphereSSOClient;
using test::throws;

const char kNoToken[] = "we cannot find key 'id_token' in response!";

template <typename Provider>
class TokenResponse : public testing::Test {
 protected:
  // A token from an earlier response must not survive a response without one.
  template <typename Error>
  void expectRefused(const std::string& response, const std::string& message) {
    SCOPED_TRACE(testing::PrintToString(response.substr(0, 100)));
    client.ProcessTokenResponse(R"({"id_token":"earlier"})");
    EXPECT_EQ(client.GetToken(), "earlier");
    EXPECT_TRUE(throws<Error>(message, [&] { client.ProcessTokenResponse(response); }));
    EXPECT_EQ(client.GetToken(), "");
  }

  void TearDown() override { EXPECT_TRUE(log.isEmpty()); }

  typename Provider::Client client;
  test::Log log;
};
TYPED_TEST_SUITE(TokenResponse, test::Clients, test::ClientName);

TYPED_TEST(TokenResponse, GivesItsIdTokenUnchanged) {
  for (const char* token : {"a.b.c", "", "not a token", "a.b.c.d"}) {
    this->client.ProcessTokenResponse(std::string(R"({"id_token":")") + token + "\"}");
    EXPECT_EQ(this->client.GetToken(), token);
  }
}

// The example of OpenID Connect Core 1.0, section 3.1.3.3, in its other members.
TYPED_TEST(TokenResponse, GivesNothingButItsIdToken) {
  this->client.ProcessTokenResponse(R"({
    "access_token": "SlAV32hkKG", "token_type": "Bearer", "refresh_token": "8xLOxBtZp8",
    "expires_in": 3600, "ext_expires_in": 0, "expires_on": "1", "id_token": "a.b.c"})");
  EXPECT_EQ(this->client.GetToken(), "a.b.c");
  EXPECT_EQ(this->client.GetIDTokenReqParams(),
            "client_id=&client_secret=&code=&grant_type=authorization_code&redirect_uri=");
}

TYPED_TEST(TokenResponse, ThatIsNotJsonIsRefused) {
  const std::vector<std::string> texts = {
      "",
      " ",
      "hello",
      "{",
      "{\"id_token\":\"a.b.c\"",
      "<html>502 Bad Gateway</html>",
      "\xff\xfe",
      std::string(1, '\0'),
      "error=invalid_grant",
      std::string(2000, '['),
      "{\"id_token\":\"a.b.c\",\"x\":" + std::string(1001, '[') + std::string(1001, ']') + "}"};
  for (const std::string& text : texts)
    this->template expectRefused<std::invalid_argument>(text, "parse json falied");
}

TYPED_TEST(TokenResponse, WithoutAnIdTokenIsRefused) {
  for (const char* text :
       {"{}", R"({"id_token":null})", R"({"id_token":5})", R"({"id_token":true})",
        R"({"id_token":["a.b.c"]})", R"({"id_token":{"a":"b"}})", R"({"ID_TOKEN":"a.b.c"})",
        R"({"access_token":"a.b.c"})", R"({"x":{"id_token":"a.b.c"}})"})
    this->template expectRefused<sso_err_resp>(text, kNoToken);
}

// "502 Bad Gateway" is the number 502 to the JSON reader.
TYPED_TEST(TokenResponse, ThatIsNotAnObjectHasNoIdToken) {
  for (const char* text :
       {"502 Bad Gateway", "502", "null", "true", "\"id_token\"", "[]", R"(["id_token","a.b.c"])",
        R"([{"id_token":"a.b.c"}])", R"(["error"])", "\"error\""})
    this->template expectRefused<sso_err_resp>(text, kNoToken);
}

TYPED_TEST(TokenResponse, MayHoldComments) {
  this->client.ProcessTokenResponse("/* a */ {\"id_token\": /* b */ \"a.b.c\"} // c");
  EXPECT_EQ(this->client.GetToken(), "a.b.c");
}

TYPED_TEST(TokenResponse, MayBeLong) {
  const std::string token(3 << 20, 't');
  this->client.ProcessTokenResponse("{\"id_token\":\"" + token + "\"}");
  EXPECT_EQ(this->client.GetToken(), token);
}

struct ErrorResponse {
  const char* response;
  const char* message;
};

using AzureErrorResponse = TokenResponse<test::Azure>;

// RFC 6749, section 5.2, and the members that the provider adds. The message is the whole
// document, on one line with a line feed at its end, members in the order of their names.
TEST_F(AzureErrorResponse, IsTheMessage) {
  const std::vector<ErrorResponse> cases = {
      {R"({"error":"invalid_grant"})", "{\"error\":\"invalid_grant\"}\n"},
      {R"({"trace_id":"t", "timestamp":"2020-01-01 00:00:00Z", "error_codes":[70008, 5],
          "error":"invalid_grant", "correlation_id":"c",
          "error_description":"line one\r\nline \"two\""})",
       "{\"correlation_id\":\"c\",\"error\":\"invalid_grant\",\"error_codes\":[70008,5],"
       "\"error_description\":\"line one\\r\\nline \\\"two\\\"\","
       "\"timestamp\":\"2020-01-01 00:00:00Z\",\"trace_id\":\"t\"}\n"},
      {"{\"error\":\"M\xc3\xbcnchen\"}", "{\"error\":\"M\\u00fcnchen\"}\n"},
      {R"({"error":null})", "{\"error\":null}\n"},
      {R"({"error":5})", "{\"error\":5}\n"},
      {R"({"error":{"code":"x"}})", "{\"error\":{\"code\":\"x\"}}\n"},
      {R"({"id_token":"a.b.c", "error":""})", "{\"error\":\"\",\"id_token\":\"a.b.c\"}\n"}};
  for (const ErrorResponse& error : cases)
    expectRefused<sso_err_resp>(error.response, error.message);
}

using WebSphereErrorResponse = TokenResponse<test::WebSphere>;

TEST_F(WebSphereErrorResponse, IsNotLookedInto) {
  expectRefused<sso_err_resp>(R"({"error":"invalid_grant", "error_description":"expired"})",
                              kNoToken);
}

TEST_F(WebSphereErrorResponse, DoesNotHinderAnIdToken) {
  client.ProcessTokenResponse(R"({"error":"odd", "id_token":"a.b.c"})");
  EXPECT_EQ(client.GetToken(), "a.b.c");
}

}  // namespace
