// Published examples and collections of vectors. The collections are those that Debian carries
// (python3-cryptography-vectors: NIST's and the HMAC examples of RFC 4231; librust-hmac-dev:
// Wycheproof's for HMAC); they are read where their packages put them. A collection that is
// missing or empty is a failure.
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <openssl/evp.h>
#include <openssl/hmac.h>

#include <cctype>
#include <filesystem>
#include <fstream>
#include <map>
#include <sstream>
#include <string>
#include <vector>

#include "sso/jwt.h"
#include "support/clock.h"
#include "support/token_check.h"

namespace {

using QOVA::JWT::Jwt;
using QOVA::JWT::jwt_not_support;
using QOVA::JWT::jwt_verify_failed;
using test::base64url;

// What a vector signs is any bytes; a token signs texts with one dot. A message that cannot be
// such a text takes the place of this one where the library hands it to OpenSSL.
const std::string kStandIn = "stand.in";
const std::string* message = nullptr;
unsigned replaced = 0;

template <typename Function>
Function next(const char* name) {
  return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

bool isStandIn(const void* data, size_t size) {
  const bool is = message != nullptr && size == kStandIn.size() &&
                  kStandIn.compare(0, size, static_cast<const char*>(data), size) == 0;
  if (is) ++replaced;
  return is;
}

}  // namespace

extern "C" __attribute__((visibility("default"))) int EVP_DigestUpdate(EVP_MD_CTX* context,
                                                                       const void* data,
                                                                       size_t size) {
  static const auto real = next<int (*)(EVP_MD_CTX*, const void*, size_t)>("EVP_DigestUpdate");
  if (isStandIn(data, size)) return real(context, message->data(), message->size());
  return real(context, data, size);
}

extern "C" __attribute__((visibility("default"))) unsigned char* HMAC(
    const EVP_MD* md, const void* key, int key_size, const unsigned char* data, size_t size,
    unsigned char* mac, unsigned* mac_size) {
  using Real = unsigned char* (*)(const EVP_MD*, const void*, int, const unsigned char*, size_t,
                                  unsigned char*, unsigned*);
  static const auto real = next<Real>("HMAC");
  if (!isStandIn(data, size)) return real(md, key, key_size, data, size, mac, mac_size);
  return real(md, key, key_size, reinterpret_cast<const unsigned char*>(message->data()),
              message->size(), mac, mac_size);
}

namespace {

struct Count {
  unsigned accepted = 0;
  unsigned refused = 0;
  unsigned direct = 0;  // in their own token, without the stand-in
};

std::ostream& operator<<(std::ostream& out, const Count& count) {
  return out << count.accepted << " accepted, " << count.refused << " refused, " << count.direct
             << " of them without the stand-in";
}

// The token that signs `text`, which is moved behind the stand-in unless it fits into a token.
std::string tokenOf(const std::string& text, const std::string& signature, Count& count) {
  const size_t dot = text.find('.');
  const bool fits = dot != std::string::npos && text.find('.', dot + 1) == std::string::npos &&
                    text.find('\0') == std::string::npos;
  message = fits ? nullptr : &text;
  if (fits) ++count.direct;
  return (fits ? text : kStandIn) + "." + base64url(signature);
}

template <typename Verify>
bool passes(const Verify& verify, Count& count) {
  bool good = true;
  try {
    verify();
  } catch (const jwt_verify_failed&) {
    good = false;
  }
  message = nullptr;
  ++(good ? count.accepted : count.refused);
  return good;
}

bool passesRsa(const std::string& text, const std::string& signature, std::string n, std::string e,
               const EVP_MD* md, Count& count) {
  n = base64url(n);
  e = base64url(e);
  Jwt jwt(tokenOf(text, signature, count));
  return passes([&] { jwt.JwtRSAVerify(n, e, md); }, count);
}

bool passesHmac(const std::string& text, const std::string& mac, std::string key, const EVP_MD* md,
                Count& count) {
  key = base64url(key);
  Jwt jwt(tokenOf(text, mac, count));
  return passes([&] { jwt.JwtHMACVerify(key, md); }, count);
}

const std::filesystem::path kVectors = "/usr/lib/python3/dist-packages/cryptography_vectors";

std::string contents(const std::filesystem::path& path) {
  std::ostringstream text;
  text << std::ifstream(path, std::ios::binary).rdbuf();
  EXPECT_FALSE(text.str().empty()) << path << ": scripts/setup test installs it";
  return text.str();
}

std::string fromHex(const std::string& hex) {
  std::string bytes;
  for (size_t at = 0; at + 1 < hex.size(); at += 2)
    bytes += static_cast<char>(std::stoi(hex.substr(at, 2), nullptr, 16));
  return bytes;
}

using Fields = std::map<std::string, std::string>;

// A file of lines "name = value" in NIST's form. `take` gets the fields unchanged whenever
// one named `last` was read.
template <typename Take>
void readFields(const std::filesystem::path& path, const std::string& last, const Take& take) {
  std::istringstream lines(contents(path));
  Fields fields;
  for (std::string line; std::getline(lines, line);) {
    while (!line.empty() && std::isspace(static_cast<unsigned char>(line.back()))) line.pop_back();
    const size_t equals = line.find(" = ");
    if (line.empty() || line[0] == '#' || equals == std::string::npos) continue;
    const std::string name = line.substr(0, equals);
    fields[name] = line.substr(equals + 3);
    if (name == last) take(fields);
  }
}

// Hexadecimal digits as a number's bytes.
std::string number(std::string hex) {
  if (hex.size() % 2 != 0) hex.insert(0, 1, '0');
  return fromHex(hex);
}

// Each vector of a file of signatures, with the verdict that the file gives.
void checkSignatures(const std::string& file, const std::string& last, unsigned good,
                     unsigned bad) {
  Count count;
  readFields(kVectors / "asymmetric/RSA" / file, last, [&](const Fields& fields) {
    const auto result = fields.find("Result");
    const bool valid = result == fields.end() || result->second[0] == 'P';
    const EVP_MD* md = EVP_get_digestbyname(fields.at("SHAAlg").c_str());
    ASSERT_NE(md, nullptr) << fields.at("SHAAlg");
    EXPECT_EQ(passesRsa(fromHex(fields.at("Msg")), fromHex(fields.at("S")), number(fields.at("n")),
                        number(fields.at("e")), md, count),
              valid)
        << fields.at("SHAAlg") << " " << fields.at("Msg");
  });
  std::cout << file << ": " << count << "\n";
  EXPECT_EQ(count.accepted, good);
  EXPECT_EQ(count.refused, bad);
  EXPECT_EQ(replaced, good + bad - count.direct) << "each stand-in was replaced once";
  replaced = 0;
}

// NIST, CAVP for FIPS 186: signatures that are right, and that are wrong in their message,
// exponent, signature, or padding. 1024 to 4096 bits.
TEST(VectorsOfNist, ForRsaGetTheirVerdicts) {
  checkSignatures("FIPS_186-2/SigVer15_186-3.rsp", "Result", 75, 375);
  checkSignatures("SigVer15EMTest.txt", "Result", 0, 150);
  checkSignatures("FIPS_186-2/SigGen15_186-3.rsp", "S", 250, 0);
  checkSignatures("FIPS_186-2/SigGen15_186-2.rsp", "S", 250, 0);
}

const std::vector<std::pair<std::string, const EVP_MD* (*)()>> kDigests = {
    {"256", EVP_sha256}, {"384", EVP_sha384}, {"512", EVP_sha512}};

// RFC 4231, sections 4.2 to 4.8.
TEST(VectorsOfRfc4231, ForHmacVerify) {
  for (const auto& [name, md] : kDigests) {
    Count count;
    readFields(kVectors / ("HMAC/rfc-4231-sha" + name + ".txt"), "MD",
               [&, md = md](const Fields& f) {
                 const std::string mac = fromHex(f.at("MD"));
                 const std::string key = fromHex(f.at("Key"));
                 const std::string text = fromHex(f.at("Msg"));
                 EXPECT_TRUE(passesHmac(text, mac, key, md(), count));
                 std::string wrong = mac;
                 wrong.back() = static_cast<char>(wrong.back() ^ 1);
                 EXPECT_FALSE(passesHmac(text, wrong, key, md(), count));
                 EXPECT_FALSE(passesHmac(text, mac.substr(0, 16), key, md(), count));
                 EXPECT_FALSE(passesHmac(text + 'x', mac, key, md(), count));
               });
    std::cout << "RFC 4231, SHA-" << name << ": " << count << "\n";
    EXPECT_EQ(count.accepted, 6u);
  }
}

// RFC 7518, appendix B.1 to B.3: the MACs of its composite encryptions, over the text beside, the
// initial vector, the ciphertext, and the bits of the first. (Its appendix A names algorithms, C is
// of a key agreement.)
struct Composite {
  const char* source;
  const EVP_MD* (*md)();
  size_t keySize;  // the key is 00 01 02 ...
  const char* ciphertext;
  const char* mac;
};

const std::vector<Composite> kComposites = {
    {"appendix B.1", EVP_sha256, 16,
     "c80edfa32ddf39d5ef00c0b468834279a2e46a1b8049f792f76bfe54b903a9c9a94ac9b47ad2655c5f10f9ae"
     "f71427e2fc6f9b3f399a221489f16362c703233609d45ac69864e3321cf82935ac4096c86e133314c54019e8"
     "ca7980dfa4b9cf1b384c486f3a54c51078158ee5d79de59fbd34d848b3d69550a67646344427ade54b8851ff"
     "b598f7f80074b9473c82e2db",
     "652c3fa36b0a7c5b3219fab3a30bc1c4e6e54582476515f0ad9f75a2b71c73ef"},
    {"appendix B.2", EVP_sha384, 24,
     "ea65da6b59e61edb419be62d19712ae5d303eeb50052d0dfd6697f77224c8edb000d279bdc14c1072654bd30"
     "944230c657bed4ca0c9f4a8466f22b226d1746214bf8cfc2400add9f5126e479663fc90b3bed787a2f0ffcbf"
     "3904be2a641d5c2105bfe591bae23b1d7449e532eef60a9ac8bb6c6b01d35d49787bcd57ef484927f280adc9"
     "1ac0c4e79c7b11efc60054e3",
     "8490ac0e58949bfe51875d733f93ac2075168039ccc733d74594f886b3faafd486f25c7131e3281e36c7a2d1"
     "30afde57"},
    {"appendix B.3", EVP_sha512, 32,
     "4affaaadb78c31c5da4b1b590d10ffbd3dd8d5d302423526912da037ecbcc7bd822c301dd67c373bccb584ad"
     "3e9279c2e6d12a1374b77f077553df829410446b36ebd97066296ae6427ea75c2e0846a11a09ccf5370dc80b"
     "fecbad28c73f09b3a3b75e662a2594410ae496b2e2e6609e31e6e02cc837f053d21f37ff4f51950bbe2638d0"
     "9dd7a4930930806d0703b1f6",
     "4dd3b4c088a7f45c216839645b2012bf2e6269a8c56a816dbc1b267761955bc5fd30a565c616ffb2f364baec"
     "e68fc40753bcfc025dde3693754aa1f5c3373b9c"},
};

TEST(VectorsOfRfc7518, ForHmacVerify) {
  const std::string beside = "The second principle of Auguste Kerckhoffs";
  const std::string vector = fromHex("1af38c2dc2b96ffdd86694092341bc04");
  Count count;
  for (const Composite& each : kComposites) {
    SCOPED_TRACE(each.source);
    std::string key;
    while (key.size() < each.keySize) key += static_cast<char>(key.size());
    const std::string text =
        beside + vector + fromHex(each.ciphertext) + fromHex("0000000000000150");
    const std::string mac = fromHex(each.mac);
    ASSERT_EQ(mac.size(), 2 * each.keySize);
    EXPECT_TRUE(passesHmac(text, mac, key, each.md(), count));
    EXPECT_FALSE(passesHmac(text, mac.substr(0, each.keySize), key, each.md(), count))
        << "the half that an encryption carries";
    EXPECT_FALSE(passesHmac(text, mac, key + 'x', each.md(), count));
    EXPECT_FALSE(passesHmac(text + 'x', mac, key, each.md(), count));
  }
  EXPECT_EQ(count.accepted, 3u);
}

// A file of texts, each behind its length (the blobby format, version 0.3). A length is doubled:
// an odd number refers to one of the texts in front, which occur more than once.
class Texts {
 public:
  explicit Texts(std::string file) : bytes(std::move(file)) {
    for (size_t left = length(); left > 0; --left) {
      const size_t size = length();
      often.push_back(take(size));
    }
  }
  bool done() const { return at >= bytes.size(); }
  std::string next() {
    const size_t size = length();
    return size % 2 == 1 ? often.at(size / 2) : take(size / 2);
  }

