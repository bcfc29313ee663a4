// The URL encoder: which bytes it escapes is its own choice, as long as the result is safe.
#include <cstring>

#include "contract.h"
#include "guarded.h"
#include "habits.h"
#include "trial.h"

namespace port {

namespace {

constexpr size_t kSlack = 64;
constexpr size_t kLong = 100000;

// What has no meaning in a query, a fragment or a form body (RFC 3986, section 3.4; "&", "=", ";"
// and "+" separate the values of a form).
bool IsSafe(char c) {
  static const std::string kSafe =
      "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-._~!$'()*,:@/?";
  return kSafe.find(c) != std::string::npos;
}

int HexDigit(char c) {
  static const std::string kDigits = "0123456789abcdefABCDEF";
  const size_t at = kDigits.find(c);
  if (at == std::string::npos) return -1;
  return static_cast<int>(at < 16 ? at : at - 6);
}

// What a provider reads: form decoding. Ends the check for what is unsafe.
std::string Read(const std::string& encoded) {
  std::string text;
  for (size_t i = 0; i < encoded.size(); ++i) {
    const char c = encoded[i];
    if (c == '%') {
      const int high = i + 2 < encoded.size() ? HexDigit(encoded[i + 1]) : -1;
      const int low = high < 0 ? -1 : HexDigit(encoded[i + 2]);
      Expect(low >= 0, "gave " + Shown(encoded) + ", which has a broken escape");
      text += static_cast<char>(high * 16 + low);
      i += 2;
    } else {
      Expect(c == '+' || IsSafe(c), "left " + Shown(std::string(1, c)) + " as it is");
      text += c == '+' ? ' ' : c;
    }
  }
  return text;
}

struct URLEncoder {
  explicit URLEncoder(const Platform& p)
      : platform(p), in("the text", 1 << 18), out("the result", 1 << 19) {}

  Result operator()(const std::string& text, size_t capacity, size_t slack,
                    size_t slack_in = kSlack) {
    About("encoding " + Shown(text) + " with a capacity of " + std::to_string(capacity));
    const char* from = in.Copy(text + '\0', slack_in);
    char* encoded = out.Room(capacity + 1, slack);
    const bool ok = platform.url_encode(from, encoded, capacity) == 0;
    out.CheckFront();
    if (!ok) return {false, ""};
    const size_t end = strnlen(encoded, capacity + 1 + slack);
    Expect(end < capacity + 1 + slack, "wrote no terminating zero");
    return {true, std::string(encoded, end)};
  }

  const Platform& platform;
  Guarded in, out;
};

// `text` must encode, and read back as it was.
std::string Encoded(URLEncoder& encode, const std::string& text, size_t slack = kSlack) {
  const Result result = encode(text, 3 * text.size(), slack);
  Expect(result.ok, "reported a failure");
  const std::string read = Read(result.bytes);
  Expect(read == text, "gave " + Shown(result.bytes) + ", which reads as " + Shown(read));
  return result.bytes;
}

std::string AllBytes() {
  std::string all;
  for (int value = 1; value < 256; ++value) all += static_cast<char>(value);
  return all;
}

void EncodesEveryByte(const Platform& platform, const Options&) {
  URLEncoder encode(platform);
  for (const char c : AllBytes()) Encoded(encode, std::string(1, c));
}

void EncodesTexts(const Platform& platform, const Options&) {
  URLEncoder encode(platform);
  Encoded(encode, AllBytes());
  for (const char* text :
       {"a b+c", "%", "%41", "%zz", "&a=b#c", "https://device.example.net/?a=1;b",
        "{\"origin\": \"/\"}\n", "M\xc3\xbcnchen"}) {
    Encoded(encode, text);
  }
}

void EncodesNothing(const Platform& platform, const Options&) {
  URLEncoder encode(platform);
  for (const size_t capacity : {size_t{30}, size_t{0}}) {
    const Result result = encode("", capacity, kSlack);
    Expect(result.ok, "reported a failure");
    Expect(result.bytes.empty(), "gave " + Shown(result.bytes));
  }
}

void EndsTheText(const Platform& platform, const Options&) {
  URLEncoder encode(platform);
  for (size_t length = 1; length <= 100; ++length) {
    const Result result = encode(std::string(length, 'a'), 3 * length, kSlack);
    if (result.ok) Expect(Read(result.bytes).size() == length, "the zero is not behind the text");
  }
}

// The zero's own room makes the last character fit.
void EncodeCapacity(const Platform& platform, const Options&) {
  URLEncoder encode(platform);
  const std::string all = AllBytes();
  for (size_t length = 1; length <= 12; ++length) {
    for (const std::string& text : {std::string(length, 'a'), std::string(length, '\xff'),
                                    std::string("a b&c=d/e+f%g").substr(0, length)}) {
      const std::string whole = Encoded(encode, text);
      for (size_t capacity = 0; capacity <= whole.size() + 4; ++capacity) {
        const Result result = encode(text, capacity, 0);
        Expect(result.ok == (capacity >= whole.size()),
               result.ok ? "reported success, it must fail" : "reported a failure, it fits");
        if (result.ok) Expect(result.bytes == whole, "gave " + Shown(result.bytes));
      }
    }
  }
}

void EncodeLong(const Platform& platform, const Options&) {
  URLEncoder encode(platform);
  for (const size_t length : {size_t{341}, size_t{1024}, size_t{65536}, kLong}) {
    for (const char c : {'a', '\xff', ' '}) Encoded(encode, std::string(length, c), 0);
  }
}

void EncodeSource(const Platform& platform, const Options&) {
  URLEncoder encode(platform);
  for (size_t length = 0; length <= 300; ++length) {
    const std::string text(length, length % 2 == 0 ? 'a' : '\xff');
    encode(text, 3 * length, kSlack, 0);
  }
}

Result EncodeCall(const Platform& platform, const Options&, Arguments& memory, unsigned which) {
  static const std::string texts[kCalls] = {
      "alice", "a b&c=d", "",       "https://device.example.net/", std::string(300, '\xff'),
      "bobby", "\xff",    "a b&c=e"};
  const std::string& text = texts[which];
  About("encoding " + Shown(text));
  const size_t capacity = which == 7 ? 2 : 3 * text.size();  // one that fails
  const char* from = memory.in.Copy(text + '\0', kSlack);
  char* encoded = memory.out.Room(capacity + 1, kSlack);
  const bool ok = platform.url_encode(from, encoded, capacity) == 0;
  return {ok, ok ? std::string(encoded, strnlen(encoded, capacity + 1)) : ""};
}

}  // namespace

Function URLLines() {
  Function function = {
      "QOVACGIURLEncode",
      {{"url-bytes", "every byte is safe in a URL's query and in a form, and reads back",
        EncodesEveryByte},
       {"url-texts", "texts with escapes and line feeds are safe and read back", EncodesTexts},
       {"url-nothing", "encoding nothing succeeds, with a capacity of 0 too", EncodesNothing},
       {"url-zero", "writes a terminating zero behind the text", EndsTheText},
       {"url-capacity", "what does not fit fails; the capacity does not count the zero",
        EncodeCapacity},
       {"url-long", "three times the length is enough, for 100,000 bytes too", EncodeLong},
       {"url-source", "reads up to the text's zero alone, and does not change it", EncodeSource}}};
  AddHabits<EncodeCall>({"url-repeat", "url-pointers", "url-process", "url-memory"},
                        function.lines);
  return function;
}

}  // namespace port
