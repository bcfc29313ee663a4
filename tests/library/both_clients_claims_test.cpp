// What both clients check in an ID token before its signature: its form, expiry and audience.
#include <gtest/gtest.h>
#include <json/value.h>

#include <ctime>
#include <string>
#include <vector>

#include "support/both_clients.h"
#include "support/clock.h"
#include "support/log.h"
#include "support/throws.h"
#include "support/tokens.h"

namespace {

using test::signingInput;
using test::throws;

const char kExpired[] = "id_token expired.";
const char kWrongAudience[] = "client ID invalid";

// The first check behind that of the expiry.
template <typename Provider>
std::string checkBehindExpiry() {
  return Provider::name() == "azure" ? "tenant ID invalid" : kWrongAudience;
}

// Every token here is refused before anything is fetched: a fetch would leave a line in the log.
template <typename Provider>
class IdTokenClaims : public testing::Test {
 protected:
  void SetUp() override {
    Json::Value settings;
    settings["client_id"] = "the device";
    settings["tenant_id"] = "the tenant";
    test::configure<Provider>(settings);
  }

  void TearDown() override { EXPECT_TRUE(log.isEmpty()); }

  static void verifyToken(const std::string& token) {
    typename Provider::Client client;
    Json::Value response;
    response["id_token"] = token;
    client.ProcessTokenResponse(response.toStyledString());
    EXPECT_EQ(client.GetToken(), token);
    client.VerifyIDToken();
  }

  static void VerifyClaims(const std::string& body, const std::string& header = "{}") {
    verifyToken(signingInput(header, body) + ".c2ln");
  }

  // The message for a body with this "exp" and nothing else that is right.
  static std::string messageForExpiry(const std::string& exp) {
    try {
      VerifyClaims("{\"exp\":" + exp + "}");
    } catch (const std::invalid_argument& e) {
      return e.what();
    }
    return "accepted";
  }

