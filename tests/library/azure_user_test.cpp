// The claims of an Azure ID token, and the local account that they name.
#include <gtest/gtest.h>

#include <locale>
#include <string>

#include "sso/azuresso.h"
#include "support/log.h"
#include "support/throws.h"
#include "support/tokens.h"

namespace {

using QOVA::SSO::AzureSSOClient;
using QOVA::SSO::sso_op_failed;
using test::throws;

const char kNoToken[] = "please request a id_token first.";
const char kNoName[] = "cannot find the user name!";
const char kBadName[] = "cannot get the user name!";

class AzureUser : public testing::Test {
 protected:
  void store(const std::string& token) {
    Json::Value response;
    response["id_token"] = token;
    client.ProcessTokenResponse(response.toStyledString());
  }

  // A token with these claims; header and signature are not looked at here.
  void storeClaims(const std::string& claims) { store("!." + test::base64url(claims) + ".!"); }

  std::string userOf(const std::string& claims) {
    storeClaims(claims);
    std::string name = "before";
    EXPECT_NO_THROW(client.GetUserName(name)) << claims;
    return name;
  }

  void expectRefused(const std::string& claims, const std::string& message) {
    SCOPED_TRACE(claims);
    storeClaims(claims);
    EXPECT_TRUE(throws<std::invalid_argument>(message, [&] { client.GetUserName(user); }));
    EXPECT_EQ(user, "before");
  }

  void TearDown() override { EXPECT_TRUE(log.isEmpty()); }

