// What an attacker writes into a token's header: algorithms, key identifiers, keys of his own.
#include <gtest/gtest.h>
#include <openssl/evp.h>

#include <string>
#include <vector>

#include "sso/jwt.h"
#include "support/provider.h"
#include "support/token_check.h"

namespace {

using QOVA::JWT::jwt_not_support;
using test::anyRsaKey;
using test::base64url;

template <typename Provider>
class AttackHeader : public test::TokenCheck<Provider> {};
TYPED_TEST_SUITE(AttackHeader, test::Clients, test::ClientName);

using AttackAzureHeader = test::TokenCheck<test::Azure>;
using AttackWebSphereHeader = test::TokenCheck<test::WebSphere>;

std::string quoted(const std::string& text) {
  return Json::Value(text).toStyledString();
}

// The names of RFC 7518, section 3.1, and of its successors, but for the two families in use; and
// the other names of these, from its appendix A.1.
const std::vector<std::string> kOtherNames = {"ES256",
                                              "ES384",
                                              "ES512",
                                              "PS256",
                                              "PS384",
                                              "PS512",
                                              "none",
                                              "EdDSA",
                                              "ES256K",
                                              "dir",
                                              "A256KW",
                                              "RSA1_5",
                                              "RSA-OAEP",
                                              "A128GCM",
                                              "http://www.w3.org/2001/04/xmldsig-more#hmac-sha256",
                                              "HmacSHA256",
                                              "1.2.840.113549.2.9",
                                              "http://www.w3.org/2001/04/xmldsig-more#rsa-sha256",
                                              "SHA256withRSA",
                                              "1.2.840.113549.1.1.11"};

TYPED_TEST(AttackHeader, NamesNoAlgorithmButTheClientsOwnThree) {
  std::vector<std::string> names = kOtherNames;
  const std::string own = TestFixture::Sign::family();
  for (const char* digest : {"256", "384", "512"})
    names.push_back(TestFixture::Sign::foreign() + std::string(digest));
  for (const char* digest : {"", "1", "224", "25", "0256", "2560", "-256", "256.0", "256/512"})
    names.push_back(own + digest);
  for (const std::string& name : names) {
    EXPECT_TRUE(this->template refuses<jwt_not_support>(name + " algorithm is not supported",
                                                        this->token(this->header(name))))
        << name;
  }
}

// Each of them would become the right name if it were trimmed, folded, cut or normalised.
TYPED_TEST(AttackHeader, DisguisesNoAlgorithm) {
  const std::string own = TestFixture::Sign::family();
  const std::string good = own + "256";
  std::vector<std::string> names = {"None", "NONE", "nOnE", " none", "none ", ""};
  for (const char* pad :
       {" ", "\t", "\n", "\r\n", ",", ";", "=", ".", "\xc2\xa0", "\xe2\x80\x8b"}) {
    names.push_back(good + pad);
    names.push_back(pad + good);
  }
  for (const std::string& text : {std::string("\0", 1), std::string("\0none", 5)})
    names.insert(names.end(), {good + text, text + good, own + text + "256"});
  names.push_back(own.substr(0, 1) + "s256");
  names.push_back(static_cast<char>(own[0] + 32) + own.substr(1) + "256");
  names.push_back(good + "," + good);
  names.push_back(good + "/none");
  names.push_back("\xef\xbc\xa8\xef\xbc\xb3" + std::string("256"));  // full width
  names.push_back("\xd0\xbd" + good.substr(1));                      // a letter of another script
  for (const std::string& name : names) {
    const std::string header = "{\"alg\":" + quoted(name) + ",\"kid\":\"the key\"}";
    EXPECT_TRUE(this->template refuses<jwt_not_support>(name + " algorithm is not supported",
                                                        this->token(header)))
        << testing::PrintToString(name);
  }
}

// Escapes belong to JSON, not to the name.
TYPED_TEST(AttackHeader, MaySpellTheAlgorithmInEscapes) {
  const char second = TestFixture::Sign::family()[0] == 'R' ? 'R' : 'H';
  const std::string header = std::string(R"({"\u0061lg":"\u00)") + (second == 'R' ? "52" : "48") +
                             R"(S\u0032\u0035\u0036","k\u0069d":"the\u0020key"})";
  EXPECT_TRUE(this->accepts(this->token(header)));
}

