// Splitting a compact token and reading its header and body.
#include "sso/jwt.h"

#include <gtest/gtest.h>
#include <json/reader.h>

#include <string>

#include "support/faults.h"
#include "support/log.h"
#include "support/throws.h"
#include "support/tokens.h"

namespace {

using QOVA::JWT::Jwt;
using test::base64url;
using test::throws;

// GetHeader and GetBody are one operation on two segments: what holds for one is tried on both.
struct Part {
  const char* name;
  std::string (*token)(const std::string& segment);
  Json::Value (Jwt::*get)();
  const char* message;
};

const Part kParts[] = {
    {"Header", [](const std::string& segment) { return segment + ".Ym9keQ.sig"; }, &Jwt::GetHeader,
     "bad jwt header format!"},
    {"Body", [](const std::string& segment) { return "aGVhZGVy." + segment + ".sig"; },
     &Jwt::GetBody, "bad jwt body format!"},
};

void PrintTo(const Part& part, std::ostream* out) {
  *out << part.name;
}

class JwtPart : public testing::TestWithParam<Part> {
 protected:
  static Json::Value get(const std::string& segment) {
    Jwt jwt(GetParam().token(segment));
    return (jwt.*GetParam().get)();
  }

  static void expectRefused(const std::string& segment) {
    SCOPED_TRACE(testing::PrintToString(segment));
    EXPECT_TRUE(throws<std::invalid_argument>(GetParam().message, [&] { get(segment); }));
  }

  void TearDown() override { EXPECT_TRUE(log.isEmpty()); }

