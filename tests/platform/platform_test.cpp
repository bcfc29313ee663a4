// The contract of platform/platform.h, kept by the reference implementation.
#include "platform/platform.h"

#include <gtest/gtest.h>
#include <openssl/evp.h>

#include <array>
#include <cstring>
#include <string>
#include <vector>

namespace {

// What is written behind a capacity shows up here.
constexpr char kUntouched = '\x5a';

struct Encoded {
  bool ok;
  std::string text;
};

// The text of `source`, encoded into a buffer of `capacity`; writing behind it fails the test.
Encoded encode(const std::string& source, size_t capacity) {
  std::vector<char> buffer(capacity + 8, kUntouched);
  const int result = QOVABase64Encode(source.data(), source.size(), buffer.data(), capacity, 1);
  for (size_t i = capacity; i < buffer.size(); ++i) EXPECT_EQ(buffer[i], kUntouched) << capacity;
  return {result != 0, result != 0 ? buffer.data() : ""};
}

Encoded encode(const std::string& source) {
  return encode(source, source.size() * 2 + 8);
}

struct Decoded {
  bool ok;
  std::string bytes;
};

Decoded decode(const std::string& text, size_t capacity) {
  std::vector<char> buffer(capacity + 8, kUntouched);
  size_t size = capacity;
  const bool ok = QOVABase64Decode(text.data(), text.size(), buffer.data(), &size) != 0;
  for (size_t i = ok ? size : capacity; i < buffer.size(); ++i)
    EXPECT_EQ(buffer[i], kUntouched) << text;
  return {ok, ok ? std::string(buffer.data(), size) : ""};
}

Decoded decode(const std::string& text) {
  return decode(text, text.size() + 8);
}

// RFC 4648, section 10.
const std::array<std::array<const char*, 2>, 7> kRfc4648 = {{{"", ""},
                                                             {"f", "Zg=="},
                                                             {"fo", "Zm8="},
                                                             {"foo", "Zm9v"},
                                                             {"foob", "Zm9vYg=="},
                                                             {"fooba", "Zm9vYmE="},
                                                             {"foobar", "Zm9vYmFy"}}};

std::string opensslEncode(const std::string& source) {
  std::vector<unsigned char> text(source.size() * 2 + 8);
  const int length =
      EVP_EncodeBlock(text.data(), reinterpret_cast<const unsigned char*>(source.data()),
                      static_cast<int>(source.size()));
  return {text.begin(), text.begin() + length};
}

TEST(PlatformBase64Encode, GivesTheVectorsOfTheStandard) {
  for (const auto& [bytes, text] : kRfc4648) {
    const Encoded encoded = encode(bytes);
    EXPECT_TRUE(encoded.ok) << bytes;
    EXPECT_EQ(encoded.text, text);
  }
}

TEST(PlatformBase64Encode, AgreesWithOpenSSLOnAllInputsOfOneAndTwoBytes) {
  for (int first = 0; first < 256; ++first) {
    const std::string one(1, static_cast<char>(first));
    ASSERT_EQ(encode(one).text, opensslEncode(one)) << first;
    for (int second = 0; second < 256; ++second) {
      const std::string two = one + static_cast<char>(second);
      ASSERT_EQ(encode(two).text, opensslEncode(two)) << first << ' ' << second;
    }
  }
}

TEST(PlatformBase64Encode, WritesEveryLetterOfTheAlphabetAtEveryPlaceOfAGroup) {
  for (unsigned place = 0; place < 4; ++place) {
    for (unsigned bits = 0; bits < 64; ++bits) {
      const unsigned group = bits << (18 - 6 * place);
      const std::string three = {static_cast<char>(group >> 16), static_cast<char>(group >> 8),
                                 static_cast<char>(group)};
      ASSERT_EQ(encode(three).text, opensslEncode(three)) << place << ' ' << bits;
    }
  }
}

TEST(PlatformBase64Encode, WritesNoLineBreaks) {
  const std::string text = encode(std::string(600, 'x')).text;
  EXPECT_EQ(text.size(), 800u);
  EXPECT_EQ(text.find_first_of("\r\n"), std::string::npos);
}

TEST(PlatformBase64Encode, NeedsRoomForTheTextAndItsZero) {
  for (size_t length = 0; length <= 12; ++length) {
    const size_t needed = (length + 2) / 3 * 4 + 1;
    for (size_t capacity = 0; capacity <= needed + 4; ++capacity)
      EXPECT_EQ(encode(std::string(length, 'x'), capacity).ok, capacity >= needed)
          << length << " bytes into " << capacity;
  }
}

TEST(PlatformBase64Encode, Fits765BytesInto1024) {
  const Encoded encoded = encode(std::string(765, 'x'), 1024);
  EXPECT_TRUE(encoded.ok);
  EXPECT_EQ(encoded.text.size(), 1020u);
}

TEST(PlatformBase64Encode, DoesNotFit766BytesInto1024) {
  EXPECT_FALSE(encode(std::string(766, 'x'), 1024).ok);
}

TEST(PlatformBase64Encode, DoesNotDependOnTheOption) {
  for (int option : {0, 1, -1}) {
    char text[8];
    EXPECT_NE(QOVABase64Encode("foo", 3, text, sizeof(text), option), 0);
    EXPECT_STREQ(text, "Zm9v");
  }
}

TEST(PlatformBase64Decode, ReadsTheVectorsOfTheStandard) {
  for (const auto& [bytes, text] : kRfc4648) {
    const Decoded decoded = decode(text);
    EXPECT_TRUE(decoded.ok) << text;
    EXPECT_EQ(decoded.bytes, bytes);
  }
}

TEST(PlatformBase64Decode, ReadsBackAllInputsOfOneAndTwoBytes) {
  for (int first = 0; first < 256; ++first) {
    const std::string one(1, static_cast<char>(first));
    ASSERT_EQ(decode(opensslEncode(one)).bytes, one) << first;
    for (int second = 0; second < 256; ++second) {
      const std::string two = one + static_cast<char>(second);
      ASSERT_EQ(decode(opensslEncode(two)).bytes, two) << first << ' ' << second;
    }
  }
}

TEST(PlatformBase64Decode, NeedsRoomForTheBytesAlone) {
  for (size_t length = 0; length <= 12; ++length) {
    const std::string bytes(length, 'x');
    const std::string text = opensslEncode(bytes);
    for (size_t capacity = 0; capacity <= length + 4; ++capacity) {
      const Decoded decoded = decode(text, capacity);
      EXPECT_EQ(decoded.ok, capacity >= length) << length << " bytes into " << capacity;
      if (decoded.ok) {
        EXPECT_EQ(decoded.bytes, bytes);
      }
    }
  }
}

TEST(PlatformBase64Decode, FitsExactly1024BytesInto1024) {
  EXPECT_TRUE(decode(opensslEncode(std::string(1024, 'x')), 1024).ok);
  EXPECT_FALSE(decode(opensslEncode(std::string(1025, 'x')), 1024).ok);
}

bool inAlphabet(char c) {
  return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '+' ||
         c == '/';
}

// RFC 4648, section 3.3: characters outside the alphabet are refused.
TEST(PlatformBase64Decode, RefusesEveryCharacterOutsideTheAlphabetAtEveryPlace) {
  for (size_t at = 0; at < 8; ++at) {
    for (int value = 0; value < 256; ++value) {
      std::string text = "Zm9vYmFy";
      text[at] = static_cast<char>(value);
      const bool padding = text[at] == '=' && at == 7;
      EXPECT_EQ(decode(text).ok, inAlphabet(text[at]) || padding) << at << ' ' << value;
    }
  }
}

// Four characters stand for 3, 2 or 1 bytes, as the padding says; other forms are refused.
size_t bytesOfGroup(const std::string& group) {
  size_t letters = 0;
  while (letters < 4 && inAlphabet(group[letters])) ++letters;
  const bool ok = letters >= 2 && group.find_first_not_of('=', letters) == std::string::npos;
  return ok ? letters - 1 : 0;
}

TEST(PlatformBase64Decode, AcceptsPaddingAtTheEndAloneOverAllShortTexts) {
  const std::string letters = "Ag/=-\n";
  std::vector<std::string> texts = {""};
  for (size_t i = 0; i < texts.size() && texts[i].size() < 5; ++i) {
    for (char c : letters) texts.push_back(texts[i] + c);
  }
  for (const std::string& text : texts) {
    const bool valid = text.empty() || (text.size() == 4 && bytesOfGroup(text) > 0);
    const Decoded decoded = decode(text);
    ASSERT_EQ(decoded.ok, valid) << testing::PrintToString(text);
    if (text.size() == 4) {
      ASSERT_EQ(decoded.bytes.size(), bytesOfGroup(text)) << text;
    }
  }
}

TEST(PlatformBase64Decode, RefusesPaddingInTheMiddle) {
  for (const char* text : {"Zg==Zg==", "Zm8=Zm9v", "====", "A===", "=AAA"})
    EXPECT_FALSE(decode(text).ok) << text;
}

struct URLEncoded {
  int result;
  std::string text;
};

// Encodes into a buffer that has room for `capacity` characters and a zero.
URLEncoded urlEncode(const std::string& text, size_t capacity) {
  std::vector<char> buffer(capacity + 1 + 8, kUntouched);
  const int result = QOVACGIURLEncode(text.c_str(), buffer.data(), capacity);
  for (size_t i = capacity + 1; i < buffer.size(); ++i) EXPECT_EQ(buffer[i], kUntouched) << text;
  return {result, result == 0 ? buffer.data() : ""};
}

// RFC 3986, section 2.3 for what stays, section 2.1 for the escapes (upper case).
TEST(PlatformURLEncode, EscapesEveryByteOutsideTheUnreservedSet) {
  const std::string unreserved =
      "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-._~";
  for (int value = 1; value < 256; ++value) {
    const std::string text(1, static_cast<char>(value));
    char escaped[8];
    std::snprintf(escaped, sizeof(escaped), "%%%02X", static_cast<unsigned>(value));
    const bool stays = unreserved.find(text) != std::string::npos;
    const URLEncoded encoded = urlEncode(text, 3);
    EXPECT_EQ(encoded.result, 0) << value;
    EXPECT_EQ(encoded.text, stays ? text : escaped);
  }
}

TEST(PlatformURLEncode, WritesASpaceAsItsEscapeAndNeverAsAPlus) {
  EXPECT_EQ(urlEncode("a b+c", 15).text, "a%20b%2Bc");
}

TEST(PlatformURLEncode, FitsAllEscapesIntoThreeTimesTheLength) {
  for (size_t length = 1; length <= 20; ++length) {
    const std::string text(length, '\xff');
    EXPECT_EQ(urlEncode(text, 3 * length).text.size(), 3 * length);
    for (size_t capacity = 0; capacity < 3 * length; ++capacity)
      EXPECT_NE(urlEncode(text, capacity).result, 0) << length << " into " << capacity;
  }
}

TEST(PlatformURLEncode, CountsPlainCharactersOnce) {
  EXPECT_EQ(urlEncode("abc", 3).text, "abc");
  EXPECT_NE(urlEncode("abc", 2).result, 0);
}

TEST(PlatformURLEncode, EncodesNothingIntoNothing) {
  const URLEncoded encoded = urlEncode("", 0);
  EXPECT_EQ(encoded.result, 0);
  EXPECT_EQ(encoded.text, "");
}

struct Converted {
  bool ok;
  std::string name;
};

Converted convert(const std::string& name, size_t size) {
  std::vector<char> buffer(size + 8, kUntouched);
  const int result = QOVAWinsUserNameFqdn2Netbios(name.c_str(), buffer.data(), size);
  for (size_t i = size; i < buffer.size(); ++i) EXPECT_EQ(buffer[i], kUntouched) << name;
  return {result >= 0, result >= 0 ? buffer.data() : ""};
}

TEST(PlatformUserName, IsPassedThroughAsItIs) {
  for (const char* name : {"", "\\", "CORP.EXAMPLE.COM\\alice", "\\bob", "M\xc3\x9cNCHEN.DE\\J"}) {
    EXPECT_TRUE(convert(name, 1023).ok) << name;
    EXPECT_EQ(convert(name, 1023).name, name);
  }
}

TEST(PlatformUserName, NeedsRoomForTheNameAndItsZero) {
  for (size_t length = 0; length <= 8; ++length) {
    for (size_t size = 0; size <= length + 4; ++size)
      EXPECT_EQ(convert(std::string(length, 'n'), size).ok, size > length) << length << ' ' << size;
  }
}

TEST(PlatformUserName, OfUpTo1022BytesFitsInto1023) {
  EXPECT_EQ(convert(std::string(1022, 'n'), 1023).name, std::string(1022, 'n'));
  EXPECT_FALSE(convert(std::string(1023, 'n'), 1023).ok);
}

}  // namespace