// Of two members of one name the reader keeps the last; there is no second reading of the header
// for which the first would count.
TYPED_TEST(AttackHeader, CountsTheLastOfTwoMembersOfOneName) {
  const std::string good = TestFixture::Sign::family() + std::string("256");
  const auto both = [](const std::string& one, const std::string& two) {
    return R"({"alg":")" + one + R"(","kid":"the key","alg":")" + two + R"("})";
  };
  EXPECT_TRUE(this->accepts(this->token(both("none", good))));
  EXPECT_TRUE(this->template refuses<jwt_not_support>("none algorithm is not supported",
                                                      this->token(both(good, "none"))));
  const std::string escaped = R"({"kid":"the key","alg":")" + good + R"(","\u0061lg":"none"})";
  EXPECT_TRUE(this->template refuses<jwt_not_support>("none algorithm is not supported",
                                                      this->token(escaped)));
  const std::string cased = R"({"kid":"the key","alg":")" + good + R"(","ALG":"none","Alg":"x"})";
  EXPECT_TRUE(this->accepts(this->token(cased))) << "names differ in case";
}

TYPED_TEST(AttackHeader, DoesNotMakeATokenWithoutASignatureGood) {
  const std::string good = this->token(this->goodHeader());
  const std::string input = good.substr(0, good.rfind('.'));
  for (const char* signature : {"", "=", "====", "AA", "none", "bnVsbA", "e30", "."}) {
    const std::string forged = input + "." + signature;
    if (*signature == '.') {
      EXPECT_TRUE(this->template refuses<std::invalid_argument>("bad jwt format!", forged));
      continue;
    }
    EXPECT_TRUE(this->doubts(forged)) << signature;
  }
  const std::string none = test::signingInput(this->header("none"), test::kCheckBody);
  for (const std::string& signature : {std::string(), good.substr(good.rfind('.') + 1)}) {
    EXPECT_TRUE(this->template refuses<jwt_not_support>("none algorithm is not supported",
                                                        none + "." + signature));
  }
}

// RFC 7515, section 4.1: parameters by which a token would bring its own key, or ask for more than
// is understood. They are not looked at, so they neither help nor hinder.
TYPED_TEST(AttackHeader, BringsNoKeyOfItsOwn) {
  test::Provider attacker;
  const test::RsaKey own;
  attacker.answer("/keys", test::ok("{\"keys\":[" + own.jwk("the key") + "]}")).start();
  const std::string start = this->goodHeader().substr(0, this->goodHeader().size() - 1);
  for (const std::string& extra :
       {"\"jwk\":" + own.jwk("the key"), "\"jwks\":{\"keys\":[" + own.jwk("the key") + "]}",
        "\"jku\":\"" + attacker.url("/keys") + "\"", "\"x5u\":\"" + attacker.url("/keys") + "\"",
        "\"n\":\"" + own.n() + "\",\"e\":\"AQAB\"", std::string("\"x5c\":[\"MIIB\"]"),
        std::string("\"crit\":[\"exp\"],\"exp\":1"), std::string("\"b64\":false"),
        std::string("\"zip\":\"DEF\""), std::string("\"enc\":\"A128GCM\"")}) {
    const std::string header = start + "," + extra + "}";
    EXPECT_TRUE(this->doubts(test::rsaToken(own, header, test::kCheckBody))) << extra;
    EXPECT_TRUE(this->accepts(this->token(header))) << extra;
  }
  EXPECT_TRUE(attacker.requests().empty());
}

