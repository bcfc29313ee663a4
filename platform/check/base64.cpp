// The two base64 functions: RFC 4648, section 4.
#include <algorithm>
#include <cstring>
#include <string_view>

#include "contract.h"
#include "guarded.h"
#include "habits.h"
#include "trial.h"

namespace port {

namespace {

constexpr size_t kSlack = 64;     // behind a room whose end is another line's matter
constexpr size_t kBuffer = 1024;  // the library's own
constexpr size_t kLong = 100000;  // no limit is put on what a browser sends

constexpr std::string_view kAlphabet =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

// Bit by bit, unlike any usual encoder: it is compared with them.
std::string Base64(const std::string& bytes) {
  std::string text;
  for (size_t bit = 0; bit < bytes.size() * 8; bit += 6) {
    size_t value = 0;
    for (size_t i = bit; i < bit + 6; ++i) {
      const size_t byte = i / 8 < bytes.size() ? static_cast<unsigned char>(bytes[i / 8]) : 0;
      value = value * 2 + (byte >> (7 - i % 8)) % 2;
    }
    text += kAlphabet[value];
  }
  return text.append((4 - text.size() % 4) % 4, '=');
}

// The same bytes in every run.
std::string Bytes(size_t length) {
  std::string bytes;
  unsigned state = static_cast<unsigned>(length) + 1;
  while (bytes.size() < length) {
    state = state * 1103515245 + 12345;
    bytes += static_cast<char>(state >> 16);
  }
  return bytes;
}

std::string Name(const char* function, const std::string& input, size_t capacity) {
  return std::string(function) + " of " + Shown(input) + " into " + std::to_string(capacity) +
         " bytes";
}

// Compares a result with what it must be.
void Compare(const Result& result, bool ok, const std::string& bytes) {
  Expect(result.ok == ok, ok ? "reported a failure" : "reported success, it must fail");
  if (ok) Expect(result.bytes == bytes, "gave " + Shown(result.bytes) + ", not " + Shown(bytes));
}

// -- the encoder

struct Encoder {
  explicit Encoder(const Platform& p, size_t most = 1 << 18)
      : platform(p), in("the source", most), out("the text", most) {}

  // With a finding unless a text that is claimed has its zero. Both ends are sharp without slack.
  Result operator()(const std::string& source, size_t capacity, size_t slack) {
    About(Name("base64 text", source, capacity));
    const char* from = in.Copy(source, kSlack);
    return Run(from, source.size(), capacity, slack);
  }

  Result Run(const char* from, size_t length, size_t capacity, size_t slack) {
    char* text = out.Room(capacity, slack);
    const bool ok = platform.base64_encode(from, length, text, capacity, 1) != 0;
    out.CheckFront();
    if (!ok) return {false, ""};
    const size_t end = strnlen(text, capacity + slack);
    Expect(end < capacity + slack, "wrote no terminating zero");
    return {true, std::string(text, end)};
  }

  const Platform& platform;
  Guarded in, out;
};

void EncodesBytes(const Platform& platform, const Options&) {
  Encoder encode(platform);
  for (const char* text : {"f", "fo", "foo", "foob", "fooba", "foobar"}) {
    Compare(encode(text, 64, kSlack), true, Base64(text));
  }
  for (int first = 0; first < 256; ++first) {
    for (int second = -1; second < 256; ++second) {
      std::string source(1, static_cast<char>(first));
      if (second >= 0) source += static_cast<char>(second);
      Compare(encode(source, 64, kSlack), true, Base64(source));
    }
  }
}

void EncodesLengths(const Platform& platform, const Options&) {
  Encoder encode(platform);
  for (size_t length = 3; length <= 765; ++length) {
    const std::string source = Bytes(length);
    Compare(encode(source, 2 * kBuffer, kSlack), true, Base64(source));
  }
}

void EncodesNothing(const Platform& platform, const Options&) {
  Encoder encode(platform);
  for (const size_t capacity : {kBuffer, size_t{64}, size_t{1}}) {
    Compare(encode("", capacity, kSlack), true, "");
  }
}

void EndsTheText(const Platform& platform, const Options&) {
  Encoder encode(platform);
  for (size_t length = 0; length <= 300; ++length) {
    const std::string text = Base64(Bytes(length));
    const Result result = encode(Bytes(length), text.size() + 100, kSlack);
    if (result.ok) Expect(result.bytes.size() == text.size(), "the zero is not behind the text");
  }
}

void EncodeCapacity(const Platform& platform, const Options&) {
  Encoder encode(platform);
  for (size_t length = 0; length <= 24; ++length) {
    const std::string source = Bytes(length), text = Base64(source);
    for (size_t capacity = 0; capacity <= text.size() + 6; ++capacity) {
      Compare(encode(source, capacity, 0), capacity > text.size(), text);
    }
  }
}

void EncodeEdge(const Platform& platform, const Options&) {
  Encoder encode(platform);
  for (size_t length = 750; length <= 780; ++length) {
    const std::string source = Bytes(length);
    Compare(encode(source, kBuffer, 0), length <= 765, Base64(source));
  }
}

void EncodeLong(const Platform& platform, const Options&) {
  Encoder encode(platform);
  for (const size_t length : {size_t{1023}, size_t{1024}, size_t{4096}, size_t{65536}, kLong}) {
    Compare(encode(Bytes(length), kBuffer, 0), false, "");
  }
}

void EncodeSource(const Platform& platform, const Options&) {
  Encoder encode(platform);
  for (size_t length = 1; length <= 300; ++length) {
    const std::string source = Bytes(length);
    About(Name("base64 text", source, 2 * kBuffer));
    const char* from = encode.in.Copy(source, 0);
    Compare(encode.Run(from, length, 2 * kBuffer, kSlack), true, Base64(source));
  }
}

Result EncodeCall(const Platform& platform, const Options&, Arguments& memory, unsigned which) {
  static const std::string sources[kCalls] = {Bytes(12),  Bytes(765),     "",     Bytes(13),
                                              Bytes(900), "foobarfoobar", "\xff", "foobarfooba?"};
  const std::string& source = sources[which];
  About(Name("base64 text", source, kBuffer));
  const char* from = memory.in.Copy(source, kSlack);
  char* text = memory.out.Room(kBuffer, kSlack);
  const bool ok = platform.base64_encode(from, source.size(), text, kBuffer, 1) != 0;
  return {ok, ok ? std::string(text, strnlen(text, kBuffer)) : ""};
}

// -- the decoder

struct Decoder {
  explicit Decoder(const Platform& p, size_t most = 1 << 18)
      : platform(p), in("the text", most), out("the bytes", most) {}

