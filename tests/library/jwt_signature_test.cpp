// The two signature checks of a token.
#include <gtest/gtest.h>
#include <openssl/evp.h>

#include <cctype>
#include <string>
#include <vector>

#include "sso/jwt.h"
#include "support/faults.h"
#include "support/log.h"
#include "support/throws.h"
#include "support/tokens.h"

namespace {

using QOVA::JWT::Jwt;
using QOVA::JWT::jwt_verify_failed;
using test::base64;
using test::base64url;
using test::throws;

const char kRsaFailed[] = "verify rsa signature failed";
const char kHmacFailed[] = "verify hmac signature failed";
const std::vector<test::Expected> kFinalFailed = {
    {LOG_ERR, "jwt.cpp", "EVP_DigestVerifyFinal failed"}};

// RFC 7515, appendix A.1 and A.2: one payload, signed with HS256 and with RS256.
const std::string kPayload =
    "eyJpc3MiOiJqb2UiLA0KICJleHAiOjEzMDA4MTkzODAsDQogImh0dHA6Ly9leGFt"
    "cGxlLmNvbS9pc19yb290Ijp0cnVlfQ";
const std::string kHmacHeader = "eyJ0eXAiOiJKV1QiLA0KICJhbGciOiJIUzI1NiJ9";
const std::string kHmacSignature = "dBjftJeZ4CVP-mB92K27uhbUJU1p1r_wW1gFWFOEjXk";
const std::string kHmacKey =
    "AyM1SysPpbyDfgZld3umj1qzKObwVMkoqQ-EstJQLr_T-1qS0gZH75aK"
    "tMN3Yj0iPS4hcgUuTwjAzZr1Z9CAow";
const std::string kRsaHeader = "eyJhbGciOiJSUzI1NiJ9";
const std::string kRsaSignature =
    "cC4hiUPoj9Eetdgtv3hF80EGrhuB__dzERat0XF9g2VtQgr9PJbu3XOiZj5RZmh7"
    "AAuHIm4Bh-0Qc_lF5YKt_O8W2Fp5jujGbds9uJdbF9CUAr7t1dnZcAcQjbKBYNX4"
    "BAynRFdiuB--f_nZLgrnbyTyWzO75vRK5h6xBArLIARNPvkSjtQBMHlb1L07Qe7K"
    "0GarZRmB_eSN9383LcOLn6_dO--xi12jzDwusC-eOkHWEsqtFZESc6BfI7noOPqv"
    "hJ1phCnvWh6IeYI2w9QOYEUipUTI8np6LbgGY9Fs98rqVt5AXLIhWkWywlVmtVrB"
    "p0igcN_IoypGlUPQGe77Rw";
const std::string kModulus =
    "ofgWCuLjybRlzo0tZWJjNiuSfb4p4fAkd_wWJcyQoTbji9k0l8W26mPddxHmfHQp"
    "-Vaw-4qPCJrcS2mJPMEzP1Pt0Bm4d4QlL-yRT-SFd2lZS-pCgNMsD1W_YpRPEwOW"
    "vG6b32690r2jZ47soMZo9wGzjb_7OMg0LOL-bSf63kpaSHSXndS5z5rexMdbBYUs"
    "LA9e-KXBdQOS-UTo7WTBEMa2R2CapHg665xsmtdVMTBQY4uDZlxvb3qCo5ZwKh9k"
    "G4LT6_I5IhlJH7aGhyxXFvUK-DWNmoudF8NAco9_h9iaGNj8q2ethFkMLs91kzk2"
    "PAcDTW9gb54h4FRWyuXpoQ";
const std::string kExponent = "AQAB";

// RFC 7520, sections 4.1 and 4.4 (figures 12 and 33): a payload that is not JSON.
const std::string kFrodo =
    "SXTigJlzIGEgZGFuZ2Vyb3VzIGJ1c2luZXNzLCBGcm9kbywgZ29pbmcgb3V0IHlv"
    "dXIgZG9vci4gWW91IHN0ZXAgb250byB0aGUgcm9hZCwgYW5kIGlmIHlvdSBkb24n"
    "dCBrZWVwIHlvdXIgZmVldCwgdGhlcmXigJlzIG5vIGtub3dpbmcgd2hlcmUgeW91"
    "IG1pZ2h0IGJlIHN3ZXB0IG9mZiB0by4";

// A text with the character at `at` changed in its highest bit, so that no decoder overlooks it.
std::string changed(std::string text, size_t at) {
  const std::string alphabet = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_";
  text[at] = alphabet[alphabet.find(text[at]) ^ 32];
  return text;
}

class JwtSignature : public testing::Test {
 protected:
  static void verifyRsa(const std::string& token, std::string n, std::string e,
                        const EVP_MD* md = EVP_sha256()) {
    Jwt(token).JwtRSAVerify(n, e, md);
  }