// The classic: a MAC under the public key, which everyone has.
TEST_F(AttackAzureHeader, GetsNoMacUnderThePublicKeyAccepted) {
  const std::string n = anyRsaKey().n();
  const std::vector<std::string> secrets = {n,
                                            test::fromBase64(n),
                                            std::string("\0", 1) + test::fromBase64(n),
                                            anyRsaKey().jwk("the key"),
                                            "{\"keys\":[" + anyRsaKey().jwk("the key") + "]}",
                                            "the key",
                                            "AQAB",
                                            ""};
  for (const std::string& secret : secrets) {
    for (const char* digest : {"256", "384", "512"}) {
      const std::string hs = std::string("HS") + digest;
      EXPECT_TRUE(
          refuses<jwt_not_support>(hs + " algorithm is not supported",
                                   test::hmacToken(secret, header(hs), test::kCheckBody, hs)));
      EXPECT_TRUE(doubts(
          test::hmacToken(secret, header(std::string("RS") + digest), test::kCheckBody, hs)));
    }
  }
}

TEST_F(AttackWebSphereHeader, GetsNoRsaSignatureAccepted) {
  for (const char* digest : {"256", "384", "512"}) {
    const std::string rs = std::string("RS") + digest;
    EXPECT_TRUE(
        refuses<jwt_not_support>(rs + " algorithm is not supported",
                                 test::rsaToken(anyRsaKey(), header(rs), test::kCheckBody, rs)));
    EXPECT_TRUE(doubts(
        test::rsaToken(anyRsaKey(), header(std::string("HS") + digest), test::kCheckBody, rs)));
  }
}

TEST_F(AttackWebSphereHeader, GetsNoMacUnderAnotherTextOfTheSecretAccepted) {
  const std::string secret = test::kCheckSecret;
  for (const std::string& other :
       {std::string(), test::base64(secret), base64url(secret), secret + '\n', ' ' + secret,
        std::string("the device"), std::string("null")})
    EXPECT_TRUE(doubts(test::hmacToken(other, goodHeader(), test::kCheckBody)))
        << testing::PrintToString(other);
  // RFC 2104 fills a short key with zero bytes: here the two are one key, whoever writes them.
  for (const size_t zeros : {1u, 2u, 44u})
    EXPECT_TRUE(accepts(
        test::hmacToken(secret + std::string(zeros, '\0'), goodHeader(), test::kCheckBody)));
}

// A key of no bytes, or one the platform cannot hand on, is not the empty key.
TEST_F(AttackWebSphereHeader, FindsNoEmptyKeyBehindABadSecret) {
  const std::string forged = test::hmacToken("", goodHeader(), test::kCheckBody);
  for (const Json::Value& secret :
       {Json::Value(""), Json::Value(), Json::Value(0), Json::Value(false),
        Json::Value(Json::arrayValue), Json::Value(std::string("\0", 1))}) {
    settings["client_secret"] = secret;
    test::configure<test::WebSphere>(settings);
    if (secret.isString() && secret.asString().size() == 1) {
      // One zero byte and no byte at all are the same key to the MAC: that is the secret's own
      // weakness, and the signature is right.
      EXPECT_TRUE(accepts(forged));
      continue;
    }
    EXPECT_TRUE(doubts(forged)) << secret.toStyledString();
  }
  for (const unsigned size : {766u, 1023u, 1024u, 1025u, 100000u}) {
    settings["client_secret"] = std::string(size, 's');
    test::configure<test::WebSphere>(settings);
    EXPECT_TRUE(refuses<QOVA::SSO::sso_op_failed>("encode base64 failed.", forged)) << size;
  }
}

