// What URLEncode and GetSSORelayURL ask of the device platform, and what they make of its answers.
#include <gtest/gtest.h>

#include <cstring>
#include <string>

#include "sso/sso.h"
#include "sso/utils.h"
#include "support/log.h"
#include "support/platform_spy.h"

namespace {

using QOVA::SSO::GetSSORelayURL;
using QOVA::SSO::URLEncode;
using test::platformSpy;

TEST(URLEncodePlatform, IsOfferedThreeBytesForEachByte) {
  for (const std::size_t length : {0u, 1u, 2u, 300u}) {
    platformSpy().urlEncode.clear();
    URLEncode(std::string(length, ' '));
    ASSERT_EQ(platformSpy().urlEncode.size(), 1u);
    EXPECT_EQ(platformSpy().urlEncode[0].input, std::string(length, ' '));
    EXPECT_EQ(platformSpy().urlEncode[0].capacity, 3 * length);
    EXPECT_TRUE(platformSpy().urlEncode[0].zeroed) << "and one more for the terminating zero";
  }
}

TEST(URLEncodePlatform, MayFillAllItWasOffered) {
  platformSpy().onURLEncode = [](const std::string&, char* encoded, std::size_t capacity) {
    std::memset(encoded, 'x', capacity);
    return 0;
  };
  for (const std::size_t length : {0u, 1u, 1000u}) {
    EXPECT_EQ(URLEncode(std::string(length, 'a')), std::string(3 * length, 'x'));
  }
}

TEST(URLEncodePlatform, AnswersUpToItsFirstZero) {
  platformSpy().onURLEncode = [](const std::string&, char* encoded, std::size_t) {
    std::memcpy(encoded, "ab\0c", 4);
    return 0;
  };
  EXPECT_EQ(URLEncode("text"), "ab");
}

// Deliberate: the caller cannot tell, and nothing is logged.
TEST(URLEncodePlatform, FailsWithTheTextItselfForAnyResultButZero) {
  test::Log log;
  const std::string texts[] = {"", "a b", std::string("a\0 b", 4)};
  for (const int result : {-1, 1, 2, 1000}) {
    platformSpy().onURLEncode = [result](const std::string&, char*, std::size_t) { return result; };
    for (const std::string& text : texts) EXPECT_EQ(URLEncode(text), text);
  }
  EXPECT_TRUE(log.isEmpty());
}

const char* const kSuccess = "ssoclient/relay.html#success=true";

// A platform that decodes any state to these bytes, and says so with this result.
void decodeTo(const std::string& bytes, int result = 1) {
  platformSpy().onBase64Decode = [=](const std::string&, char* out, std::size_t* size) {
    std::memcpy(out, bytes.data(), bytes.size());
    *size = bytes.size();
    return result;
  };
}

TEST(RelayPlatform, IsOfferedAZeroedBufferOf1024) {
  GetSSORelayURL(true, "the state", "");
  ASSERT_EQ(platformSpy().base64Decode.size(), 1u);
  EXPECT_EQ(platformSpy().base64Decode[0].input, "the state");
  EXPECT_EQ(platformSpy().base64Decode[0].capacity, 1024u);
  EXPECT_TRUE(platformSpy().base64Decode[0].zeroed);
}

TEST(RelayPlatform, IsNotAskedOnFailure) {
  GetSSORelayURL(false, "the state", "a reason");
  EXPECT_TRUE(platformSpy().base64Decode.empty());
  EXPECT_TRUE(platformSpy().urlEncode.empty());
}

TEST(RelayPlatform, SucceedsWithAnyResultButZero) {
  for (const int result : {1, -1, 17}) {
    decodeTo(R"({"origin":"a"})", result);
    EXPECT_EQ(GetSSORelayURL(true, "state", ""), "ssoclient/relay.html#origin=a&success=true");
  }
  decodeTo(R"({"origin":"a"})", 0);
  EXPECT_EQ(GetSSORelayURL(true, "state", ""), kSuccess);
}

// The text goes up to its first zero byte, whatever length was reported.
TEST(RelayPlatform, DecidesTheTextByItsZeroAlone) {
  platformSpy().onBase64Decode = [](const std::string&, char* out, std::size_t* size) {
    std::strcpy(out, R"({"origin":"a"})");
    *size = 0;
    return 1;
  };
  EXPECT_EQ(GetSSORelayURL(true, "state", ""), "ssoclient/relay.html#origin=a&success=true");
}

// No zero is left in the buffer then: it must not be read behind its end.
TEST(RelayPlatform, MayFillAllItWasOffered) {
  const std::string json = R"({"origin":"a"})";
  decodeTo(json + std::string(1024 - json.size(), ' '));
  EXPECT_EQ(GetSSORelayURL(true, "state", ""), "ssoclient/relay.html#origin=a&success=true");
  decodeTo(std::string(1024, ' '));
  EXPECT_EQ(GetSSORelayURL(true, "state", ""), kSuccess);
}

TEST(RelayPlatform, EncodesTheOriginAlone) {
  decodeTo(R"({"origin":"a b","nonce":"c d"})");
  EXPECT_EQ(GetSSORelayURL(true, "state", "e f"), "ssoclient/relay.html#origin=a%20b&success=true");
  ASSERT_EQ(platformSpy().urlEncode.size(), 1u);
  EXPECT_EQ(platformSpy().urlEncode[0].input, "a b");
}

TEST(RelayPlatform, CarriesTheOriginAsItIsWhenItCannotBeEncoded) {
  decodeTo(R"({"origin":"a b"})");
  platformSpy().onURLEncode = [](const std::string&, char*, std::size_t) { return 1; };
  EXPECT_EQ(GetSSORelayURL(true, "state", ""), "ssoclient/relay.html#origin=a b&success=true");
}

}  // namespace