  static void verifyHmac(const std::string& token, std::string key,
                         const EVP_MD* md = EVP_sha256()) {
    Jwt(token).JwtHMACVerify(key, md);
  }

  // Each refusal is checked together with what it wrote to the log.
  void expectRsaRefused(const std::string& token, const std::string& n, const std::string& e,
                        const std::vector<test::Expected>& lines, const EVP_MD* md = EVP_sha256()) {
    log.clear();
    EXPECT_TRUE(throws<jwt_verify_failed>(kRsaFailed, [&] { verifyRsa(token, n, e, md); }));
    EXPECT_TRUE(log.is(lines));
    log.clear();
  }

  void expectHmacRefused(const std::string& token, const std::string& key,
                         const EVP_MD* md = EVP_sha256()) {
    EXPECT_TRUE(throws<jwt_verify_failed>(kHmacFailed, [&] { verifyHmac(token, key, md); }));
  }

  // The body above all: the signed text is put together in its place.
  static void expectUntouched(Jwt& jwt, const std::string& token) {
    Jwt untouched(token);
    EXPECT_EQ(jwt.GetHeader(), untouched.GetHeader());
    EXPECT_EQ(jwt.GetBody(), untouched.GetBody());
    EXPECT_EQ(jwt.GetSignature(), untouched.GetSignature());
  }

  void TearDown() override { EXPECT_TRUE(log.isEmpty()); }