  test::Log log;
};

INSTANTIATE_TEST_SUITE_P(, JwtPart, testing::ValuesIn(kParts),
                         [](const auto& part) { return std::string(part.param.name); });

TEST(JwtSplit, TakesThreeSegmentsWhateverTheyHold) {
  for (const char* token : {"a.b.c", "a..c", "..", "a.b.", ".b.c", "!.\xff.\n"}) {
    SCOPED_TRACE(token);
    EXPECT_NO_THROW(Jwt{token});
  }
}

TEST(JwtSplit, RefusesAnyOtherNumberOfSegments) {
  for (const char* token : {"", ".", "a", "a.b", "a.b.c.d", "...", "a..b.c", "a.b.c."}) {
    SCOPED_TRACE(token);
    EXPECT_TRUE(throws<std::invalid_argument>("bad jwt format!", [&] { Jwt{token}; }));
  }
}

TEST(JwtSplit, CountsSegmentsBehindAZeroByteToo) {
  const std::string three("a.b\0x.c", 7);
  EXPECT_NO_THROW(Jwt{three});
  const std::string four("a.b.c\0.d", 8);
  EXPECT_TRUE(throws<std::invalid_argument>("bad jwt format!", [&] { Jwt{four}; }));
}

TEST(JwtSplit, LeavesTheSignatureSegmentAsItStands) {
  for (const char* signature : {"", "-_-_", "a+/=", "not base64!", "x y"}) {
    EXPECT_EQ(Jwt(std::string("a.b.") + signature).GetSignature(), signature);
  }
  const std::string zero("s\0t", 3);
  EXPECT_EQ(Jwt("a.b." + zero).GetSignature(), zero);
}

TEST(JwtSplit, GivesCopiesOfTheSignature) {
  Jwt jwt("a.b.c");
  std::string copy = jwt.GetSignature();
  copy += "changed";
  EXPECT_EQ(jwt.GetSignature(), "c");
}

// RFC 7515, appendix A.1.1.
TEST(JwtVector, OfTheStandardIsRead) {
  Jwt jwt(
      "eyJ0eXAiOiJKV1QiLA0KICJhbGciOiJIUzI1NiJ9."
      "eyJpc3MiOiJqb2UiLA0KICJleHAiOjEzMDA4MTkzODAsDQogImh0dHA6Ly9leGFt"
      "cGxlLmNvbS9pc19yb290Ijp0cnVlfQ.dBjftJeZ4CVP-mB92K27uhbUJU1p1r_wW1gFWFOEjXk");
  const Json::Value header = jwt.GetHeader();
  EXPECT_EQ(header["typ"], "JWT");
  EXPECT_EQ(header["alg"], "HS256");
  EXPECT_EQ(header.size(), 2u);
  const Json::Value body = jwt.GetBody();
  EXPECT_EQ(body["iss"], "joe");
  EXPECT_EQ(body["exp"], 1300819380);
  EXPECT_EQ(body["http://example.com/is_root"], true);
  EXPECT_EQ(body.size(), 3u);
  EXPECT_EQ(jwt.GetSignature(), "dBjftJeZ4CVP-mB92K27uhbUJU1p1r_wW1gFWFOEjXk");
}

TEST_P(JwtPart, IsReadTwiceAlike) {
  Jwt jwt(GetParam().token(base64url(R"({"a":1})")));
  const Json::Value first = (jwt.*GetParam().get)();
  EXPECT_EQ((jwt.*GetParam().get)(), first);
  EXPECT_EQ(first["a"], 1);
}

// Lengths 4k, 4k + 2 and 4k + 3, that is with no, two and one "=" to be appended.
TEST_P(JwtPart, IsReadAtEveryLength) {
  for (size_t length = 0; length <= 1200; ++length) {
    const std::string text(length, 'x');
    ASSERT_EQ(get(base64url("{\"a\":\"" + text + "\"}"))["a"], text) << length;
  }
}

TEST_P(JwtPart, OfOneCharacterMoreThanAFullGroupIsRefused) {
  for (const char* text : {"", "123", R"({"a":123})", R"({"a":"xy"}  )", R"({"a":"xy", "b":23})"}) {
    const std::string segment = base64url(text);
    ASSERT_EQ(segment.size() % 4, 0u) << text;
    for (const char* extra : {"A", "g", "0", "-", "_", "=", "!"}) expectRefused(segment + extra);
  }
}

TEST_P(JwtPart, InStandardBase64IsReadAsWell) {
  EXPECT_EQ(get("eyJhIjoxfQ")["a"], 1);
  EXPECT_EQ(get("eyJhIjoxfQ==")["a"], 1);
  EXPECT_EQ(get("eyJhIjoxMn0")["a"], 12);
  EXPECT_EQ(get("eyJhIjoxMn0=")["a"], 12);
  // "-" and "_", "+" and "/", and both kinds in one text.
  const std::string text = "\"\xc3\xbb\xc3\xbf\xc3\xbe\xc3\xbf\xc3\xbe~?~?>>??\"";
  std::string url = base64url(text);
  ASSERT_NE(url.find('-'), std::string::npos) << url;
  ASSERT_NE(url.find('_'), std::string::npos) << url;
  std::string standard = url;
  for (char& c : standard) c = c == '-' ? '+' : c == '_' ? '/' : c;
  std::string mixed = url;
  mixed[mixed.find('-')] = '+';
  const std::string content = text.substr(1, text.size() - 2);
  for (const std::string& segment : {url, standard, mixed})
    EXPECT_EQ(get(segment).asString(), content) << segment;
}

// Every pair of characters stands for one byte; what that is as JSON, the reader says.
TEST_P(JwtPart, OfTwoCharactersIsTheByteTheyStandFor) {
  const std::string alphabet = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_";
  int read = 0;
  for (size_t first = 0; first < 64; ++first) {
    for (size_t second = 0; second < 64; ++second) {
      const std::string segment = {alphabet[first], alphabet[second]};
      const std::string byte(1, static_cast<char>(first << 2 | second >> 4));
      Json::Value expected;
      // What follows a zero byte is not part of the text.
      if (!Json::Reader().parse(byte.c_str(), expected)) {
        ASSERT_THROW(get(segment), std::invalid_argument) << segment;
        continue;
      }
      ASSERT_EQ(get(segment), expected) << segment;
      ++read;
    }
  }
  EXPECT_GE(read, 10 * 16) << "each digit has 16 forms";
}

TEST_P(JwtPart, NeedNotBeAnObject) {
  EXPECT_EQ(get(base64url("null")), Json::Value());
  EXPECT_EQ(get(base64url("[]")), Json::Value(Json::arrayValue));
  EXPECT_EQ(get(base64url("[1,2]"))[1], 2);
  EXPECT_EQ(get(base64url("502")), 502);
  EXPECT_EQ(get(base64url("\"text\"")), "text");
  EXPECT_EQ(get(base64url("true")), true);
}

TEST_P(JwtPart, ThatIsNotJsonIsRefused) {
  for (const char* text : {"{", "{\"a\":", "nul", "hello", "<html>", "\xff\xfe", "[1,", "\"open"})
    expectRefused(base64url(text));
}

TEST_P(JwtPart, ThatIsNotBase64IsRefused) {
  for (const char* segment :
       {"!!!!", "!", "====", "=", "\xff\xff\xff\xff", "\n\n\n\n", "\n", "    "})
    expectRefused(segment);
}

// Not one of the two messages: an absent text is not the same as a bad one.
TEST_P(JwtPart, ThatIsEmptyIsALogicError) {
  for (const std::string& segment : {std::string(), std::string("\0eyJhIjoxfQ", 11)}) {
    EXPECT_TRUE(throws<std::logic_error>([&] { get(segment); }));
  }
}

TEST_P(JwtPart, EndsAtAZeroByteOfTheSegment) {
  EXPECT_EQ(get(std::string("eyJhIjoxfQ\0!!!!", 15))["a"], 1);
}

TEST_P(JwtPart, EndsAtAZeroByteOfTheDecodedText) {
  EXPECT_EQ(get(base64url(std::string("{\"a\":1}\0}}}}", 12)))["a"], 1);
  expectRefused(base64url(std::string("{\"a\":\0 1}", 9)));
}

TEST_P(JwtPart, KeepsComments) {
  const Json::Value value = get(base64url("/* why */ {\"a\":1}"));
  EXPECT_EQ(value["a"], 1);
  EXPECT_EQ(value.getComment(Json::commentBefore), "/* why */");
}

TEST_P(JwtPart, NestedTooDeeplyIsRefused) {
  EXPECT_TRUE(get(base64url(std::string(1000, '[') + std::string(1000, ']'))).isArray());
  expectRefused(base64url(std::string(1001, '[') + std::string(1001, ']')));
  expectRefused(base64url(std::string(100000, '[')));
}

TEST_P(JwtPart, WithoutADecoderIsALogicError) {
  for (const char* function : {"BIO_new", "BIO_new_mem_buf", "BIO_pending"}) {
    test::Fault fault(function);
    EXPECT_TRUE(throws<std::logic_error>([&] { get("eyJhIjoxfQ"); })) << function;
    EXPECT_TRUE(fault.wasHit()) << function;
  }
}

TEST_P(JwtPart, ThatTheDecoderCannotReadIsRefused) {
  test::Fault fault("BIO_read");
  expectRefused("eyJhIjoxfQ");
  EXPECT_TRUE(fault.wasHit());
}

TEST_P(JwtPart, OfAMegabyteIsRead) {
  const std::string text(1 << 20, 'x');
  EXPECT_EQ(get(base64url("\"" + text + "\"")), text);
}

}  // namespace
