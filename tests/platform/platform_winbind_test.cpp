// The name conversion through winbind, with a winbind that says what the test wants.
#include <gtest/gtest.h>
#include <sys/types.h>

#include <cstdint>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

extern "C" {
#include <wbclient.h>
}

#include "platform/platform.h"

namespace {

constexpr char kUntouched = '\x5a';

// One domain as winbind knows it. Its texts are on the heap, so that the address check sees who
// reads them after they were given back.
struct Domain {
  Domain(const char* dnsName, const char* netbiosName)
      : dns(copyOf(dnsName)), netbios(copyOf(netbiosName)) {
    info.dns_name = dns.get();
    info.short_name = netbios.get();
  }

  static std::unique_ptr<char[]> copyOf(const char* text) {
    if (text == nullptr) return nullptr;
    auto copy = std::make_unique<char[]>(strlen(text) + 1);
    strcpy(copy.get(), text);
    return copy;
  }

  std::unique_ptr<char[]> dns;
  std::unique_ptr<char[]> netbios;
  struct wbcDomainInfo info = {};
};

// What winbind answers to the next question, and what it was asked so far.
struct Winbind {
  wbcErr status = WBC_ERR_SUCCESS;
  bool knows = true;  // whether there is a domain in its answer
  const char* dns = "ad.werk.example.net";
  const char* netbios = "PLANT7";

  std::vector<std::string> asked;
  std::vector<std::unique_ptr<Domain>> given;  // and not given back
};
Winbind* winbind = nullptr;

}  // namespace

// The stub: these two functions are all of libwbclient that there is.
extern "C" wbcErr wbcDomainInfo(const char* domain, struct wbcDomainInfo** info) {
  winbind->asked.emplace_back(domain);
  if (!winbind->knows) return winbind->status;
  winbind->given.push_back(std::make_unique<Domain>(winbind->dns, winbind->netbios));
  *info = &winbind->given.back()->info;
  return winbind->status;
}

extern "C" void wbcFreeMemory(void* memory) {
  ASSERT_FALSE(winbind->given.empty()) << "given back twice, or never given";
  ASSERT_EQ(memory, &winbind->given.back()->info);
  winbind->given.pop_back();
}

namespace {

class PlatformWinbind : public testing::Test {
 protected:
  PlatformWinbind() { ::winbind = &winbind; }
  ~PlatformWinbind() override {
    EXPECT_TRUE(winbind.given.empty()) << "not given back";
    ::winbind = nullptr;
  }

  // The converted name, or "" for a negative result, which must leave the buffer alone. Writing
  // behind `size` fails the test.
  std::string convert(const std::string& name, size_t size = 1023) {
    std::vector<char> buffer(size + 8, kUntouched);
    const int rc = QOVAWinsUserNameFqdn2Netbios(name.c_str(), buffer.data(), size);
    const size_t used = rc < 0 ? 0 : strnlen(buffer.data(), buffer.size()) + 1;
    for (size_t i = used; i < buffer.size(); ++i) EXPECT_EQ(buffer[i], kUntouched) << name;
    EXPECT_TRUE(rc < 0 || used > 1) << "an empty name is none";
    return rc < 0 ? "" : buffer.data();
  }