  AzureSSOClient client;
  std::string user = "before";
  test::Log log;
};

TEST_F(AzureUser, IsTheUpperCasedDomainAndTheAccountAsItIs) {
  EXPECT_EQ(userOf(R"({"unique_name":"Alice.B@corp.Example.com"})"), "CORP.EXAMPLE.COM\\Alice.B");
  EXPECT_EQ(userOf(R"({"unique_name":"a b+c\\d@x"})"), "X\\a b+c\\d");
}

TEST_F(AzureUser, IsNamedByUniqueNameBeforeEmail) {
  EXPECT_EQ(userOf(R"({"email":"bob@mail.de", "unique_name":"alice@corp.de"})"), "CORP.DE\\alice");
}

TEST_F(AzureUser, IsNamedByEmailWithoutAUniqueNameThatIsText) {
  for (const char* unique_name :
       {"", R"("unique_name":5,)", R"("unique_name":null,)", R"("unique_name":["a@b"],)",
        R"("unique_name":{"a@b":1},)", R"("upn":"alice@corp.de",)"})
    EXPECT_EQ(userOf(std::string("{") + unique_name + R"("email":"bob@mail.de"})"), "MAIL.DE\\bob");
}

TEST_F(AzureUser, WithoutANameIsRefused) {
  for (const char* claims :
       {"{}", R"({"unique_name":5})", R"({"email":true})", R"({"unique_name":null, "email":null})",
        R"({"sub":"alice@corp.de", "preferred_username":"alice@corp.de", "Email":"a@b"})"})
    expectRefused(claims, kNoName);
}

TEST_F(AzureUser, WithoutAnObjectOfClaimsIsRefused) {
  for (const char* claims : {"null", "502", "true", "[]", R"(["email"])", R"("email")"})
    expectRefused(claims, kNoName);
}

TEST_F(AzureUser, NeedsExactlyOneAtSign) {
  for (const char* name : {"", "alice", "alice@@corp.de", "alice@corp@de", "@@", "@alice@", "a@b@"})
    expectRefused(std::string(R"({"unique_name":")") + name + "\"}", kBadName);
}

// The first choice is final.
TEST_F(AzureUser, IsNotNamedByEmailWhenUniqueNameIsUnusable) {
  for (const char* name : {"", "alice", "alice@@corp.de"})
    expectRefused(std::string(R"({"email":"bob@mail.de", "unique_name":")") + name + "\"}",
                  kBadName);
}

TEST_F(AzureUser, MayHaveAnEmptyAccountOrDomain) {
  EXPECT_EQ(userOf(R"({"unique_name":"alice@"})"), "\\alice");
  EXPECT_EQ(userOf(R"({"unique_name":"@corp.de"})"), "CORP.DE\\");
  EXPECT_EQ(userOf(R"({"unique_name":"@"})"), "\\");
}

TEST_F(AzureUser, KeepsBytesThatTheLocaleDoesNotKnow) {
  EXPECT_EQ(userOf("{\"unique_name\":\"j\xc3\xbcrgen@m\xc3\xbcnchen.de\"}"),
            "M\xc3\xbcNCHEN.DE\\j\xc3\xbcrgen");
}

TEST_F(AzureUser, ReachesThePlatformUpToAZeroByte) {
  EXPECT_EQ(userOf(R"({"unique_name":"ali\u0000ce@corp.de"})"), "CORP.DE\\ali");
}

// A locale in which the letter "c" becomes a number sign and nothing else has an upper case.
class NumberSign : public std::ctype<char> {
 protected:
  char do_toupper(char c) const override { return c == 'c' ? '#' : c; }
  const char* do_toupper(char* low, const char* high) const override {
    for (; low != high; ++low) *low = do_toupper(*low);
    return high;
  }
};

TEST_F(AzureUser, HasADomainInTheUpperCaseOfTheGlobalLocale) {
  const std::locale before = std::locale::global(std::locale(std::locale(), new NumberSign));
  EXPECT_EQ(userOf(R"({"unique_name":"alice@corp.com"})"), "#orp.#om\\alice");
  std::locale::global(before);
  EXPECT_EQ(userOf(R"({"unique_name":"alice@corp.com"})"), "CORP.COM\\alice");
}

TEST_F(AzureUser, OfUpTo1022BytesFitsThePlatform) {
  const std::string account(1022 - 2, 'a');
  EXPECT_EQ(userOf("{\"unique_name\":\"" + account + "@x\"}"), "X\\" + account);
}

TEST_F(AzureUser, ThatThePlatformRefusesIsLeftQualified) {
  const std::string account(1023 - 2, 'a');
  storeClaims("{\"unique_name\":\"" + account + "@x\"}");
  EXPECT_TRUE(throws<sso_op_failed>("QOVAWinsUserNameFqdn2Netbios failed.",
                                    [&] { client.GetUserName(user); }));
  EXPECT_EQ(user, "X\\" + account);
}

class AzureClaims : public AzureUser {
 protected:
  Json::Value info = "before";
};

TEST_F(AzureClaims, AreTheBodyOfTheToken) {
  storeClaims(R"({"sub":"s", "list":[1,2]})");
  client.GetUserInfo(info);
  EXPECT_EQ(info["sub"], "s");
  EXPECT_EQ(info["list"][1], 2);
  EXPECT_EQ(info.size(), 2u);
  storeClaims("[7]");
  client.GetUserInfo(info);
  EXPECT_EQ(info.size(), 1u) << "what was there is replaced";
  EXPECT_EQ(info[0], 7);
}

TEST_F(AzureClaims, NeedAToken) {
  EXPECT_TRUE(throws<std::invalid_argument>(kNoToken, [&] { client.GetUserInfo(info); }));
  EXPECT_TRUE(throws<std::invalid_argument>(kNoToken, [&] { client.GetUserName(user); }));
  store("");
  EXPECT_TRUE(throws<std::invalid_argument>(kNoToken, [&] { client.GetUserInfo(info); }));
  EXPECT_TRUE(throws<std::invalid_argument>(kNoToken, [&] { client.GetUserName(user); }));
  EXPECT_EQ(info, "before");
  EXPECT_EQ(user, "before");
}

TEST_F(AzureClaims, NeedATokenThatCanBeRead) {
  for (const char* token : {"a.b", "a", "a.b.c.d"}) {
    store(token);
    EXPECT_TRUE(
        throws<std::invalid_argument>("bad jwt format!", [&] { client.GetUserInfo(info); }));
    EXPECT_TRUE(
        throws<std::invalid_argument>("bad jwt format!", [&] { client.GetUserName(user); }));
  }
  for (const char* token : {"e30.!!!!.s", "e30.A.s", "e30.aGVsbG8.s"}) {
    store(token);
    EXPECT_TRUE(
        throws<std::invalid_argument>("bad jwt body format!", [&] { client.GetUserInfo(info); }));
    EXPECT_TRUE(
        throws<std::invalid_argument>("bad jwt body format!", [&] { client.GetUserName(user); }));
  }
  store("e30..s");
  EXPECT_TRUE(throws<std::logic_error>([&] { client.GetUserInfo(info); }));
  EXPECT_TRUE(throws<std::logic_error>([&] { client.GetUserName(user); }));
  EXPECT_EQ(info, "before");
  EXPECT_EQ(user, "before");
}

TEST_F(AzureClaims, StayInTheClient) {
  const std::string token = "!." + test::base64url(R"({"unique_name":"a@b"})") + ".!";
  store(token);
  client.GetUserInfo(info);
  client.GetUserName(user);
  EXPECT_EQ(client.GetToken(), token);
}

}  // namespace