// All short texts as keys: those that stand for no bytes are no key at all, and above all not the
// empty one. Zero bytes are the empty key to HMAC, whatever their number: texts of "A" stand for
// them. (Where pads are in the wrong place, OpenSSL's reading counts, which is zero bytes too.)
TEST(AttackKeyText, ThatStandsForNothingIsNotTheEmptyKey) {
  const std::string input = test::signingInput("{}", "{}");
  const std::string forged = input + "." + base64url(test::hmac("", input, "SHA256"));
  const std::string alphabet = "ABQ-_!\n %";
  unsigned accepted = 0;
  for (size_t length = 0; length <= 4; ++length) {
    size_t count = 1;
    for (size_t i = 0; i < length; ++i) count *= alphabet.size();
    for (size_t number = 0; number < count; ++number) {
      std::string key;
      for (size_t rest = number; key.size() < length; rest /= alphabet.size())
        key += alphabet[rest % alphabet.size()];
      const bool zeros = length > 1 && key.find_first_not_of("AB") == std::string::npos &&
                         test::fromBase64(key).find_first_not_of('\0') == std::string::npos;
      QOVA::JWT::Jwt jwt(forged);
      try {
        jwt.JwtHMACVerify(key, EVP_sha256());
        EXPECT_TRUE(zeros) << testing::PrintToString(key);
        ++accepted;
      } catch (const QOVA::JWT::jwt_verify_failed&) {
        EXPECT_FALSE(zeros) << testing::PrintToString(key);
      }
    }
  }
  EXPECT_EQ(accepted, 5u);  // AA, AB, AAA, AAB, AAAA
}

// Whether this key text takes a signature under the key of these bytes.
bool isKeyText(const std::string& text, const std::string& bytes) {
  const std::string input = test::signingInput("{}", "{}");
  QOVA::JWT::Jwt jwt(input + "." + base64url(test::hmac(bytes, input, "SHA256")));
  std::string key = text;
  try {
    jwt.JwtHMACVerify(key, EVP_sha256());
  } catch (const QOVA::JWT::jwt_verify_failed& e) {
    EXPECT_STREQ(e.what(), "verify hmac signature failed");
    return false;
  }
  return true;
}

// Pads in the wrong place are read as OpenSSL reads them, as zero bits: four characters that hold
// nothing else are zero bytes, and those are the empty key to HMAC. A text of 4k + 1 characters is
// no base64, whatever they are.
TEST(AttackKeyText, OfPadsIsOfZeroBytes) {
  for (const char* text : {"==", "===", "====", "A===", "A==", "=A", "======", "========"})
    EXPECT_TRUE(isKeyText(text, "")) << text;
  for (const char* text : {"=", "A", "=====", "A====", "=========", "B===", "Q===", "====Q==="})
    EXPECT_FALSE(isKeyText(text, "")) << text;
  EXPECT_TRUE(isKeyText("B===", "\4"));
}

// The client encodes its secret, so that pads are where they belong: a secret of pads is those
// bytes and no other key, and no byte but zero is the empty key.
TEST_F(AttackWebSphereHeader, ReachesNoKeyTextOfPads) {
  const auto isKey = [&](const std::string& secret, const std::string& key) {
    settings["client_secret"] = secret;
    test::configure<test::WebSphere>(settings);
    const std::string token = test::hmacToken(key, goodHeader(), test::kCheckBody);
    const bool taken = accepts(token);
    EXPECT_NE(taken, static_cast<bool>(doubts(token))) << secret;
    return taken;
  };
  for (const char* secret : {"=", "==", "===", "====", "A===", "A====", "========"}) {
    EXPECT_FALSE(isKey(secret, "")) << secret;
    EXPECT_TRUE(isKey(secret, secret)) << secret;
  }
  for (int byte = 0; byte < 256; ++byte)
    EXPECT_EQ(isKey(std::string(1, static_cast<char>(byte)), ""), byte == 0) << byte;
}

class AttackKid : public AttackAzureHeader {
 protected:
  static std::string with(const std::string& kid) {
    return token(R"({"alg":"RS256")" + (kid.empty() ? kid : ",\"kid\":" + kid) + "}");
  }
  // The public key with this text as its "kid"; none if it is empty.
  static std::string key(const std::string& kid) {
    const std::string jwk = anyRsaKey().jwk("KID");
    std::string copy = jwk;
    if (kid.empty()) return copy.replace(copy.find("\"kid\":\"KID\","), 12, "");
    return copy.replace(copy.find("\"KID\""), 5, kid);
  }
};

TEST_F(AttackKid, IsNotMatchedByAKeyWithoutOne) {
  publish(key(""));
  for (const char* kid : {"", "\"\"", "null", "\"the key\"", "\"undefined\""})
    EXPECT_TRUE(misses(with(kid))) << kid;
}