  Winbind winbind;
};

TEST_F(PlatformWinbind, GivesTheNetbiosNameAndTheAccount) {
  EXPECT_EQ(convert("AD.WERK.EXAMPLE.NET\\alice"), "PLANT7\\alice");
  EXPECT_EQ(winbind.asked, std::vector<std::string>{"AD.WERK.EXAMPLE.NET"});
}

TEST_F(PlatformWinbind, AsksForTheDomainOnce) {
  convert("AD.WERK.EXAMPLE.NET\\alice");
  convert("OTHER.EXAMPLE.NET\\alice");
  EXPECT_EQ(winbind.asked, (std::vector<std::string>{"AD.WERK.EXAMPLE.NET", "OTHER.EXAMPLE.NET"}));
}

TEST_F(PlatformWinbind, TakesTheAccountAsItCame) {
  for (const std::string account :
       {"Alice", "ALICE", "alice smith", "a", "alice@home", "alice.smith-7$",
        "al\xc3\xaf"
        "ce",
        ""}) {
    EXPECT_EQ(convert("AD.WERK.EXAMPLE.NET\\" + account), "PLANT7\\" + account);
  }
}

TEST_F(PlatformWinbind, TakesTheNetbiosNameAsWinbindHasIt) {
  winbind.netbios = "Plant 7";
  EXPECT_EQ(convert("AD.WERK.EXAMPLE.NET\\alice"), "Plant 7\\alice");
}

TEST_F(PlatformWinbind, ComparesDnsNamesWithoutCase) {
  winbind.dns = "Ad-0.WERK.example.NET";
  for (const char* domain : {"AD-0.WERK.EXAMPLE.NET", "ad-0.werk.example.net",
                             "aD-0.werk.Example.net", "Ad-0.WERK.example.NET"}) {
    EXPECT_EQ(convert(std::string(domain) + "\\alice"), "PLANT7\\alice") << domain;
  }
}

TEST_F(PlatformWinbind, ComparesTheWholeAlphabetWithoutCase) {
  winbind.dns = "abcdefghijklmnopqrstuvwxyz.0123456789-";
  EXPECT_EQ(convert("ABCDEFGHIJKLMNOPQRSTUVWXYZ.0123456789-\\alice"), "PLANT7\\alice");
}

// Bit 0x20 makes the difference between the cases of letters, and nothing but a difference
// between other characters: "@" is no large "`", nor "[" a large "{".
TEST_F(PlatformWinbind, KnowsTheCaseOfLettersAlone) {
  const char* pairs[][2] = {{"a`z", "a@z"}, {"a{z", "a[z"}, {"a\xe4z", "a\xc4z"}, {"a\rz", "a-z"}};
  for (const auto& pair : pairs) {
    winbind.dns = pair[0];
    EXPECT_EQ(convert(std::string(pair[1]) + "\\alice"), "") << pair[1];
    EXPECT_EQ(convert(std::string(pair[0]) + "\\alice"), "PLANT7\\alice");
  }
}

// Winbind answers to the NetBIOS name as well.
TEST_F(PlatformWinbind, RefusesADomainOfAnotherDnsName) {
  for (const char* domain :
       {"PLANT7", "WERK.EXAMPLE.NET", "AD.WERK.EXAMPLE.NE", "AD.WERK.EXAMPLE.NET.",
        "AD.WERK.EXAMPLE.NETT", "XD.WERK.EXAMPLE.NET", "AD.WERK.EXAMPLE", "A"}) {
    EXPECT_EQ(convert(std::string(domain) + "\\alice"), "") << domain;
    EXPECT_EQ(winbind.asked.back(), domain);
  }
}

TEST_F(PlatformWinbind, RefusesAnAnswerThatLacksAName) {
  winbind.dns = nullptr;
  EXPECT_EQ(convert("AD.WERK.EXAMPLE.NET\\alice"), "");
  winbind.dns = "";
  EXPECT_EQ(convert("AD.WERK.EXAMPLE.NET\\alice"), "");
  winbind.dns = "ad.werk.example.net";
  winbind.netbios = nullptr;
  EXPECT_EQ(convert("AD.WERK.EXAMPLE.NET\\alice"), "");
  winbind.netbios = "";
  EXPECT_EQ(convert("AD.WERK.EXAMPLE.NET\\alice"), "");
  EXPECT_EQ(winbind.asked.size(), 4u);
}

TEST_F(PlatformWinbind, RefusesAnAnswerWithoutADomain) {
  winbind.knows = false;
  EXPECT_EQ(convert("AD.WERK.EXAMPLE.NET\\alice"), "");
}

TEST_F(PlatformWinbind, FailsWhereWinbindFails) {
  winbind.knows = false;
  for (int status = WBC_ERR_NOT_IMPLEMENTED; status <= WBC_ERR_PWD_CHANGE_FAILED; ++status) {
    winbind.status = static_cast<wbcErr>(status);
    EXPECT_EQ(convert("AD.WERK.EXAMPLE.NET\\alice"), "") << status;
  }
  EXPECT_EQ(winbind.asked.size(), 13u);
}

TEST_F(PlatformWinbind, RefusesWhatIsNotADomainAndAnAccount) {
  for (const char* name :
       {"", "alice", "\\", "\\alice", "ad.werk.example.net", "AD.WERK.EXAMPLE.NET\\eve\\alice",
        "AD.WERK.EXAMPLE.NET\\\\alice", "AD.WERK.EXAMPLE.NET\\alice\\"}) {
    EXPECT_EQ(convert(name), "") << name;
  }
  EXPECT_TRUE(winbind.asked.empty());
}

TEST_F(PlatformWinbind, AsksForNoDomainThatWouldBeCut) {
  const std::string longest(255, 'a');
  winbind.dns = longest.c_str();
  EXPECT_EQ(convert(longest + "\\alice"), "PLANT7\\alice");
  EXPECT_EQ(winbind.asked.back(), longest);
  EXPECT_EQ(convert(longest + "a\\alice"), "");
  EXPECT_EQ(convert(std::string(100000, 'a') + "\\alice"), "");
  EXPECT_EQ(winbind.asked.size(), 1u);
}

TEST_F(PlatformWinbind, NeverCutsTheResult) {
  const std::string whole = "PLANT7\\alice";
  for (size_t size = 0; size <= whole.size(); ++size) {
    EXPECT_EQ(convert("AD.WERK.EXAMPLE.NET\\alice", size), "") << size;
  }
  EXPECT_EQ(convert("AD.WERK.EXAMPLE.NET\\alice", whole.size() + 1), whole);
  EXPECT_EQ(convert("AD.WERK.EXAMPLE.NET\\alice", whole.size() + 2), whole);
}

TEST_F(PlatformWinbind, FillsTheLibrarysBufferToItsLastByte) {
  const std::string account(1023 - 1 - strlen("PLANT7\\"), 'x');
  EXPECT_EQ(convert("AD.WERK.EXAMPLE.NET\\" + account), "PLANT7\\" + account);
  EXPECT_EQ(convert("AD.WERK.EXAMPLE.NET\\x" + account), "");
}

}  // namespace
