// Whole logins over TLS against thousands of bad answers. None signs anyone in, and each ends in
// the exception that is due. HOSTILE_CASES and HOSTILE_SEED in the environment of this test choose
// how many there are and which, HOSTILE_REFUSED how many bad answers there must have been at least;
// scripts/check hostile asks for 10,000.
#include <gtest/gtest.h>
#include <sys/resource.h>

#include <cstdlib>
#include <filesystem>
#include <iostream>
#include <map>

#include "hostile_cases.h"
#include "sso/azuresso.h"
#include "sso/sso.h"
#include "support/device.h"
#include "support/log.h"
#include "support/provider.h"

namespace {

using hostile::Case;
using hostile::Outcome;
using Kind = Outcome::Kind;

// Of each kind, when nothing is said.
#if defined(__SANITIZE_ADDRESS__)
constexpr std::uint64_t kShort = 3;
#else
constexpr std::uint64_t kShort = 5;
#endif

std::uint64_t fromEnvironment(const char* name, std::uint64_t otherwise) {
  const char* text = std::getenv(name);
  return text == nullptr || *text == '\0' ? otherwise : std::strtoull(text, nullptr, 10);
}

Outcome loginOf(std::string* user) {
  try {
    QOVA::SSO::OIDCLogin("the code", *user);
  } catch (const std::exception& e) {
    const std::map<std::string, Kind> kinds = {
        {typeid(std::invalid_argument).name(), Kind::kInvalid},
        {typeid(QOVA::SSO::sso_err_resp).name(), Kind::kResponse},
        {typeid(QOVA::JWT::jwt_not_support).name(), Kind::kNotSupported},
        {typeid(QOVA::JWT::jwt_verify_failed).name(), Kind::kUnverified},
        {typeid(Json::LogicError).name(), Kind::kJson},
        {typeid(std::logic_error).name(), Kind::kLogic}};
    const auto found = kinds.find(typeid(e).name());
    EXPECT_NE(found, kinds.end()) << typeid(e).name();
    if (found != kinds.end()) return {found->second, e.what()};
  }
  return {Kind::kSignedIn, ""};
}

// Claims and signatures refuse what random bytes make of a token; the messages stay the known ones.
bool isExpected(const Outcome& outcome, const std::vector<Outcome>& expected) {
  for (const Outcome& each : expected) {
    if (each.kind != outcome.kind) continue;
    if (each.message.empty() || std::string(each.message.c_str()) == outcome.message) return true;
  }
  return false;
}

// How many of these cases are bad answers: the last kinds are not.
std::uint64_t badOf(std::uint64_t first, std::uint64_t cases) {
  std::uint64_t bad = 0;
  for (std::uint64_t index = first; index < first + cases; ++index)
    bad += index % hostile::kinds() < hostile::kinds() - hostile::controls();
  return bad;
}

std::size_t openFiles() {
  std::size_t count = 0;
  for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
    (void)entry;
    ++count;
  }
  return count;
}

class HostileProviderTest : public testing::Test {
 protected:
  HostileProviderTest() : provider(authority.issue({"localhost"})) {
    authority.trustAlone();
    world.base = provider.url("");
    world.closedPort = test::unusedPort();
    Json::Value azure;
    azure["azure_wellknown"] = provider.url("/discovery");
    azure["azure_token_endpoint"] = provider.url("/token");
    azure["azure_client_id"] = "the device";
    azure["azure_tenant_id"] = "the tenant";
    azure["azure_client_secret"] = world.secret;
    test::writeConfig("azure.conf", azure.toStyledString());
    Json::Value websphere;
    websphere["websphere_token_endpoint"] = provider.url("/token");
    websphere["websphere_client_id"] = "the device";
    websphere["websphere_client_secret"] = world.secret;
    test::writeConfig("websphere.conf", websphere.toStyledString());
  }

  static void choose(bool azure) {
    test::writeConfig("profile.conf",
                      std::string(R"({"sso_enable":true,"sso_profile":")") +
                          (azure ? "azure" : "websphere") + "\"}",
                      0644);
  }