  test::Log log;
};
TYPED_TEST_SUITE(IdTokenClaims, test::Clients, test::ClientName);

TYPED_TEST(IdTokenClaims, NeedAToken) {
  EXPECT_TRUE(throws<std::invalid_argument>("token cannot be empty", [] {
    typename TypeParam::Client client;
    client.VerifyIDToken();
  }));
  EXPECT_TRUE(
      throws<std::invalid_argument>("token cannot be empty", [&] { this->verifyToken(""); }));
}

TYPED_TEST(IdTokenClaims, NeedThreeSegments) {
  for (const char* token : {"a", "a.b", "a.b.c.d", "."})
    EXPECT_TRUE(
        throws<std::invalid_argument>("bad jwt format!", [&] { this->verifyToken(token); }));
}

TYPED_TEST(IdTokenClaims, NeedAHeaderThenABodyThatCanBeRead) {
  const std::string json = test::base64url("{}");
  for (const char* bad : {"!!!!", "A", "aGVsbG8"}) {
    EXPECT_TRUE(throws<std::invalid_argument>(
        "bad jwt header format!", [&] { this->verifyToken(std::string(bad) + "." + bad + ".s"); }));
    EXPECT_TRUE(throws<std::invalid_argument>("bad jwt body format!",
                                              [&] { this->verifyToken(json + "." + bad + ".s"); }));
  }
}

TYPED_TEST(IdTokenClaims, InAnEmptySegmentAreALogicError) {
  EXPECT_TRUE(throws<std::logic_error>([&] { this->verifyToken(".!!!!."); }));
  EXPECT_TRUE(throws<std::logic_error>([&] { this->verifyToken("e30.."); }));
  EXPECT_TRUE(throws<std::logic_error>([&] { this->verifyToken(".."); }));
}

TYPED_TEST(IdTokenClaims, AreMissingInABodyThatIsNotAnObject) {
  for (const char* body : {"null", "502", "true", "[]", "[\"exp\"]", "\"exp\"", "{}"}) {
    EXPECT_TRUE(throws<std::invalid_argument>(kExpired, [&] { this->VerifyClaims(body); })) << body;
    EXPECT_TRUE(throws<std::invalid_argument>(kExpired, [&] { this->VerifyClaims(body, "[7]"); }));
  }
}

TYPED_TEST(IdTokenClaims, AreAcceptedUntilTheSecondOfTheirExpiryIsOver) {
  const std::string behind = checkBehindExpiry<TypeParam>();
  for (const std::time_t expiry :
       {std::time_t{1}, std::time_t{1300819380}, std::time_t{4102444800}}) {
    for (const std::string& exp : {std::to_string(expiry), "\"" + std::to_string(expiry) + "\"",
                                   std::to_string(expiry) + ".9"}) {
      for (const auto& [now, message] : std::vector<std::pair<std::time_t, std::string>>{
               {expiry - 1, behind}, {expiry, behind}, {expiry + 1, kExpired}}) {
        const test::Clock clock(now);
        EXPECT_EQ(this->messageForExpiry(exp), message) << exp << " at " << now;
      }
    }
  }
}

// Each form is read as a text by a stream, which takes the number that it begins with.
TYPED_TEST(IdTokenClaims, HaveAnExpiryInAnyFormThatBeginsWithANumber) {
  const std::string behind = checkBehindExpiry<TypeParam>();
  const std::vector<std::pair<std::string, std::string>> cases = {
      {"4102444800", behind},
      {"\"4102444800\"", behind},
      {"\" \\t\\n4102444800\"", behind},
      {"\"+4102444800\"", behind},
      {"\"4102444800 and more\"", behind},
      {"4102444800.5", behind},
      {"1e10", behind},
      // Beyond 64 bits: the largest number there is, or the smallest.
      {"9223372036854775807", behind},
      {"9223372036854775808", behind},
      {"18446744073709551615", behind},
      {"\"99999999999999999999999999\"", behind},
      {"\"-99999999999999999999999999\"", kExpired},
      // What is written with an exponent is read up to its point.
      {"18446744073709551616", kExpired},
      {"1e300", kExpired},
      {"\"1e11\"", kExpired},
      {"\"0x7fffffff\"", kExpired},
      {"\"4,102,444,800\"", kExpired},
      {"0", kExpired},
      {"-1", kExpired},
      {"-4102444800", kExpired},
      {"-1e10", kExpired},
      {"null", kExpired},
      {"true", kExpired},
      {"\"\"", kExpired},
      {"\"never\"", kExpired},
      {"\"e4102444800\"", kExpired}};
  for (const auto& [exp, message] : cases) EXPECT_EQ(this->messageForExpiry(exp), message) << exp;
}

TYPED_TEST(IdTokenClaims, WithoutANumberExpireWithTheFirstSecond) {
  const std::string behind = checkBehindExpiry<TypeParam>();
  for (const char* exp : {"0", "\"never\"", "\"\"", "null", "false"}) {
    {
      const test::Clock clock(0);
      EXPECT_EQ(this->messageForExpiry(exp), behind) << exp;
      EXPECT_EQ(this->messageForExpiry("-1"), kExpired);
    }
    const test::Clock clock(1);
    EXPECT_EQ(this->messageForExpiry(exp), kExpired) << exp;
  }
}

TYPED_TEST(IdTokenClaims, ThatAreNoTextLetTheErrorOfTheJsonLibraryPass) {
  for (const char* value : {"[]", "{}", "[\"the device\"]", "{\"a\":1}"}) {
    for (const char* name : {"aud", "exp"}) {
      SCOPED_TRACE(std::string(name) + " " + value);
      const std::string body = std::string("{\"") + name + "\":" + value + "}";
      EXPECT_TRUE(throws<Json::LogicError>([&] { this->VerifyClaims(body); }));
    }
    EXPECT_TRUE(throws<Json::LogicError>(
        [&] { this->VerifyClaims("{}", std::string("{\"alg\":") + value + "}"); }));
  }
}

TYPED_TEST(IdTokenClaims, NameTheClientByteForByte) {
  for (const char* audience : {"", "the devic", "the device ", " the device", "The device",
                               "THE DEVICE", "the device\n", "the tenant", "th\xc3\xa9 device"}) {
    Json::Value body;
    body["exp"] = Json::Int64{4102444800};
    body["tid"] = "the tenant";
    body["aud"] = audience;
    EXPECT_TRUE(throws<std::invalid_argument>(kWrongAudience, [&] {
      this->VerifyClaims(body.toStyledString());
    })) << audience;
  }
  const std::string zero = R"({"exp":4102444800, "tid":"the tenant", "aud":"the device\u0000"})";
  EXPECT_TRUE(throws<std::invalid_argument>(kWrongAudience, [&] { this->VerifyClaims(zero); }));
  const std::string none = R"({"exp":4102444800, "tid":"the tenant"})";
  EXPECT_TRUE(throws<std::invalid_argument>(kWrongAudience, [&] { this->VerifyClaims(none); }));
}

}  // namespace