  test::Log log;
};

class JwtRsa : public JwtSignature {
 protected:
  const std::string token = kRsaHeader + "." + kPayload + "." + kRsaSignature;
};

class JwtHmac : public JwtSignature {
 protected:
  const std::string token = kHmacHeader + "." + kPayload + "." + kHmacSignature;
};

struct Algorithm {
  const char* number;
  const EVP_MD* (*md)();
};
const Algorithm kAlgorithms[] = {{"256", EVP_sha256}, {"384", EVP_sha384}, {"512", EVP_sha512}};

TEST_F(JwtRsa, VerifiesTheTokenOfRfc7515) {
  EXPECT_NO_THROW(verifyRsa(token, kModulus, kExponent));
}

TEST_F(JwtRsa, VerifiesTheTokenOfRfc7520) {
  const std::string n =
      "n4EPtAOCc9AlkeQHPzHStgAbgs7bTZLwUBZdR8_KuKPEHLd4rHVTeT-O-XV2jRoj"
      "dNhxJWTDvNd7nqQ0VEiZQHz_AJmSCpMaJMRBSFKrKb2wqVwGU_NsYOYL-QtiWN2l"
      "bzcEe6XC0dApr5ydQLrHqkHHig3RBordaZ6Aj-oBHqFEHYpPe7Tpe-OfVfHd1E6c"
      "S6M1FZcD1NNLYD5lFHpPI9bTwJlsde3uhGqC0ZCuEHg8lhzwOHrtIQbS0FVbb9k3"
      "-tVTU4fg_3L_vniUFAKwuCLqKnS2BYwdq_mzSnbLY7h_qixoR7jig3__kRhuaxwU"
      "kRz5iaiQkqgc5gHdrNP5zw";
  const std::string header =
      "eyJhbGciOiJSUzI1NiIsImtpZCI6ImJpbGJvLmJhZ2dpbnNAaG9iYml0b24uZXhhbXBsZSJ9";
  const std::string signature =
      "MRjdkly7_-oTPTS3AXP41iQIGKa80A0ZmTuV5MEaHoxnW2e5CZ5NlKtainoFmKZo"
      "pdHM1O2U4mwzJdQx996ivp83xuglII7PNDi84wnB-BDkoBwA78185hX-Es4JIwmD"
      "LJK3lfWRa-XtL0RnltuYv746iYTh_qHRD68BNt1uSNCrUCTJDt5aAE6x8wW1Kt9e"
      "Ro4QPocSadnHXFxnt8Is9UzpERV0ePPQdLuW3IS_de3xyIrDaLGdjluPxUAhb6L2"
      "aXic1U12podGU0KLUQSE_oI-ZnmKJ3F4uOZDnd6QZWJushZ41Axf_fcIe8u9ipH8"
      "4ogoree7vjbU5y18kDquDg";
  EXPECT_NO_THROW(verifyRsa(header + "." + kFrodo + "." + signature, n, "AQAB"));
}

TEST_F(JwtRsa, VerifiesUnderTheDigestOfTheSignatureAlone) {
  const test::RsaKey& key = test::anyRsaKey();
  for (const Algorithm& signer : kAlgorithms) {
    const std::string signed_token =
        test::rsaToken(key, "{}", "{}", std::string("RS") + signer.number);
    for (const Algorithm& reader : kAlgorithms) {
      SCOPED_TRACE(std::string(signer.number) + " read as " + reader.number);
      if (signer.md == reader.md) {
        EXPECT_NO_THROW(verifyRsa(signed_token, key.n(), key.e(), reader.md()));
      } else {
        expectRsaRefused(signed_token, key.n(), key.e(), kFinalFailed, reader.md());
      }
    }
  }
}

TEST_F(JwtRsa, VerifiesUnderKeysOfOtherSizes) {
  for (int bits : {1024, 1536, 3072}) {
    const test::RsaKey key(bits);
    EXPECT_NO_THROW(verifyRsa(test::rsaToken(key, "{}", "{}"), key.n(), key.e())) << bits;
  }
}

TEST_F(JwtRsa, IgnoresZeroBytesInFrontOfTheNumbers) {
  const std::string zero(1, '\0');
  EXPECT_NO_THROW(verifyRsa(token, base64url(zero + test::fromBase64(kModulus)),
                            base64url(zero + test::fromBase64(kExponent))));
}

TEST_F(JwtRsa, ReadsNumbersAndSignatureInStandardBase64AsWell) {
  const std::string padded =
      kRsaHeader + "." + kPayload + "." + base64(test::fromBase64(kRsaSignature));
  ASSERT_NE(padded.find('='), std::string::npos);
  EXPECT_NO_THROW(verifyRsa(padded, base64(test::fromBase64(kModulus)), kExponent));
}

TEST_F(JwtRsa, LeavesItsArgumentsAndTheTokenAlone) {
  Jwt jwt(token);
  std::string n = kModulus;
  std::string e = kExponent;
  EXPECT_NO_THROW(jwt.JwtRSAVerify(n, e, EVP_sha256()));
  EXPECT_NO_THROW(jwt.JwtRSAVerify(n, e, EVP_sha256())) << "a second time";
  EXPECT_EQ(n, kModulus);
  EXPECT_EQ(e, kExponent);
  expectUntouched(jwt, token);
}

TEST_F(JwtRsa, RefusesAChangeOfAnyCharacter) {
  for (size_t at = 0; at < token.size(); ++at) {
    if (token[at] == '.') continue;
    SCOPED_TRACE(at);
    expectRsaRefused(changed(token, at), kModulus, kExponent, kFinalFailed);
  }
}

TEST_F(JwtRsa, RefusesTheSignatureOfAnotherText) {
  expectRsaRefused(kHmacHeader + "." + kPayload + "." + kRsaSignature, kModulus, kExponent,
                   kFinalFailed);
}

TEST_F(JwtRsa, RefusesAnotherKey) {
  expectRsaRefused(token, test::anyRsaKey().n(), test::anyRsaKey().e(), kFinalFailed);
}

TEST_F(JwtRsa, RefusesASignatureOfAnotherLength) {
  const std::string bytes = test::fromBase64(kRsaSignature);
  const std::string input = kRsaHeader + "." + kPayload + ".";
  for (const std::string& signature :
       {bytes.substr(1), bytes.substr(0, 255), bytes + '\0', '\0' + bytes, bytes + bytes})
    expectRsaRefused(input + base64url(signature), kModulus, kExponent, kFinalFailed);
}

// Something was decoded, if only nothing: the check runs, and says that it failed.
TEST_F(JwtRsa, RefusesASignatureThatDoesNotDecode) {
  for (const char* signature : {"!!!!", "A", "====", "!"})
    expectRsaRefused(kRsaHeader + "." + kPayload + "." + signature, kModulus, kExponent,
                     kFinalFailed);
}

TEST_F(JwtRsa, FailsSilentlyWithoutModulusExponentOrSignature) {
  expectRsaRefused(token, "", kExponent, {});
  expectRsaRefused(token, kModulus, "", {});
  expectRsaRefused(kRsaHeader + "." + kPayload + ".", kModulus, kExponent, {});
}

// Whether a number that is zero is noticed early or by the check itself is left open.
TEST_F(JwtRsa, RefusesNumbersThatDoNotDecode) {
  for (const char* number : {"!!!!", "A", "====", "AA"}) {
    EXPECT_TRUE(
        throws<jwt_verify_failed>(kRsaFailed, [&] { verifyRsa(token, number, kExponent); }));
    EXPECT_TRUE(throws<jwt_verify_failed>(kRsaFailed, [&] { verifyRsa(token, kModulus, number); }));
  }
  EXPECT_LE(log.lines().size(), 8u);
  log.clear();
}

TEST_F(JwtRsa, RefusesWhatTheDecoderCannotRead) {
  for (int nth : {1, 2, 3}) {
    test::Fault fault("BIO_read", nth);
    EXPECT_TRUE(
        throws<jwt_verify_failed>(kRsaFailed, [&] { verifyRsa(token, kModulus, kExponent); }));
    EXPECT_TRUE(fault.wasHit());
  }
  EXPECT_LE(log.lines().size(), 3u);
  log.clear();
}

// The signed text and the numbers are C strings.
TEST_F(JwtRsa, EndsEachTextAtAZeroByte) {
  const test::RsaKey& key = test::anyRsaKey();
  const std::string behind("\0behind", 7);
  const std::string cut = "e30" + behind + ".e30." + base64url(key.sign("e30", "SHA256"));
  EXPECT_NO_THROW(verifyRsa(cut, key.n(), key.e()));
  EXPECT_NO_THROW(verifyRsa(cut + behind, key.n() + behind, key.e() + behind));
  const std::string whole =
      "e30" + behind + ".e30." + base64url(key.sign("e30" + behind + ".e30", "SHA256"));
  expectRsaRefused(whole, key.n(), key.e(), kFinalFailed);
}

struct Broken {
  const char* function;
  int nth;
  const char* line;  // empty: the failure is silent
};

class JwtRsaFault : public JwtRsa, public testing::WithParamInterface<Broken> {};

void PrintTo(const Broken& broken, std::ostream* out) {
  *out << broken.function << " " << broken.nth;
}

INSTANTIATE_TEST_SUITE_P(
    , JwtRsaFault,
    testing::Values(
        Broken{"BIO_new", 1, ""}, Broken{"BIO_new", 2, ""}, Broken{"BIO_new", 3, ""},
        Broken{"BIO_new_mem_buf", 1, ""}, Broken{"BIO_new_mem_buf", 2, ""},
        Broken{"BIO_new_mem_buf", 3, ""}, Broken{"BIO_pending", 1, ""},
        Broken{"BIO_pending", 2, ""}, Broken{"BIO_pending", 3, ""}, Broken{"BN_bin2bn", 1, ""},
        Broken{"BN_bin2bn", 2, ""}, Broken{"RSA_new", 1, ""}, Broken{"RSA_set0_key", 1, ""},
        Broken{"EVP_PKEY_new", 1, ""}, Broken{"EVP_PKEY_assign", 1, "EVP_PKEY_assign_RSA failed"},
        Broken{"EVP_PKEY_get_id", 1, "check key type failed"}, Broken{"EVP_MD_CTX_new", 1, ""},
        Broken{"EVP_DigestVerifyInit", 1, "EVP_DigestVerifyInit failed"},
        Broken{"EVP_DigestUpdate", 1, "EVP_DigestVerifyUpdate failed"},
        Broken{"EVP_DigestVerifyFinal", 1, "EVP_DigestVerifyFinal failed"}),
    [](const auto& broken) {
      return std::string(broken.param.function) + std::to_string(broken.param.nth);
    });

TEST_P(JwtRsaFault, EndsInTheOneMessage) {
  std::vector<test::Expected> lines;
  if (*GetParam().line != '\0') lines.push_back({LOG_ERR, "jwt.cpp", GetParam().line});
  Jwt jwt(token);
  std::string n = kModulus;
  std::string e = kExponent;
  {
    test::Fault fault(GetParam().function, GetParam().nth);
    EXPECT_TRUE(
        throws<jwt_verify_failed>(kRsaFailed, [&] { jwt.JwtRSAVerify(n, e, EVP_sha256()); }));
    EXPECT_TRUE(fault.wasHit());
  }
  EXPECT_TRUE(log.is(lines));
  log.clear();
  expectUntouched(jwt, token);
  EXPECT_NO_THROW(jwt.JwtRSAVerify(n, e, EVP_sha256())) << "once the fault is over";
}

TEST_F(JwtHmac, VerifiesTheTokenOfRfc7515) {
  EXPECT_NO_THROW(verifyHmac(token, kHmacKey));
}

TEST_F(JwtHmac, VerifiesTheTokenOfRfc7520) {
  EXPECT_NO_THROW(verifyHmac(
      "eyJhbGciOiJIUzI1NiIsImtpZCI6IjAxOGMwYWU1LTRkOWItNDcxYi1iZmQ2LWVlZjMxNGJjNzAzNyJ9." + kFrodo +
          ".s0h6KThzkfBBBkLspW1h84VsJZFTsPPqMDA7g1Md7p0",
      "hJtXIZ2uSN5kbQfbtTNWbpdmhkV8FJG-Onbc6mxCcYg"));
}

TEST_F(JwtHmac, VerifiesUnderTheDigestOfTheSignatureAlone) {
  for (const Algorithm& signer : kAlgorithms) {
    const std::string signed_token =
        test::hmacToken("secret", "{}", "{}", std::string("HS") + signer.number);
    for (const Algorithm& reader : kAlgorithms) {
      SCOPED_TRACE(std::string(signer.number) + " read as " + reader.number);
      if (signer.md == reader.md) {
        EXPECT_NO_THROW(verifyHmac(signed_token, base64url("secret"), reader.md()));
      } else {
        expectHmacRefused(signed_token, base64url("secret"), reader.md());
      }
    }
  }
}

TEST_F(JwtHmac, VerifiesUnderKeysOfAnyBytesAndLength) {
  for (unsigned length : {1u, 2u, 3u, 31u, 64u, 65u, 128u, 129u, 765u, 10000u}) {
    std::string key;
    while (key.size() < length) key += static_cast<char>(key.size() * 7);
    const std::string signed_token = test::hmacToken(key, "{}", "{}");
    EXPECT_NO_THROW(verifyHmac(signed_token, base64url(key))) << length;
    EXPECT_NO_THROW(verifyHmac(signed_token, base64(key))) << length;
    key.back() = static_cast<char>(key.back() + 1);
    expectHmacRefused(signed_token, base64url(key));
  }
}

TEST_F(JwtHmac, LeavesItsArgumentAndTheTokenAlone) {
  Jwt jwt(token);
  std::string key = kHmacKey;
  EXPECT_NO_THROW(jwt.JwtHMACVerify(key, EVP_sha256()));
  EXPECT_NO_THROW(jwt.JwtHMACVerify(key, EVP_sha256())) << "a second time";
  EXPECT_EQ(key, kHmacKey);
  expectUntouched(jwt, token);
}

TEST_F(JwtHmac, RefusesAChangeOfAnyCharacter) {
  for (size_t at = 0; at < token.size(); ++at) {
    if (token[at] == '.') continue;
    SCOPED_TRACE(at);
    expectHmacRefused(changed(token, at), kHmacKey);
  }
}

// The texts are compared, not what they stand for.
TEST_F(JwtHmac, RefusesOtherSpellingsOfTheRightSignature) {
  std::string standard = kHmacSignature;
  ASSERT_NE(standard.find('-'), std::string::npos);
  ASSERT_NE(standard.find('_'), std::string::npos);
  std::string plus = kHmacSignature;
  plus[plus.find('-')] = '+';
  std::string slash = kHmacSignature;
  slash[slash.find('_')] = '/';
  std::string unused_bits = kHmacSignature;
  unused_bits.back() = 'l';  // "k" and "l" differ in a bit that stands for nothing
  std::string other_case = kHmacSignature;
  for (char& c : other_case)
    c = static_cast<char>(std::islower(c) ? std::toupper(c) : std::tolower(c));
  for (const std::string& signature :
       {other_case, kHmacSignature + "=", kHmacSignature + "==", plus, slash, unused_bits,
        kHmacSignature + "A", kHmacSignature.substr(0, 42), kHmacSignature + " ", std::string()}) {
    SCOPED_TRACE(signature);
    expectHmacRefused(kHmacHeader + "." + kPayload + "." + signature, kHmacKey);
  }
}

TEST_F(JwtHmac, AcceptsEverySignatureThatASignerMakes) {
  for (int i = 0; i < 300; ++i) {
    const std::string signed_token = test::hmacToken("secret", "{}", std::to_string(i), "HS512");
    EXPECT_NO_THROW(verifyHmac(signed_token, base64url("secret"), EVP_sha512())) << i;
  }
}

// Nor is a key that decodes to nothing the key of no bytes.
TEST_F(JwtHmac, RefusesAKeyThatDecodesToNothing) {
  const std::string signed_token = test::hmacToken("", "{}", "{}");
  for (const char* key : {"", "!!!!", "!", "A", "=", "\n"}) {
    SCOPED_TRACE(testing::PrintToString(key));
    expectHmacRefused(signed_token, key);
    expectHmacRefused(token, key);
  }
}

TEST_F(JwtHmac, EndsEachTextAtAZeroByte) {
  const std::string behind("\0behind", 7);
  const std::string key = base64url("secret");
  const std::string cut =
      "e30" + behind + ".e30." + base64url(test::hmac("secret", "e30", "SHA256"));
  EXPECT_NO_THROW(verifyHmac(cut, key));
  EXPECT_NO_THROW(verifyHmac(cut + behind, key + behind));
  const std::string whole =
      "e30" + behind + ".e30." + base64url(test::hmac("secret", "e30" + behind + ".e30", "SHA256"));
  expectHmacRefused(whole, key);
}

class JwtHmacFault : public JwtHmac, public testing::WithParamInterface<Broken> {};

INSTANTIATE_TEST_SUITE_P(, JwtHmacFault,
                         testing::Values(Broken{"BIO_new_mem_buf", 1, ""}, Broken{"BIO_new", 1, ""},
                                         Broken{"BIO_new", 2, ""}, Broken{"BIO_new", 3, ""},
                                         Broken{"HMAC", 1, ""}, Broken{"BIO_pending", 1, ""},
                                         Broken{"BIO_pending", 2, ""}, Broken{"BIO_write", 1, ""},
                                         Broken{"BIO_read", 1, ""}, Broken{"BIO_read", 2, ""}),
                         [](const auto& broken) {
                           return std::string(broken.param.function) +
                                  std::to_string(broken.param.nth);
                         });

TEST_P(JwtHmacFault, EndsInTheOneMessage) {
  Jwt jwt(token);
  std::string key = kHmacKey;
  {
    test::Fault fault(GetParam().function, GetParam().nth);
    EXPECT_TRUE(
        throws<jwt_verify_failed>(kHmacFailed, [&] { jwt.JwtHMACVerify(key, EVP_sha256()); }));
    EXPECT_TRUE(fault.wasHit());
  }
  expectUntouched(jwt, token);
  EXPECT_NO_THROW(jwt.JwtHMACVerify(key, EVP_sha256())) << "once the fault is over";
}

// A MAC that was not made must not be taken for one of no length.
TEST_F(JwtHmac, RefusesAnEmptySignatureWhenNoMacIsMade) {
  for (const char* function : {"BIO_new", "HMAC", "BIO_write"}) {
    test::Fault fault(function, std::string(function) == "BIO_new" ? 2 : 1);
    expectHmacRefused(kHmacHeader + "." + kPayload + ".", kHmacKey);
    EXPECT_TRUE(fault.wasHit()) << function;
  }
}

}  // namespace