  // The library says no more than its error lines.
  void expectErrorLines(const std::string& trace) const {
    for (const test::LogLine& line : log.lines()) {
      EXPECT_EQ(line.priority, LOG_ERR) << trace << ": " << line.text;
    }
    EXPECT_LE(log.lines().size(), 3u) << trace;
  }

  void play(std::uint64_t index) {
    const Case each = hostile::makeCase(world, seed, index);
    const std::string trace = each.kind + (each.azure ? " (azure)" : " (websphere)") + ", seed " +
                              std::to_string(seed) + ", case " + std::to_string(index);
    choose(each.azure);
    provider.play(static_cast<int>(index));
    log.clear();
    std::string user = "before";
    const Outcome outcome = loginOf(&user);
    EXPECT_TRUE(isExpected(outcome, each.outcomes))
        << trace << ": ended in kind " << static_cast<int>(outcome.kind) << " \""
        << outcome.message.substr(0, 300) << "\", not in kind "
        << static_cast<int>(each.outcomes.at(0).kind) << " \""
        << each.outcomes.at(0).message.substr(0, 300) << '"';
    const bool meant = each.outcomes.at(0).kind == Kind::kSignedIn;
    const std::string name = each.azure ? "CORP.EXAMPLE.COM\\Alice" : "Alice";
    EXPECT_EQ(user, meant ? name : "before") << trace;
    expectErrorLines(trace);
    if (meant) {
      ++signed_in;
    } else {
      ++refused;
      ++ends[outcome.kind];
    }
    EXPECT_GE(provider.turns(), 1) << trace << ": no request came";
    connections += static_cast<unsigned>(provider.turns());
  }

  const std::uint64_t seed = fromEnvironment("HOSTILE_SEED", 1);
  test::Ca authority;
  test::HostileProvider provider;
  hostile::World world;
  test::Log log;
  unsigned signed_in = 0;
  unsigned refused = 0;
  unsigned connections = 0;
  std::map<Kind, unsigned> ends;
};

TEST_F(HostileProviderTest, SignsNobodyInWithBadAnswers) {
  const std::uint64_t cases = fromEnvironment("HOSTILE_CASES", kShort * hostile::kinds());
  const std::uint64_t first = fromEnvironment("HOSTILE_FIRST", 0);
  provider.start(
      [this](int round, int turn) {
        static int known = -1;
        static Case each;
        if (round != known) each = hostile::makeCase(world, seed, static_cast<unsigned>(round));
        known = round;
        return turn < 3 ? each.scripts[static_cast<std::size_t>(turn)] : test::Script();
      },
      3600);
  play(hostile::kinds() -
       hostile::controls());  // a good login first: what is loaded once is loaded
  const std::size_t files = openFiles();
  for (std::uint64_t index = first; index < first + cases; ++index) {
    play(index);
    if (HasFailure()) break;
    if (cases > 2000 && index % 1000 == 999) std::cout << index + 1 << " cases\n" << std::flush;
  }
  EXPECT_EQ(openFiles(), files);
  EXPECT_EQ(provider.strays(), 0) << "a redirect was followed";
  EXPECT_EQ(refused, badOf(first, cases));
  EXPECT_GE(refused, fromEnvironment("HOSTILE_REFUSED", 1));
  EXPECT_EQ(signed_in, 1 + cases - badOf(first, cases)) << "those that are right, and the first";
  rusage usage{};
  getrusage(RUSAGE_SELF, &usage);
  std::cout << "seed " << seed << ": " << refused << " bad answers of "
            << hostile::kinds() - hostile::controls() << " kinds refused, " << signed_in
            << " good ones taken, " << connections << " connections, largest "
            << usage.ru_maxrss / 1024 << " MB\n  ended in";
  for (const auto& [kind, count] : ends)
    std::cout << " kind " << static_cast<int>(kind) << ": " << count << ";";
  std::cout << "\n";
}

}  // namespace