 private:
  size_t length() {
    size_t value = 0;
    for (bool first = true;; first = false) {
      const auto byte = static_cast<unsigned char>(bytes.at(at++));
      if (!first) ++value;
      value = (value << 7) + (byte & 0x7f);
      if (byte < 0x80) return value;
    }
  }
  std::string take(size_t size) {
    EXPECT_LE(at + size, bytes.size());
    at += size;
    return bytes.substr(at - size, size);
  }

  std::string bytes;
  size_t at = 0;
  std::vector<std::string> often;
};

std::filesystem::path wycheproof(const std::string& digest) {
  std::filesystem::path found;
  const std::filesystem::path crates = "/usr/share/cargo/registry";
  for (const auto& crate : std::filesystem::directory_iterator(crates)) {
    const auto file = crate.path() / "tests/data" / ("wycheproof-sha" + digest + ".blb");
    if (crate.path().filename().string().rfind("hmac-", 0) == 0 && exists(file)) found = file;
  }
  EXPECT_FALSE(found.empty()) << "no Wycheproof vectors: scripts/setup test installs them";
  return found;
}

// Project Wycheproof, hmac_sha256_test and its fellows: the valid ones. A tag that was cut is
// right there, and wrong here: RFC 7518, section 3.2, has the whole MAC.
TEST(VectorsOfWycheproof, ForHmacVerifyUnlessTheyAreCut) {
  for (const auto& [name, md] : kDigests) {
    Count count;
    unsigned cut = 0;
    Texts texts(contents(wycheproof(name)));
    while (!texts.done()) {
      const std::string key = texts.next();
      const std::string text = texts.next();
      const std::string mac = texts.next();
      const bool whole = mac.size() == static_cast<size_t>(EVP_MD_get_size(md()));
      if (!whole) ++cut;
      EXPECT_EQ(passesHmac(text, mac, key, md(), count), whole);
      for (const unsigned at : {0u, 4u, 8u, 15u}) {
        std::string wrong = mac;
        wrong[at] = static_cast<char>(wrong[at] ^ (1 << at % 8));
        EXPECT_FALSE(passesHmac(text, wrong, key, md(), count));
      }
    }
    std::cout << "Wycheproof, SHA-" << name << ": " << count << ", " << cut << " cut\n";
    EXPECT_EQ(count.accepted, 33u);
    EXPECT_EQ(cut, 33u);
  }
}

const char kJoe[] =
    "eyJpc3MiOiJqb2UiLA0KICJleHAiOjEzMDA4MTkzODAsDQogImh0dHA6Ly9leGFt"
    "cGxlLmNvbS9pc19yb290Ijp0cnVlfQ";
const char kFrodo[] =
    "SXTigJlzIGEgZGFuZ2Vyb3VzIGJ1c2luZXNzLCBGcm9kbywgZ29pbmcgb3V0IHlv"
    "dXIgZG9vci4gWW91IHN0ZXAgb250byB0aGUgcm9hZCwgYW5kIGlmIHlvdSBkb24n"
    "dCBrZWVwIHlvdXIgZmVldCwgdGhlcmXigJlzIG5vIGtub3dpbmcgd2hlcmUgeW91"
    "IG1pZ2h0IGJlIHN3ZXB0IG9mZiB0by4";

// RFC 4648, section 10, and RFC 7515, appendix C, as keys: a MAC under the right bytes shows that
// these were decoded.
TEST(ExamplesOfRfc4648, DecodeToTheirBytes) {
  const std::string input = test::signingInput("{}", "{}");
  for (const auto& [text, bytes] :
       std::vector<std::pair<std::string, std::string>>{{"Zg==", "f"},
                                                        {"Zm8=", "fo"},
                                                        {"Zm9v", "foo"},
                                                        {"Zm9vYg==", "foob"},
                                                        {"Zm9vYmE=", "fooba"},
                                                        {"Zm9vYmFy", "foobar"},
                                                        {"A-z_4ME", "\x03\xec\xff\xe0\xc1"}}) {
    const std::string bare = text.substr(0, text.find('='));
    for (std::string key : {text, bare}) {
      Jwt jwt(input + "." + base64url(test::hmac(bytes, input, "SHA256")));
      EXPECT_NO_THROW(jwt.JwtHMACVerify(key, EVP_sha256())) << key;
      std::string longer = key + "Zg";
      EXPECT_THROW(jwt.JwtHMACVerify(longer, EVP_sha256()), jwt_verify_failed);
    }
  }
  // Section 10 begins with the empty text, which is not a key.
  std::string none;
  Jwt jwt(input + "." + base64url(test::hmac("", input, "SHA256")));
  EXPECT_THROW(jwt.JwtHMACVerify(none, EVP_sha256()), jwt_verify_failed);
}

// The examples whose algorithms neither client knows. Each is right under the key of its document.
struct Foreign {
  const char* source;
  const char* algorithm;
  std::string header;
  std::string signature;
};

const std::vector<Foreign> kForeign = {
    {"RFC 7515, appendix A.3", "ES256", "eyJhbGciOiJFUzI1NiJ9",
     "DtEhU3ljbEg8L38VWAfUAqOyKAM6-Xx-F4GawxaepmXFCgfTjDxw5djxLa8ISlSApmWQxfKTUJqPP3-Kg6NU1Q"},
    {"RFC 7515, appendix A.5; RFC 7519, section 6.1", "none", "eyJhbGciOiJub25lIn0", ""},
    {"RFC 7520, section 4.2", "PS384",
     "eyJhbGciOiJQUzM4NCIsImtpZCI6ImJpbGJvLmJhZ2dpbnNAaG9iYml0b24uZXhhbXBsZSJ9",
     "cu22eBqkYDKgIlTpzDXGvaFfz6WGoz7fUDcfT0kkOy42miAh2qyBzk1xEsnk2IpN6-tPid6VrklHkqsGqDqHCdP6O8TT"
     "B5dDDItllVo6_1OLPpcbUrhiUSMxbbXUvdvWXzg-UD8biiReQFlfz28zGWVsdiNAUf8ZnyPEgVFn442ZdNqiVJRmBqrY"
     "RXe8P_ijQ7p8Vdz0TTrxUeT3lm8d9shnr2lfJT8ImUjvAA2Xez2Mlp8cBE5awDzT0qI0n6uiP1aCN_2_jLAeQTlqRHtf"
     "a64QQSUmFAAjVKPbByi7xho0uTOcbH510a6GYmJUAfmWjwZ6oD4ifKo8DYM-X72Eaw"},
    {"RFC 7520, section 4.3", "ES512",
     "eyJhbGciOiJFUzUxMiIsImtpZCI6ImJpbGJvLmJhZ2dpbnNAaG9iYml0b24uZXhhbXBsZSJ9",
     "AE_R_YZCChjn4791jSQCrdPZCNYqHXCTZH0-JZGYNlaAjP2kqaluUIIUnC9qvbu9Plon7KRTzoNEuT4Va2cmL1eJAQy3"
     "mtPBu_u_sDDyYjnAMDxXPn7XrT0lw-kvAD890jl8e2puQens_IEKBpHABlsbEPX6sFY8OcGDqoRuBomu9xQ2"},
    {"RFC 7515, appendix A.4", "ES512", "eyJhbGciOiJFUzUxMiJ9",
     "AdwMgeerwtHoh-l192l60hp9wAHZFVJbLfD_UxMi70cwnZOYaRI1bKPWROc-mZZqwqT2SI-KGDKB34XO0aw_7XdtAG8G"
     "aSwFKdCAPZgoXD2YBJZCPEX3xKpRwcdOO8KpEHwJjyqOgzDO7iKvU8vcnwNrmxYbSW9ERBXukOXolLzeO_Jn"}};

const char kPayload[] = "UGF5bG9hZA";  // of RFC 7515, appendix A.4: "Payload"

// RSASSA-PSS under the right key: not one of the algorithms, and not their padding either.
const char kBilbo[] =
    "n4EPtAOCc9AlkeQHPzHStgAbgs7bTZLwUBZdR8_KuKPEHLd4rHVTeT-O-XV2jRoj"
    "dNhxJWTDvNd7nqQ0VEiZQHz_AJmSCpMaJMRBSFKrKb2wqVwGU_NsYOYL-QtiWN2l"
    "bzcEe6XC0dApr5ydQLrHqkHHig3RBordaZ6Aj-oBHqFEHYpPe7Tpe-OfVfHd1E6c"
    "S6M1FZcD1NNLYD5lFHpPI9bTwJlsde3uhGqC0ZCuEHg8lhzwOHrtIQbS0FVbb9k3"
    "-tVTU4fg_3L_vniUFAKwuCLqKnS2BYwdq_mzSnbLY7h_qixoR7jig3__kRhuaxwU"
    "kRz5iaiQkqgc5gHdrNP5zw";

TEST(ExamplesOfRfc7520, WithAnotherPaddingAreRefused) {
  std::string n = kBilbo;
  std::string e = "AQAB";
  Jwt jwt(kForeign[2].header + "." + kFrodo + "." + kForeign[2].signature);
  for (const auto& [name, md] : kDigests)
    EXPECT_THROW(jwt.JwtRSAVerify(n, e, md()), jwt_verify_failed) << name;
}

// RFC 7515, appendix A.1 and A.2: whole tokens through the whole check of each client. They name
// neither tenant nor audience, and expired in 2011, so that the clock does not move there.
const std::time_t kJoesExpiry = 1300819380;

using ExamplesForAzure = test::TokenCheck<test::Azure>;
using ExamplesForWebSphere = test::TokenCheck<test::WebSphere>;

TEST_F(ExamplesForWebSphere, OfRfc7515PassUntilTheyExpire) {
  const std::string secret = test::fromBase64(
      "AyM1SysPpbyDfgZld3umj1qzKObwVMkoqQ-EstJQLr_T-1qS0gZH75aKtMN3Yj0iPS4hcgUuTwjAzZr1Z9CAow");
  test::writeConfig("websphere.conf",
                    "{\"websphere_client_secret\":" + test::jsonText(secret) + "}");
  const std::string example = std::string("eyJ0eXAiOiJKV1QiLA0KICJhbGciOiJIUzI1NiJ9.") + kJoe +
                              ".dBjftJeZ4CVP-mB92K27uhbUJU1p1r_wW1gFWFOEjXk";
  {
    const test::Clock clock(kJoesExpiry);
    EXPECT_TRUE(accepts(example));
  }
  const test::Clock clock(kJoesExpiry + 1);
  EXPECT_TRUE(refuses<std::invalid_argument>("id_token expired.", example));
}

TEST_F(ExamplesForAzure, OfRfc7515PassUntilTheyExpire) {
  settings.removeMember("client_id");
  settings.removeMember("tenant_id");
  test::configure<test::Azure>(settings);
  publish(
      R"({"kty":"RSA","kid":"","n":"ofgWCuLjybRlzo0tZWJjNiuSfb4p4fAkd_wWJcyQoTbji9k0l8W26mPdd)"
      "xHmfHQp-Vaw-4qPCJrcS2mJPMEzP1Pt0Bm4d4QlL-yRT-SFd2lZS-pCgNMsD1W_YpRPEwOWvG6b32690r2jZ47soMZo"
      "9wGzjb_7OMg0LOL-bSf63kpaSHSXndS5z5rexMdbBYUsLA9e-KXBdQOS-UTo7WTBEMa2R2CapHg665xsmtdVMTBQY4u"
      "DZlxvb3qCo5ZwKh9kG4LT6_I5IhlJH7aGhyxXFvUK-DWNmoudF8NAco9_h9iaGNj8q2ethFkMLs91kzk2PAcDTW9gb5"
      R"(4h4FRWyuXpoQ","e":"AQAB"})");
  const std::string example =
      std::string("eyJhbGciOiJSUzI1NiJ9.") + kJoe +
      ".cC4hiUPoj9Eetdgtv3hF80EGrhuB__dzERat0XF9g2VtQgr9PJbu3XOiZj5RZmh7AAuHIm4Bh-0Qc_lF5YKt_O8W2F"
      "p5jujGbds9uJdbF9CUAr7t1dnZcAcQjbKBYNX4BAynRFdiuB--f_nZLgrnbyTyWzO75vRK5h6xBArLIARNPvkSjtQBM"
      "Hlb1L07Qe7K0GarZRmB_eSN9383LcOLn6_dO--xi12jzDwusC-eOkHWEsqtFZESc6BfI7noOPqvhJ1phCnvWh6IeYI2w"
      "9QOYEUipUTI8np6LbgGY9Fs98rqVt5AXLIhWkWywlVmtVrBp0igcN_IoypGlUPQGe77Rw";
  {
    const test::Clock clock(kJoesExpiry);
    EXPECT_TRUE(accepts(example));
  }
  const test::Clock clock(kJoesExpiry + 1);
  EXPECT_TRUE(refuses<std::invalid_argument>("id_token expired.", example));
}

