// The signature of a WebSphere ID token, and the user that it names.
#include <gtest/gtest.h>
#include <json/value.h>

#include <ctime>
#include <string>
#include <vector>

#include "sso/webspheresso.h"
#include "support/device.h"
#include "support/log.h"
#include "support/throws.h"
#include "support/tokens.h"

namespace {

using QOVA::JWT::jwt_not_support;
using QOVA::JWT::jwt_verify_failed;
using QOVA::SSO::sso_op_failed;
using QOVA::SSO::WebSphereSSOClient;
using test::throws;

const char kWrongSignature[] = "verify hmac signature failed";

class WebSphereVerify : public testing::Test {
 protected:
  void SetUp() override {
    header["alg"] = "HS256";
    body["aud"] = "the device";
    body["exp"] = Json::Int64{4102444800};
  }

  void TearDown() override { EXPECT_TRUE(log.isEmpty()); }

  std::string token(const std::string& algorithm = "HS256") const {
    return test::hmacToken(secret, header.toStyledString(), body.toStyledString(), algorithm);
  }

  // Verifies a token as a device would that is configured with `secret`.
  void verify(const std::string& token) const {
    Json::Value file;
    file["websphere_client_id"] = "the device";
    file["websphere_client_secret"] = secret;
    test::writeConfig("websphere.conf", file.toStyledString());
    WebSphereSSOClient client;
    store(client, token);
    struct Kept {
      ~Kept() { EXPECT_EQ(client.GetToken(), token); }
      WebSphereSSOClient& client;
      const std::string& token;
    } kept{client, token};
    client.VerifyIDToken();
  }

  static void store(WebSphereSSOClient& client, const std::string& token) {
    Json::Value response;
    response["id_token"] = token;
    client.ProcessTokenResponse(response.toStyledString());
  }

