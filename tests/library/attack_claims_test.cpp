// What an attacker, or a provider gone wrong, writes into the claims: duplicates, zero bytes,
// times at the edges, nesting, size, bad UTF-8, and other spellings of a segment. Every token here
// carries a right signature unless said otherwise: the claims alone decide.
#include <gtest/gtest.h>

#include <cstdint>
#include <ctime>
#include <limits>
#include <string>
#include <vector>

#include "support/clock.h"
#include "support/processor_time.h"
#include "support/token_check.h"

namespace {

const char kExpired[] = "id_token expired.";
const char kWrongClient[] = "client ID invalid";
const char kBadHeader[] = "bad jwt header format!";
const char kBadBody[] = "bad jwt body format!";

template <typename Provider>
class AttackClaims : public test::TokenCheck<Provider> {
 protected:
  static std::string withBody(const std::string& body) {
    return AttackClaims::token(AttackClaims::goodHeader(), body);
  }
  static testing::AssertionResult invalid(const std::string& message, const std::string& token) {
    return AttackClaims::template refuses<std::invalid_argument>(message, token);
  }
  // A body that is right but for its end.
  static std::string open() {
    const std::string body = test::kCheckBody;
    return body.substr(0, body.size() - 1);
  }
  static std::string nameOf(const std::string& token) {
    typename Provider::Client client;
    AttackClaims::take(client, token);
    std::string user;
    client.GetUserName(user);
    return user;
  }
};
TYPED_TEST_SUITE(AttackClaims, test::Clients, test::ClientName);

TYPED_TEST(AttackClaims, CountTheLastOfTwoMembersOfOneName) {
  const std::string start = this->open();
  EXPECT_TRUE(this->invalid(kExpired, this->withBody(start + ",\"exp\":1}")));
  EXPECT_TRUE(this->invalid(kExpired, this->withBody(start + ",\"exp\":null}")));
  EXPECT_TRUE(this->invalid(kWrongClient, this->withBody(start + ",\"aud\":\"another\"}")));
  EXPECT_TRUE(this->invalid(kWrongClient, this->withBody(start + ",\"\\u0061ud\":\"another\"}")));
  const std::string behind = start.substr(1) + "}";
  EXPECT_TRUE(this->accepts(this->withBody("{\"exp\":1,\"aud\":\"another\"," + behind)));
  EXPECT_TRUE(this->accepts(this->withBody("{\"EXP\":1,\"Aud\":\"another\",\"aud \":5," + behind)));
  // The name is read from the same reading of the same text.
  const std::string token =
      this->withBody(start + R"(,"sub":"Bob","unique_name":"Bob@corp.example.com"})");
  EXPECT_TRUE(this->accepts(token));
  EXPECT_NE(this->nameOf(token).find("Bob"), std::string::npos);
  EXPECT_EQ(this->nameOf(token).find("Alice"), std::string::npos);
}

TYPED_TEST(AttackClaims, DoNotEndAtAZeroByteWhenTheyAreCompared) {
  const std::string exp = R"({"exp":4102444800,"tid":"the tenant","aud":)";
  for (const char* aud : {"\"the device\\u0000\"", "\"the device\\u0000x\"",
                          "\"\\u0000the device\"", "\"the\\u0000device\"", "\"\\u0000\""})
    EXPECT_TRUE(this->invalid(kWrongClient, this->withBody(exp + aud + "}"))) << aud;
  // Nor does the configured client: it is another one than its beginning.
  this->settings["client_id"] = std::string("the device\0x", 12);
  test::configure<TypeParam>(this->settings);
  EXPECT_TRUE(this->invalid(kWrongClient, this->withBody(exp + "\"the device\"}")));
  EXPECT_TRUE(this->invalid(kWrongClient, this->withBody(exp + "\"the device\\u0000y\"}")));
  EXPECT_TRUE(this->accepts(this->withBody(exp + "\"the device\\u0000x\"}")));
}

// A decoded segment is a zero-terminated text: what is behind a zero byte is not read, and what
// comes before it has to be whole.
TYPED_TEST(AttackClaims, EndAtAZeroByteOfTheSegment) {
  const std::string zero(1, '\0');
  const std::string good = test::kCheckBody;
  EXPECT_TRUE(this->accepts(this->withBody(good + zero)));
  EXPECT_TRUE(this->accepts(this->withBody(good + zero + R"(,"exp":1})")));
  EXPECT_TRUE(this->invalid(kBadBody, this->withBody(zero + good)));
  for (size_t at = 1; at < good.size(); at += 3) {
    std::string cut = good;
    cut[at] = '\0';
    EXPECT_TRUE(this->invalid(kBadBody, this->withBody(cut))) << at;
    const std::string added = good.substr(0, at) + zero + good.substr(at);
    EXPECT_TRUE(this->invalid(kBadBody, this->withBody(added))) << at;
  }
  const std::string header = this->goodHeader();
  EXPECT_TRUE(this->accepts(this->token(header + zero + R"({"alg":"none"})")));
  for (size_t at = 0; at < header.size(); at += 3) {
    const std::string added = header.substr(0, at) + zero + header.substr(at);
    EXPECT_TRUE(this->invalid(kBadHeader, this->token(added))) << at;
  }
  const std::string hidden = this->header("none") + zero + header;
  EXPECT_TRUE(this->template refuses<QOVA::JWT::jwt_not_support>("none algorithm is not supported",
                                                                 this->token(hidden)));
}

// Segments are C strings too: the text behind a zero byte in the token is not part of them.
TYPED_TEST(AttackClaims, EndAtAZeroByteOfTheToken) {
  const std::string zero(1, '\0');
  const std::string good = this->withBody(test::kCheckBody);
  const size_t dot = good.rfind('.');
  const size_t first = good.find('.');
  EXPECT_TRUE(this->accepts(good + zero + "behind"));
  EXPECT_TRUE(this->doubts(good.substr(0, dot + 1) + zero + good.substr(dot + 1)));
  EXPECT_TRUE(this->doubts(good.substr(0, dot + 9) + zero + good.substr(dot + 9)));
  // Behind the body it ends nothing that is signed; behind the header, the signed text.
  EXPECT_TRUE(this->accepts(good.substr(0, dot) + zero + "behind" + good.substr(dot)));
  EXPECT_TRUE(this->doubts(good.substr(0, first) + zero + good.substr(first)));
  EXPECT_TRUE(this->invalid("bad jwt format!", good + zero + ".behind"));
  EXPECT_TRUE(this->template refuses<std::logic_error>(
      "basic_string: construction from null is not valid", zero + good));
}

// Whether the clock can show it: on some devices it ends in 2038.
bool isTime(std::int64_t seconds) {
  return static_cast<std::time_t>(seconds) == seconds;
}

// At the second `now`: a token is good until the second of its expiry is over.
TYPED_TEST(AttackClaims, ExpireAtTheirSecondHoweverFarItIs) {
  const std::vector<std::int64_t> edges = {1,
                                           1300819380,
                                           2147483646,
                                           2147483647,
                                           2147483648,
                                           2147483649,
                                           4294967295,
                                           4294967296,
                                           9007199254740993,
                                           4611686018427387904,
                                           9223372036854775806,
                                           9223372036854775807};
  const auto body = [](const std::string& exp) {
    return R"({"tid":"the tenant","aud":"the device","exp":)" + exp + "}";
  };
  for (const std::int64_t exp : edges) {
    const std::string text = std::to_string(exp);
    for (const std::string& spelt : {text, "\"" + text + "\"", "\"" + text + ".5\"",
                                     "\" +" + text + "\"", "\"0000" + text + "\""}) {
      const std::string token = this->withBody(body(spelt));
      for (const std::int64_t now : {exp - 1, exp}) {
        if (!isTime(now)) continue;
        const test::Clock clock(static_cast<std::time_t>(now));
        EXPECT_TRUE(this->accepts(token)) << spelt << " at " << now;
      }
      if (exp == std::numeric_limits<std::int64_t>::max() || !isTime(exp + 1)) continue;
      const test::Clock clock(static_cast<std::time_t>(exp + 1));
      EXPECT_TRUE(this->invalid(kExpired, token)) << spelt;
    }
  }
}

TYPED_TEST(AttackClaims, AreExpiredWithATimeThatIsNone) {
  const test::Clock clock(1700000000);
  const auto token = [&](const std::string& exp) {
    return this->withBody(R"({"tid":"the tenant","aud":"the device","exp":)" + exp + "}");
  };
  for (const char* exp : {"1699999999",
                          "1699999999.999",
                          "0",
                          "-1",
                          "-0",
                          "-1700000001",
                          "-2147483649",
                          "-9223372036854775808",
                          "-9223372036854775809",
                          "-1e300",
                          "1e300",
                          "1.7e300",
                          "true",
                          "false",
                          "null",
                          "\"\"",
                          "\" \"",
                          "\"-1700000001\"",
                          "\"never\"",
                          "\"NaN\"",
                          "\"inf\"",
                          "\"Infinity\"",
                          "\"0x7fffffffffffffff\"",
                          "\"\\u0000\"",
                          "\"\\u00004102444800\"",
                          "\"\\u0664\\u0661\"",
                          "\"--1\"",
                          "\"+-4102444800\"",
                          "\"1e99\"",
                          "\"1 700 000 001\"",
                          "\"2038-01-19T03:14:07Z\"",
                          "\"-99999999999999999999\""})
    EXPECT_TRUE(this->invalid(kExpired, token(exp))) << exp;
  for (const char* exp :
       {"1700000000", "1700000000.0", "1700000000.9", "1.7e9", "17e8", "\"1700000000\"",
        "\"1700000000\\u0000\"", "\"1700000000,1\"", "\"\\t1700000000\"", "9223372036854775807",
        "9223372036854775808", "18446744073709551615", "\"99999999999999999999\""})
    EXPECT_TRUE(this->accepts(token(exp))) << exp;
  for (const char* exp : {"[]", "[4102444800]", "{}", "{\"exp\":4102444800}"})
    EXPECT_TRUE(
        this->template refuses<Json::LogicError>("Type is not convertible to string", token(exp)))
        << exp;
  // Not JSON at all.
  for (const char* exp : {"Infinity", "NaN", "0x10", "'1'", "+1", "1,7", "\"1", "\"\n\"1"})
    EXPECT_TRUE(this->invalid(kBadBody, token(exp))) << exp;
}

// jsoncpp reads a thousand levels, the document and the innermost value among them; what is deeper
// is not JSON here.
TYPED_TEST(AttackClaims, AreNestedAThousandDeepAndNoDeeper) {
  const auto nested = [](size_t depth, char left, char right) {
    const std::string in = left == '[' ? "[" : "{\"a\":";
    std::string text;
    for (size_t i = 0; i < depth; ++i) text += in;
    return text + (left == '[' ? "" : "1") + std::string(depth, right);
  };
  for (const auto& [left, right] : {std::pair<char, char>{'[', ']'}, {'{', '}'}}) {
    const auto body = [&, l = left, r = right](size_t depth) {
      return this->withBody(this->open() + ",\"x\":" + nested(depth, l, r) + "}");
    };
    const auto header = [&, l = left, r = right](size_t depth) {
      return this->token("{\"x\":" + nested(depth, l, r) + "," + this->goodHeader().substr(1));
    };
    const size_t most = left == '[' ? 999 : 998;  // an empty list holds no further value
    for (const size_t depth : {size_t{1}, size_t{100}, most}) {
      EXPECT_TRUE(this->accepts(body(depth))) << left << depth;
      EXPECT_TRUE(this->accepts(header(depth))) << left << depth;
    }
    for (const size_t depth : {most + 1, most + 2, size_t{2000}, size_t{20000}}) {
      EXPECT_TRUE(this->invalid(kBadBody, body(depth))) << left << depth;
      EXPECT_TRUE(this->invalid(kBadHeader, header(depth))) << left << depth;
    }
    EXPECT_TRUE(this->invalid(kBadBody, this->withBody(std::string(1 << 18, left))));
  }
  // A list for a document is one level less, and holds no claims.
  EXPECT_TRUE(this->invalid(kExpired, this->withBody(nested(1000, '[', ']'))));
  EXPECT_TRUE(this->invalid(kBadBody, this->withBody(nested(1001, '[', ']'))));
}

// Nothing here may take more than a moment: no step grows faster than the text.
TYPED_TEST(AttackClaims, MayBeHuge) {
  const auto taken = [](const std::string& token) {
    EXPECT_TRUE(test::takesAMoment([&] { EXPECT_TRUE(TestFixture::accepts(token)); }));
  };
  const std::string big(1 << 20, 'x');
  taken(this->withBody(this->open() + ",\"x\":\"" + big + "\"}"));
  taken(this->withBody(this->open() + ",\"" + big + "\":1}"));
  std::string members;
  for (int i = 0; i < 20000; ++i) members += ",\"" + std::to_string(i) + "\":" + std::to_string(i);
  taken(this->withBody(this->open() + members + "}"));
  std::string items = "0";
  for (int i = 0; i < 50000; ++i) items += ",0";
  taken(this->withBody(this->open() + ",\"x\":[" + items + "]}"));
  taken(this->withBody(this->open() + std::string(1 << 20, ' ') + "}"));
  taken(this->withBody("/*" + big + "*/" + test::kCheckBody));
}

TYPED_TEST(AttackClaims, MayBeHugeAndBeRefusedAsSoon) {
  const std::string big(1 << 20, 'x');
  const auto soon = [](const auto& refusal) { EXPECT_TRUE(test::takesAMoment(refusal)); };
  const std::string named = this->token(this->header(big));
  soon([&] {
    EXPECT_TRUE(this->template refuses<QOVA::JWT::jwt_not_support>(
        big + " algorithm is not supported", named));
  });
  const std::string late = this->withBody("{\"exp\":" + std::string(300, '1') + "}");
  soon([&] { EXPECT_TRUE(this->invalid(kExpired, late)); });
  const std::string other = this->withBody(this->open() + ",\"aud\":\"" + big + "\"}");
  soon([&] { EXPECT_TRUE(this->invalid(kWrongClient, other)); });
  const std::string behind = this->withBody(test::kCheckBody) + big;
  soon([&] { EXPECT_TRUE(this->doubts(behind)); });
  const std::string dots(1 << 20, '.');
  soon([&] { EXPECT_TRUE(this->invalid("bad jwt format!", dots)); });
}

// RFC 3629: none of these bytes is text. They are no reason to refuse, nor do they make two
// different names equal.
TYPED_TEST(AttackClaims, MayHoldBytesThatAreNoUtf8) {
  for (const char* bytes : {"\xff", "\xfe\xff", "\x80", "\xc0\xaf", "\xc3", "\xe2\x82",
                            "\xed\xa0\x80", "\xf4\x90\x80\x80", "\xf8\x88\x80\x80\x80"}) {
    const std::string text = bytes;
    EXPECT_TRUE(this->accepts(this->withBody(this->open() + ",\"x\":\"" + text + "\"}")));
    EXPECT_TRUE(this->accepts(this->withBody(this->open() + ",\"" + text + "\":1}")));
    for (const std::string& aud : {"the device" + text, text + "the device"})
      EXPECT_TRUE(
          this->invalid(kWrongClient, this->withBody(this->open() + ",\"aud\":\"" + aud + "\"}")));
    const std::string token = this->withBody(this->open() + ",\"sub\":\"" + text +
                                             "\",\"unique_name\":\"" + text + "@corp\"}");
    const bool azure = TypeParam::name() == "azure";
    EXPECT_EQ(this->nameOf(token), azure ? "CORP\\" + text : text);
  }
}

// Half of a pair of surrogates stands for no character; the reader refuses it.
TYPED_TEST(AttackClaims, HoldNoHalfOfASurrogatePair) {
  const auto with = [&](const std::string& escape) {
    return this->withBody(this->open() + ",\"x\":\"" + escape + "\"}");
  };
  for (const char* half : {"\\ud800", "\\udbff", "\\ud800x", "\\ud800\\n", "\\ud83d\\", "\\ud8",
                           "\\uzzzz", "\\u", "\\x41", "\\"})
    EXPECT_TRUE(this->invalid(kBadBody, with(half))) << half;
  EXPECT_TRUE(this->accepts(with("\\ud83d\\ude00")));
  EXPECT_TRUE(this->accepts(with("\\u0000\\u001f\\uffff")));
}

// The signature covers the text of the segments, not what they decode to.
TYPED_TEST(AttackClaims, AreSignedInTheirOneSpelling) {
  const std::string good =
      this->token(this->goodHeader() + " ", std::string(test::kCheckBody) + " ");
  const size_t first = good.find('.');
  const size_t second = good.rfind('.');
  const std::string header = good.substr(0, first);
  const std::string body = good.substr(first + 1, second - first - 1);
  const std::string signature = good.substr(second + 1);
  ASSERT_TRUE(this->accepts(good));
  for (const std::string& segment : {header, body}) {
    ASSERT_NE(segment.size() % 4, 0u) << "there are unused bits";
    std::string bits = segment;
    bits.back() = static_cast<char>(bits.back() + 1);
    ASSERT_EQ(test::fromBase64(bits), test::fromBase64(segment));
    // What decodes alike is read, and was not signed; the others do not decode.
    const auto forged = [&](const std::string& other) {
      return (segment == header ? other + "." + body : header + "." + other) + "." + signature;
    };
    for (const std::string& other : {bits, segment + "="})
      EXPECT_TRUE(this->doubts(forged(other))) << other;
    for (const std::string& other : {segment + "==", segment + "\n"})
      EXPECT_TRUE(this->invalid(segment == header ? kBadHeader : kBadBody, forged(other))) << other;
  }
  const std::string swapped = body + "." + header + "." + signature;
  EXPECT_TRUE(this->invalid(kExpired, swapped));
  for (const std::string& other :
       {" " + good, good.substr(0, first) + " " + good.substr(first), "\n" + good})
    EXPECT_TRUE(this->invalid(kBadHeader, other)) << testing::PrintToString(other);
}

// A text of 4k + 1 characters stands for nothing, and neither do characters outside the alphabet.
TYPED_TEST(AttackClaims, AreNotReadFromWhatIsNoBase64) {
  const std::string body = test::base64url(test::kCheckBody);
  const std::string header = test::base64url(this->goodHeader());
  for (const char* odd :
       {"A", "AAAAA", "e30AA", "!", "%65%33%30", "e3 0", "====", "=e30", "\xff\xff"}) {
    const std::string text = odd;
    EXPECT_TRUE(this->invalid(kBadHeader, text + "." + body + ".c2ln")) << text;
    EXPECT_TRUE(this->invalid(kBadBody, header + "." + text + ".c2ln")) << text;
  }
}

}  // namespace