// Missing, null and empty read as the empty text on the header's side; on the key's side the
// member has to be there.
TEST_F(AttackKid, ThatIsEmptyMeetsOnlyAKeyWhoseOwnIsEmpty) {
  for (const char* own : {"\"\"", "null"}) {
    publish(key(own));
    for (const char* kid : {"", "\"\"", "null"}) EXPECT_TRUE(accepts(with(kid))) << own << kid;
    for (const char* kid : {"\"null\"", "\" \"", "0", "false", "\"\\u0000\""})
      EXPECT_TRUE(misses(with(kid))) << own << kid;
  }
  publish(key("\"the key\""));
  for (const char* kid : {"", "\"\"", "null"}) EXPECT_TRUE(misses(with(kid))) << kid;
}

TEST_F(AttackKid, IsComparedByteForByte) {
  publish(key("\"the key\""));
  for (const char* kid :
       {"\"the key\\u0000\"", "\"the key\\u0000x\"", "\"\\u0000the key\"", "\"The key\"",
        "\"the key \"", "\"the\\u00a0key\"", "\"the  key\"", "\"the key\\n\"", "\"*\"", "\"%\"",
        "\"the%20key\"", "\"' OR '1'='1\"", "\"../../etc/passwd\"", "\"the key,x\"", "\"..\"",
        "\"\\\\u0074he key\"", "5", "true", "1e0"})
    EXPECT_TRUE(misses(with(kid))) << kid;
  EXPECT_TRUE(accepts(with("\"\\u0074he\\u0020key\"")));
  EXPECT_TRUE(misses(with("\"" + std::string(1 << 20, 'k') + "\"")));
  publish(key("\"the key\\u0000x\""));
  EXPECT_TRUE(misses(with("\"the key\"")));
  EXPECT_TRUE(accepts(with("\"the key\\u0000x\"")));
}

TEST_F(AttackKid, OfTwoInOneObjectIsTheLast) {
  publish(key("\"the key\""));
  EXPECT_TRUE(accepts(with("\"another\",\"kid\":\"the key\"")));
  EXPECT_TRUE(misses(with("\"the key\",\"kid\":\"another\"")));
  publish(key("\"the key\",\"kid\":\"another\""));
  EXPECT_TRUE(misses(with("\"the key\"")));
  EXPECT_TRUE(accepts(with("\"another\"")));
}

// The first key of the name decides, good or bad: nothing behind it is tried.
TEST_F(AttackKid, LeadsToOneKeyAlone) {
  const std::string good = key("\"the key\"");
  const std::string foreign = test::RsaKey().jwk("the key");
  publish(foreign + "," + good);
  EXPECT_TRUE(doubts(with("\"the key\"")));
  publish(good + "," + foreign);
  EXPECT_TRUE(accepts(with("\"the key\"")));
  publish(R"({"kid":"the key","n":"","e":"AQAB"},)" + good);
  EXPECT_TRUE(doubts(with("\"the key\"")));
}

TEST_F(AttackKid, InASetThatNamesItsKeysTwiceIsLookedUpInTheLast) {
  const std::string good = "[" + key("\"the key\"") + "]";
  test::writeConfig("keys", "{\"keys\":" + good + ",\"keys\":[]}");
  EXPECT_TRUE(misses(with("\"the key\"")));
  test::writeConfig("keys", "{\"keys\":[],\"keys\":" + good + "}");
  EXPECT_TRUE(accepts(with("\"the key\"")));
  const std::string numbers = "\"n\":\"AAAA\",\"n\":\"" + anyRsaKey().n() + "\"";
  publish("{\"kid\":\"the key\",\"e\":\"AQAB\"," + numbers + "}");
  EXPECT_TRUE(accepts(with("\"the key\"")));
  publish("{\"kid\":\"the key\",\"e\":\"AQAB\",\"n\":\"" + anyRsaKey().n() + "\",\"n\":\"AAAA\"}");
  EXPECT_TRUE(doubts(with("\"the key\"")));
}

}  // namespace