// Those of other algorithms. Those whose claims expired say so first, and one payload is no JSON.
template <typename Provider>
class ExamplesForBoth : public test::TokenCheck<Provider> {};
TYPED_TEST_SUITE(ExamplesForBoth, test::Clients, test::ClientName);

TYPED_TEST(ExamplesForBoth, OfOtherAlgorithmsAreNotSupported) {
  this->settings.removeMember("client_id");
  this->settings.removeMember("tenant_id");
  test::configure<TypeParam>(this->settings);
  const auto key = [](const std::string& kid) {
    return R"({"kid":")" + kid + R"(","n":")" + kBilbo + R"(","e":"AQAB"})";
  };
  this->publish(key("") + "," + key("bilbo.baggins@hobbiton.example"));
  const std::string never = base64url(R"({"exp":4102444800})");
  for (const Foreign& example : kForeign) {
    SCOPED_TRACE(example.source);
    EXPECT_TRUE(this->template refuses<std::invalid_argument>(
        "id_token expired.", example.header + "." + kJoe + "." + example.signature));
    EXPECT_TRUE(this->template refuses<std::invalid_argument>(
        "bad jwt body format!", example.header + "." + kFrodo + "." + example.signature));
    EXPECT_TRUE(this->template refuses<std::invalid_argument>(
        "bad jwt body format!", example.header + "." + kPayload + "." + example.signature));
    EXPECT_TRUE(this->template refuses<jwt_not_support>(
        std::string(example.algorithm) + " algorithm is not supported",
        example.header + "." + never + "." + example.signature));
  }
}

}  // namespace