  std::string secret = "s3cret";
  Json::Value header;
  Json::Value body;
  test::Log log;
};

TEST_F(WebSphereVerify, AcceptsTheThreeAlgorithms) {
  for (const char* algorithm : {"HS256", "HS384", "HS512"}) {
    header["alg"] = algorithm;
    EXPECT_NO_THROW(verify(token(algorithm))) << algorithm;
  }
}

TEST_F(WebSphereVerify, RefusesTheDigestOfAnotherAlgorithm) {
  header["alg"] = "HS512";
  EXPECT_TRUE(throws<jwt_verify_failed>(kWrongSignature, [&] { verify(token("HS256")); }));
}

TEST_F(WebSphereVerify, RefusesEveryOtherAlgorithm) {
  for (const char* algorithm : {"RS256", "RS512", "ES256", "none", "hs256", "Hs256", "", "HS25",
                                "HS2560", " HS256", "HS256 ", "HS128"}) {
    header["alg"] = algorithm;
    EXPECT_TRUE(throws<jwt_not_support>(std::string(algorithm) + " algorithm is not supported",
                                        [&] { verify(token()); }));
  }
}

TEST_F(WebSphereVerify, NamesAnAlgorithmThatIsNoTextByItsText) {
  header["alg"] = 5;
  EXPECT_TRUE(throws<jwt_not_support>("5 algorithm is not supported", [&] { verify(token()); }));
  header["alg"] = Json::Value();
  EXPECT_TRUE(throws<jwt_not_support>(" algorithm is not supported", [&] { verify(token()); }));
  header.removeMember("alg");
  EXPECT_TRUE(throws<jwt_not_support>(" algorithm is not supported", [&] { verify(token()); }));
  for (const char* other : {"[]", "502", "null", "\"HS256\""}) {
    const std::string token = test::hmacToken(secret, other, body.toStyledString());
    EXPECT_TRUE(throws<jwt_not_support>(" algorithm is not supported", [&] { verify(token); }));
  }
}

TEST_F(WebSphereVerify, RefusesAnotherSecretTextOrSignature) {
  const std::string token = this->token();
  std::string other = token;
  other.back() = other.back() == 'A' ? 'B' : 'A';
  EXPECT_TRUE(throws<jwt_verify_failed>(kWrongSignature, [&] { verify(other); }));
  EXPECT_TRUE(throws<jwt_verify_failed>(kWrongSignature, [&] { verify(token + "="); }));
  const std::string unsigned_token = token.substr(0, token.rfind('.') + 1);
  EXPECT_TRUE(throws<jwt_verify_failed>(kWrongSignature, [&] { verify(unsigned_token); }));
  body["admin"] = true;
  const std::string changed = test::signingInput(header.toStyledString(), body.toStyledString()) +
                              token.substr(token.rfind('.'));
  EXPECT_TRUE(throws<jwt_verify_failed>(kWrongSignature, [&] { verify(changed); }));
  secret = "S3cret";
  EXPECT_TRUE(throws<jwt_verify_failed>(kWrongSignature, [&] { verify(token); }));
}

TEST_F(WebSphereVerify, TakesTheBytesOfTheSecretAsTheKey) {
  const std::vector<std::string> secrets = {"x", "a b", "=", "M\xc3\xbcnchen", "c2VjcmV0",
                                            std::string(64, 'k'), std::string(65, 'k'),
                                            std::string("a\0b", 3),
                                            // With "+" and "/" in its base64 text.
                                            "\xc3\xbb\xc3\xbf\xc3\xbe\xc3\xbf>>>???"};
  for (const std::string& key : secrets) {
    secret = key;
    EXPECT_NO_THROW(verify(token())) << testing::PrintToString(secret);
  }
  EXPECT_NE(test::base64(secret).find('+'), std::string::npos);
  EXPECT_NE(test::base64(secret).find('/'), std::string::npos);
}

TEST_F(WebSphereVerify, AcceptsASecretOf765Bytes) {
  secret = std::string(765, 's');
  EXPECT_NO_THROW(verify(token()));
}

TEST_F(WebSphereVerify, RefusesASecretOf766Bytes) {
  secret = std::string(766, 's');
  EXPECT_TRUE(throws<sso_op_failed>("encode base64 failed.", [&] { verify(token()); }));
}

// Even for a token that is signed with the empty key.
TEST_F(WebSphereVerify, RefusesAnEmptySecret) {
  secret = "";
  EXPECT_TRUE(throws<jwt_verify_failed>(kWrongSignature, [&] { verify(token()); }));
}

TEST_F(WebSphereVerify, LooksAtNoOtherClaim) {
  body["iss"] = "https://foreign.example.com";
  body["nonce"] = "wrong";
  body["nbf"] = Json::Int64{4102444800};
  body["iat"] = Json::Int64{4102444800};
  body["tid"].append("a tenant");
  body["azp"] = "another";
  header["kid"].append("unknown");
  header["typ"] = "odd";
  EXPECT_NO_THROW(verify(token()));
}

TEST_F(WebSphereVerify, ComparesTextsOfNumbersToo) {
  body["aud"] = 42;
  EXPECT_TRUE(throws<std::invalid_argument>("client ID invalid", [&] { verify(token()); }));
  test::writeConfig("websphere.conf",
                    R"({"websphere_client_id":"42", "websphere_client_secret":"s3cret"})");
  WebSphereSSOClient client;
  store(client, token());
  EXPECT_NO_THROW(client.VerifyIDToken());
}

// A token that is wrong in every way reports the first; repaired, the next.
TEST_F(WebSphereVerify, ReportsTheFirstOfManyFaults) {
  secret = std::string(766, 's');
  header["alg"] = "none";
  body["aud"] = "another";
  body["exp"] = 1;
  EXPECT_TRUE(throws<std::invalid_argument>("token cannot be empty", [&] { verify(""); }));
  EXPECT_TRUE(throws<std::invalid_argument>("bad jwt format!", [&] { verify("!!!!.!!!!"); }));
  EXPECT_TRUE(
      throws<std::invalid_argument>("bad jwt header format!", [&] { verify("!!!!.!!!!.!"); }));
  EXPECT_TRUE(throws<std::invalid_argument>("bad jwt body format!", [&] { verify("e30.!!!!.!"); }));
  EXPECT_TRUE(throws<std::invalid_argument>("id_token expired.", [&] { verify(token() + "x"); }));
  body["exp"] = Json::Int64{4102444800};
  EXPECT_TRUE(throws<std::invalid_argument>("client ID invalid", [&] { verify(token() + "x"); }));
  body["aud"] = "the device";
  EXPECT_TRUE(
      throws<jwt_not_support>("none algorithm is not supported", [&] { verify(token() + "x"); }));
  header["alg"] = "HS256";
  EXPECT_TRUE(throws<sso_op_failed>("encode base64 failed.", [&] { verify(token() + "x"); }));
  secret = "s3cret";
  EXPECT_TRUE(throws<jwt_verify_failed>(kWrongSignature, [&] { verify(token() + "x"); }));
  EXPECT_NO_THROW(verify(token()));
}

class WebSphereUser : public WebSphereVerify {
 protected:
  void storeClaims(const std::string& claims) {
    store(client, "!." + test::base64url(claims) + ".!");
  }

