// URLEncode and MD5Digest, with the reference platform, and what they fall back to.
#include <gtest/gtest.h>
#include <openssl/evp.h>
#include <openssl/md5.h>

#include <cerrno>
#include <cstdio>
#include <cstring>

#include "sso/utils.h"
#include "support/log.h"
#include "support/memory_spy.h"

namespace {

bool noDigest = false;

}  // namespace

// Comes before OpenSSL's: returns null on demand.
extern "C" __attribute__((visibility("default"))) unsigned char* MD5(const unsigned char* data,
                                                                     size_t size,
                                                                     unsigned char* digest) {
  if (noDigest) {
    errno = EDOM;
    return nullptr;
  }
  static unsigned char kept[16];
  unsigned char* const out = digest == nullptr ? kept : digest;
  unsigned length = 0;
  return EVP_Digest(data, size, out, &length, EVP_md5(), nullptr) == 1 ? out : nullptr;
}

namespace {

using namespace QOVA::SSO;

bool isUnreserved(unsigned char c) {  // RFC 3986, section 2.3
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '-' ||
         c == '.' || c == '_' || c == '~';
}

TEST(URLEncode, EscapesAllButTheUnreservedBytes) {
  for (int c = 1; c < 256; ++c) {
    char escape[4];
    std::snprintf(escape, sizeof escape, "%%%02X", static_cast<unsigned>(c));
    const std::string text(1, static_cast<char>(c));
    EXPECT_EQ(URLEncode(text), isUnreserved(static_cast<unsigned char>(c)) ? text : escape);
  }
}

TEST(URLEncode, Examples) {
  const struct {
    const char* text;
    const char* encoded;
  } table[] = {
      {"", ""},
      {"openid profile email", "openid%20profile%20email"},
      {"authorization_code", "authorization_code"},
      {"https://device.example:5001/a?b=c&d",
       "https%3A%2F%2Fdevice.example%3A5001%2Fa%3Fb%3Dc%26d"},
      {"a+b=c/d", "a%2Bb%3Dc%2Fd"},
      {"100%", "100%25"},
      {"\xc3\xa4", "%C3%A4"},
      {"line\n", "line%0A"},
  };
  for (const auto& each : table) EXPECT_EQ(URLEncode(each.text), each.encoded) << each.text;
}

TEST(URLEncode, HasRoomForATextOfNothingButEscapes) {
  for (const std::size_t length : {1u, 2u, 85u, 341u, 1000u, 100000u}) {
    std::string expected;
    for (std::size_t i = 0; i < length; ++i) expected += "%FF";
    EXPECT_EQ(URLEncode(std::string(length, '\xff')), expected) << length;
  }
}

TEST(URLEncode, ReturnsTheTextItselfWithoutMemory) {
  test::Log log;
  const std::string text = "a b&c";
  const test::FailingCalloc failing(3 * text.size() + 1);
  EXPECT_EQ(URLEncode(text), text);
  EXPECT_EQ(failing.times(), 1u);
  EXPECT_TRUE(log.isEmpty());
}

TEST(URLEncode, OfNothingIsNothingWithoutMemoryToo) {
  const test::FailingCalloc failing(1);
  EXPECT_EQ(URLEncode(""), "");
  EXPECT_EQ(failing.times(), 1u);
}

// RFC 1321, appendix A.5.
TEST(MD5Digest, MatchesTheReferenceSuite) {
  const struct {
    const char* text;
    const char* digest;
  } suite[] = {
      {"", "d41d8cd98f00b204e9800998ecf8427e"},
      {"a", "0cc175b9c0f1b6a831c399e269772661"},
      {"abc", "900150983cd24fb0d6963f7d28e17f72"},
      {"message digest", "f96b697d7cb7938d525a2f31aaf161d0"},
      {"abcdefghijklmnopqrstuvwxyz", "c3fcd3d76192e4007dfb496cca67e13b"},
      {"ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789",
       "d174ab98d277d9f5a5611c2c9f419d9f"},
      {"12345678901234567890123456789012345678901234567890123456789012345678901234567890",
       "57edf4a22be3c955ac49da2e2107b67a"},
  };
  test::Log log;
  for (const auto& each : suite) EXPECT_EQ(MD5Digest(each.text), each.digest) << each.text;
  EXPECT_TRUE(log.isEmpty());
}

// printf '\0' | md5sum; printf 'a\0b' | md5sum
TEST(MD5Digest, CoversZeroBytes) {
  EXPECT_EQ(MD5Digest(std::string(1, '\0')), "93b885adfe0da089cdf634904fd59f71");
  EXPECT_EQ(MD5Digest(std::string("a\0b", 3)), "70350f6027bce3713f6b76473084309b");
}

TEST(MD5Digest, IsAlways32LowerCaseDigits) {
  for (int i = 0; i < 500; ++i) {
    const std::string digest = MD5Digest(std::to_string(i));
    EXPECT_EQ(digest.size(), 32u);
    EXPECT_EQ(digest.find_first_not_of("0123456789abcdef"), std::string::npos) << digest;
  }
}

TEST(MD5Digest, WithoutADigestIsEmptyAndSaysSo) {
  test::Log log;
  noDigest = true;
  EXPECT_EQ(MD5Digest("abc"), "");
  noDigest = false;
  EXPECT_TRUE(
      log.is({{LOG_ERR, "utils.cpp", std::string("MD5 digest failed ") + std::strerror(EDOM)}}));
}

TEST(MD5Digest, WithoutMemoryIsEmptyAndSaysSo) {
  test::Log log;
  const test::FailingCalloc failing(33);
  EXPECT_EQ(MD5Digest("abc"), "");
  EXPECT_EQ(failing.times(), 1u);
  EXPECT_TRUE(
      log.is({{LOG_ERR, "utils.cpp", std::string("calloc failed. ") + std::strerror(ENOMEM)}}));
}

TEST(MD5Digest, TriesTheDigestBeforeTheMemory) {
  test::Log log;
  const test::FailingCalloc failing(33);
  noDigest = true;
  EXPECT_EQ(MD5Digest("abc"), "");
  noDigest = false;
  EXPECT_EQ(failing.times(), 0u);
  EXPECT_EQ(log.lines().size(), 1u);
}

}  // namespace