  Result operator()(const std::string& text, size_t capacity, size_t slack) {
    About(Name("base64 bytes", text, capacity));
    return Run(in.Copy(text, kSlack), text.size(), capacity, slack);
  }

  Result Run(const char* from, size_t length, size_t capacity, size_t slack) {
    bytes = out.Room(capacity, slack);
    size_t size = capacity;
    const bool ok = platform.base64_decode(from, length, bytes, &size) != 0;
    out.CheckFront();
    if (!ok) return {false, ""};
    Expect(size <= capacity + slack, "gave " + std::to_string(size) + " as the number of bytes");
    return {true, std::string(bytes, size)};
  }

  const Platform& platform;
  Guarded in, out;
  char* bytes = nullptr;
};

void DecodesBytes(const Platform& platform, const Options&) {
  Decoder decode(platform);
  for (const char* text : {"f", "fo", "foo", "foob", "fooba", "foobar"}) {
    Compare(decode(Base64(text), 64, kSlack), true, text);
  }
  for (int first = 0; first < 256; ++first) {
    for (int second = -1; second < 256; ++second) {
      std::string bytes(1, static_cast<char>(first));
      if (second >= 0) bytes += static_cast<char>(second);
      Compare(decode(Base64(bytes), 64, kSlack), true, bytes);
    }
  }
}

void DecodesLengths(const Platform& platform, const Options&) {
  Decoder decode(platform);
  for (size_t length = 3; length <= 1000; ++length) {
    const std::string bytes = Bytes(length);
    Compare(decode(Base64(bytes), kBuffer, kSlack), true, bytes);
  }
}

void DecodesNothing(const Platform& platform, const Options&) {
  Decoder decode(platform);
  for (const size_t capacity : {size_t{0}, size_t{64}, kBuffer}) {
    Compare(decode("", capacity, kSlack), true, "");
  }
}

void DecodeCapacity(const Platform& platform, const Options&) {
  Decoder decode(platform);
  for (size_t length = 0; length <= 24; ++length) {
    const std::string bytes = Bytes(length);
    for (size_t capacity = 0; capacity <= length + 6; ++capacity) {
      Compare(decode(Base64(bytes), capacity, 0), capacity >= length, bytes);
    }
  }
}

void DecodeEdge(const Platform& platform, const Options&) {
  Decoder decode(platform);
  for (size_t length = 1010; length <= 1040; ++length) {
    const std::string bytes = Bytes(length);
    Compare(decode(Base64(bytes), kBuffer, 0), length <= kBuffer, bytes);
  }
}

void DecodeLong(const Platform& platform, const Options&) {
  Decoder decode(platform);
  for (const size_t length : {size_t{2000}, size_t{65536}, kLong}) {
    Compare(decode(Base64(Bytes(length)), kBuffer, 0), false, "");
    Compare(decode(std::string(length, '='), kBuffer, 0), false, "");
    Compare(decode(Bytes(length), kBuffer, 0), false, "");
  }
}

void DecodeBehind(const Platform& platform, const Options&) {
  Decoder decode(platform);
  for (size_t length = 0; length <= 300; ++length) {
    const Result result = decode(Base64(Bytes(length)), kBuffer, kSlack);
    for (size_t i = length; result.ok && i < kBuffer; ++i) {
      Expect(decode.bytes[i] == kUntouched,
             "wrote byte " + std::to_string(i - length + 1) + " behind the decoded ones");
    }
  }
}

void DecodeAlphabet(const Platform& platform, const Options&) {
  Decoder decode(platform);
  for (size_t at = 0; at < 8; ++at) {
    for (int value = 0; value < 256; ++value) {
      std::string text = "Zm9vYmFy";
      text[at] = static_cast<char>(value);
      const bool padding = value == '=' && at == 7;
      if (padding || kAlphabet.find(text[at]) != std::string_view::npos) continue;
      Compare(decode(text, kBuffer, kSlack), false, "");
    }
  }
  for (const char* text : {"Zm9v\n", "Zm9v\r\n", "\nZm9v", " Zm9v", "Zm9v ", "Zm9v\nYmFy"}) {
    Compare(decode(text, kBuffer, kSlack), false, "");
  }
}

// Two to four letters and nothing but padding up to four.
bool IsGroup(const std::string& text) {
  const size_t letters = std::min(text.find('='), text.size());
  return text.size() == 4 && letters >= 2 &&
         text.find_first_not_of('=', letters) == std::string::npos;
}

void DecodePadding(const Platform& platform, const Options&) {
  Decoder decode(platform);
  std::vector<std::string> texts = {""};
  for (size_t i = 0; i < texts.size() && texts[i].size() < 8; ++i) {
    for (const char c : {'A', '='}) texts.push_back(texts[i] + c);
  }
  for (const std::string& text : texts) {
    if (text.empty()) continue;
    const bool whole = text.size() == 8 && text.find('=') >= 4 && IsGroup(text.substr(4));
    const bool valid = IsGroup(text) || whole;
    const size_t zeros =
        text.size() / 4 * 3 - static_cast<size_t>(std::count(text.begin(), text.end(), '='));
    Compare(decode(text, kBuffer, kSlack), valid, valid ? std::string(zeros, '\0') : "");
  }
}

void DecodeSource(const Platform& platform, const Options&) {
  Decoder decode(platform);
  for (size_t length = 1; length <= 300; ++length) {
    const std::string bytes = Bytes(length), text = Base64(bytes);
    About(Name("base64 bytes", text, kBuffer));
    const char* from = decode.in.Copy(text, 0);
    Compare(decode.Run(from, text.size(), kBuffer, kSlack), true, bytes);
  }
}

Result DecodeCall(const Platform& platform, const Options&, Arguments& memory, unsigned which) {
  static const std::string texts[kCalls] = {
      Base64(Bytes(12)),   Base64(Bytes(1000)), "",     "Zm9",
      Base64(Bytes(1100)), "Zm9vYmFyZm9vYmFy",  "/w==", "Zm9vYmFyZm9vYmE="};
  const std::string& text = texts[which];
  About(Name("base64 bytes", text, kBuffer));
  const char* from = memory.in.Copy(text, kSlack);
  char* bytes = memory.out.Room(kBuffer, kSlack);
  size_t size = kBuffer;
  const bool ok = platform.base64_decode(from, text.size(), bytes, &size) != 0;
  return {ok, ok ? std::string(bytes, std::min(size, kBuffer)) : ""};
}

}  // namespace

Function EncodeLines() {
  Function function = {
      "QOVABase64Encode",
      {{"encode-bytes", "gives the standard base64 text of every byte", EncodesBytes},
       {"encode-lengths", "gives the text of every length, without line breaks", EncodesLengths},
       {"encode-nothing", "encoding nothing succeeds with an empty text", EncodesNothing},
       {"encode-zero", "writes a terminating zero behind the text", EndsTheText},
       {"encode-capacity", "a text that does not fit with its zero fails, any other succeeds",
        EncodeCapacity},
       {"encode-765", "765 bytes fit into the library's 1,024, 766 do not", EncodeEdge},
       {"encode-long", "100,000 bytes fail", EncodeLong},
       {"encode-source", "reads the given bytes alone, and does not change them", EncodeSource}}};
  AddHabits<EncodeCall>({"encode-repeat", "encode-pointers", "encode-process", "encode-memory"},
                        function.lines);
  return function;
}

Function DecodeLines() {
  Function function = {
      "QOVABase64Decode",
      {{"decode-bytes", "gives every byte back, and their number", DecodesBytes},
       {"decode-lengths", "gives back texts of every length", DecodesLengths},
       {"decode-nothing", "decoding nothing succeeds with no bytes", DecodesNothing},
       {"decode-capacity", "bytes that do not fit fail, any other succeed", DecodeCapacity},
       {"decode-1024", "1,024 bytes fit into the library's 1,024, 1,025 do not", DecodeEdge},
       {"decode-long", "100,000 characters fail", DecodeLong},
       {"decode-behind", "writes nothing behind the decoded bytes, not even a zero", DecodeBehind},
       {"decode-alphabet", "a character outside the alphabet fails", DecodeAlphabet},
       {"decode-padding", "missing or misplaced padding fails", DecodePadding},
       {"decode-source", "reads the given characters alone, and does not change them",
        DecodeSource}}};
  AddHabits<DecodeCall>({"decode-repeat", "decode-pointers", "decode-process", "decode-memory"},
                        function.lines);
  return function;
}

}  // namespace port