  WebSphereSSOClient client;
  std::string user = "before";
  Json::Value info = "before";
};

TEST_F(WebSphereUser, IsTheSubjectUnchanged) {
  for (const std::string& name :
       {std::string("alice"), std::string("Alice@Corp.example.com"), std::string("CORP\\alice"),
        std::string(" "), std::string(), std::string("j\xc3\xbcrgen"), std::string("a\0b", 3),
        std::string(5000, 'a')}) {
    Json::Value claims;
    claims["sub"] = name;
    claims["unique_name"] = "other@x";
    claims["email"] = "other@x";
    storeClaims(claims.toStyledString());
    client.GetUserName(user);
    EXPECT_EQ(user, name);
  }
}

TEST_F(WebSphereUser, WithoutASubjectThatIsTextIsRefused) {
  for (const char* claims :
       {"{}", R"({"sub":5})", R"({"sub":null})", R"({"sub":true})", R"({"sub":["alice"]})",
        R"({"sub":{"a":"b"}})", R"({"Sub":"alice"})", R"({"email":"a@b", "unique_name":"a@b"})",
        "null", "502", "[]", R"(["sub"])", R"("sub")"}) {
    storeClaims(claims);
    EXPECT_TRUE(throws<std::invalid_argument>("cannot find the user name!", [&] {
      client.GetUserName(user);
    })) << claims;
  }
  EXPECT_EQ(user, "before");
}

TEST_F(WebSphereUser, HasTheClaimsOfTheToken) {
  storeClaims(R"({"sub":"s", "list":[1,2]})");
  const std::string token = client.GetToken();
  client.GetUserInfo(info);
  EXPECT_EQ(info["sub"], "s");
  EXPECT_EQ(info["list"][1], 2);
  EXPECT_EQ(info.size(), 2u);
  EXPECT_EQ(client.GetToken(), token);
  storeClaims("[7]");
  client.GetUserInfo(info);
  EXPECT_EQ(info.size(), 1u) << "what was there is replaced";
  EXPECT_EQ(info[0], 7);
}

TEST_F(WebSphereUser, NeedsATokenThatCanBeRead) {
  const std::vector<std::pair<std::string, std::string>> cases = {
      {"", "please request a id_token first."},
      {"a.b", "bad jwt format!"},
      {"a.b.c.d", "bad jwt format!"},
      {"e30.!!!!.s", "bad jwt body format!"},
      {"e30.A.s", "bad jwt body format!"}};
  for (const auto& [token, message] : cases) {
    store(client, token);
    EXPECT_TRUE(throws<std::invalid_argument>(message, [&] { client.GetUserName(user); })) << token;
    EXPECT_TRUE(throws<std::invalid_argument>(message, [&] { client.GetUserInfo(info); })) << token;
  }
  store(client, "e30..s");
  EXPECT_TRUE(throws<std::logic_error>([&] { client.GetUserName(user); }));
  EXPECT_TRUE(throws<std::logic_error>([&] { client.GetUserInfo(info); }));
  EXPECT_EQ(user, "before");
  EXPECT_EQ(info, "before");
}

TEST_F(WebSphereUser, StaysUnknownWithoutAResponse) {
  WebSphereSSOClient fresh;
  EXPECT_TRUE(throws<std::invalid_argument>("please request a id_token first.",
                                            [&] { fresh.GetUserName(user); }));
  EXPECT_TRUE(throws<std::invalid_argument>("please request a id_token first.",
                                            [&] { fresh.GetUserInfo(info); }));
}

}  // namespace
