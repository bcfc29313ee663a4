// The conversion of a user's name. What it makes of a name is the device's own matter; checked is
// that nothing is cut, that two people stay two, and that a name is never more than data.
#include <unistd.h>

#include <cstring>

#include "contract.h"
#include "guarded.h"
#include "habits.h"
#include "trial.h"

namespace port {

namespace {

constexpr size_t kSlack = 64;
constexpr size_t kBuffer = 1023;  // what the library offers
constexpr size_t kWide = 8192;    // room for everything but the longest
constexpr size_t kLong = 100000;

struct Converter {
  explicit Converter(const Platform& p)
      : platform(p), in("the name", 1 << 18), out("the result", 1 << 18) {}

  Result operator()(const std::string& name, size_t size, size_t slack, size_t slack_in = kSlack) {
    About("converting " + Shown(name) + " into " + std::to_string(size) + " bytes");
    const char* from = in.Copy(name + '\0', slack_in);
    char* result = out.Room(size, slack);
    const bool ok = platform.convert_name(from, result, size) >= 0;
    out.CheckFront();
    if (!ok) return {false, ""};
    const size_t end = strnlen(result, size);
    Expect(end < size, "reported success, but wrote no text that ends within them");
    return {true, std::string(result, end)};
  }

  const Platform& platform;
  Guarded in, out;
};

// The domain of the known user with its backslash, and the account.
std::string Domain(const Options& options) {
  return options.name.substr(0, options.name.find('\\') + 1);
}
std::string Account(const Options& options) {
  return options.name.substr(options.name.find('\\') + 1);
}

// The result of the known name; the line is not judged where the directory does not know it.
std::string Known(Converter& convert, const Options& options) {
  const Result result = convert(options.name, kBuffer, kSlack);
  if (!result.ok) {
    NotJudged("the conversion of " + options.name +
              " fails; pass --name DNS-DOMAIN\\account with a user that the directory knows");
  }
  return result.bytes;
}

// Two people must not become one.
void ExpectTwo(Converter& convert, const std::string& one, const std::string& other,
               size_t size = kBuffer) {
  const Result first = convert(one, size, kSlack), second = convert(other, size, kSlack);
  Expect(!first.ok || !second.ok || first.bytes != second.bytes,
         "gives " + Shown(first.bytes) + ", and so does " + Shown(one));
}

void Converts(const Platform& platform, const Options& options) {
  Converter convert(platform);
  const std::string result = Known(convert, options);
  Expect(!result.empty(), "gave an empty name");
  if (!options.result.empty()) {
    Expect(result == options.result, "gave " + Shown(result) + ", not " + Shown(options.result));
  }
}

void NeverCuts(const Platform& platform, const Options& options) {
  Converter convert(platform);
  const std::string whole = Known(convert, options);
  for (size_t size = 0; size <= whole.size() + 16; ++size) {
    const Result result = convert(options.name, size, 0);
    Expect(result.ok == (size > whole.size()),
           result.ok ? "reported success with " + Shown(result.bytes) + ", it must fail"
                     : "reported a failure, " + Shown(whole) + " fits");
    if (result.ok) Expect(result.bytes == whole, "gave " + Shown(result.bytes));
  }
}

void FillsTheBuffer(const Platform& platform, const Options& options) {
  Converter convert(platform);
  Known(convert, options);
  for (size_t length = 900; length <= 1100; ++length) {
    const std::string name = Domain(options) + std::string(length, 'x');
    const Result whole = convert(name, kWide, kSlack), offered = convert(name, kBuffer, 0);
    if (!whole.ok) continue;
    const bool fits = whole.bytes.size() < kBuffer;
    Expect(offered.ok == fits,
           fits ? "reported a failure, it fits" : "reported success, it must fail");
    if (fits) Expect(offered.bytes == whole.bytes, "gave another name than with more room");
  }
}

void KeepsPeopleApart(const Platform& platform, const Options& options) {
  Converter convert(platform);
  const std::string domain = Domain(options), account = Account(options);
  Known(convert, options);
  ExpectTwo(convert, domain + account, domain + account + "x");
  ExpectTwo(convert, domain + account, "OTHER.EXAMPLE.ORG\\" + account);
  for (const unsigned length :
       {14u, 15u, 16u, 19u, 20u, 31u, 32u, 63u, 64u, 127u, 255u, 256u, 511u, 900u}) {
    const std::string common = domain + std::string(length, 'x');
    ExpectTwo(convert, common + "a", common + "b");
  }
}

// Names that a claim can lead to.
const char* const kOddNames[] = {"",
                                 "\\",
                                 "\\\\",
                                 "\\alice",
                                 "alice",
                                 "AD.EXAMPLE.NET\\",
                                 "AD.EXAMPLE.NET\\\\alice",
                                 "AD.EXAMPLE.NET\\eve\\alice",
                                 ".\\alice",
                                 "AD..NET\\alice",
                                 "AD.EXAMPLE.NET.\\alice",
                                 " \\ ",
                                 "AD\\alice",
                                 "AD.EXAMPLE.NET\\M\xc3\xbcller",
                                 "\xff\\\xff",
                                 "\t\\\n"};

void SurvivesOddNames(const Platform& platform, const Options& options) {
  Converter convert(platform);
  for (const char* name : kOddNames) {
    for (const size_t size : {kBuffer, size_t{8}, size_t{1}, size_t{0}}) convert(name, size, 0);
  }
  for (int value = 1; value < 256; ++value) {
    const std::string byte(1, static_cast<char>(value));
    convert(Domain(options) + byte, kBuffer, 0);
    convert(byte + "\\alice", kBuffer, 0);
  }
}

void SurvivesLongNames(const Platform& platform, const Options& options) {
  Converter convert(platform);
  for (const size_t length :
       {size_t{255}, size_t{256}, size_t{1023}, size_t{1024}, size_t{65536}, kLong}) {
    const std::string many(length, 'x');
    convert(many, kBuffer, 0);
    convert(many + "\\alice", kBuffer, 0);
    ExpectTwo(convert, Domain(options) + many + "a", Domain(options) + many + "b");
  }
}

// A name never is a format, a command or a pattern.
void TakesNamesAsData(const Platform& platform, const Options& options) {
  Converter convert(platform);
  const std::string domain = Domain(options);
  for (const char* account :
       {"%s%s%s%s%s%s", "%n%n%n%n", "%100000d", "a$(touch mark)", "a`touch mark`", "a;touch mark;",
        "a'; touch mark; '", "a\"; touch mark; \"", "a|touch mark", "a&touch mark&",
        "a\ntouch mark\n", "a>mark", "../../etc/passwd", "*", "--help"}) {
    convert(domain + account, kBuffer, 0);
    Expect(access("mark", F_OK) != 0, "ran a command that is in the name");
  }
  ExpectTwo(convert, domain + "a%%b", domain + "a%b");
  ExpectTwo(convert, domain + "a%20b", domain + "a b");
}

void NameSource(const Platform& platform, const Options& options) {
  Converter convert(platform);
  for (size_t length = 0; length <= 300; ++length) {
    convert(Domain(options) + std::string(length, 'x'), kBuffer, kSlack, 0);
  }
  for (const char* name : kOddNames) convert(name, kBuffer, kSlack, 0);
}

Result ConvertCall(const Platform& platform, const Options& options, Arguments& memory,
                   unsigned which) {
  const std::string last = Account(options) + "x";
  const std::string names[kCalls] = {options.name,
                                     Domain(options) + std::string(1500, 'x'),
                                     "",
                                     options.name,
                                     "OTHER.EXAMPLE.ORG\\bob",
                                     Domain(options) + last,
                                     "alice",
                                     Domain(options) + "y" + last.substr(1)};
  const std::string& name = names[which];
  About("converting " + Shown(name));
  const size_t size = which == 3 ? 3 : kBuffer;  // one that fails
  const char* from = memory.in.Copy(name + '\0', kSlack);
  char* result = memory.out.Room(size, kSlack);
  const bool ok = platform.convert_name(from, result, size) >= 0;
  return {ok, ok ? std::string(result, strnlen(result, size)) : ""};
}

}  // namespace

Function NameLines() {
  Function function = {
      "QOVAWinsUserNameFqdn2Netbios",
      {{"name-known", "converts the name of a known user", Converts},
       {"name-capacity", "a result that does not fit with its zero fails and is never cut",
        NeverCuts},
       {"name-1023", "a result fills the library's 1,023 bytes, or fails", FillsTheBuffer},
       {"name-people", "two people never get one name", KeepsPeopleApart},
       {"name-odd", "odd names fail, or give a text that ends within the size", SurvivesOddNames},
       {"name-long", "names of up to 100,000 bytes fail, or give such a text", SurvivesLongNames},
       {"name-data", "a name is data: never a format, never a command", TakesNamesAsData},
       {"name-source", "reads up to the name's zero alone, and does not change it", NameSource}}};
  AddHabits<ConvertCall>({"name-repeat", "name-pointers", "name-process", "name-memory"},
                         function.lines);
  return function;
}

}  // namespace port
