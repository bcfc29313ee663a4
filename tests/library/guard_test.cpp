// The privilege guard around the reading of a configuration file, in each of the three
// constructors that use it: the calls in their order, the log, and the ids left behind, with real
// process identities and with calls that fail.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <fstream>
#include <new>
#include <ostream>

#include "sso/azuresso.h"
#include "sso/profile.h"
#include "sso/webspheresso.h"
#include "support/device.h"
#include "support/ids_spy.h"
#include "support/log.h"
#include "support/memory_spy.h"

namespace {

using namespace QOVA::SSO;
using Calls = std::vector<std::string>;

constexpr uid_t U = 1001;
constexpr gid_t G = 2002;

// A unit that reads a file under the guard, and a setting that shows whether it was read.
struct Unit {
  const char* file;
  const char* config;
  const char* text;
  std::string (*read)();
};
const Unit kUnits[] = {
    {"profile.cpp", "profile.conf", R"({"sso_enable":false,"sso_profile":"read"})",
     [] { return SSOProfile().GetSSOProfile(); }},
    {"azuresso.cpp", "azure.conf", R"({"azure_client_id":"read"})",
     [] { return AzureSSOClient().GetClientID(); }},
    {"webspheresso.cpp", "websphere.conf", R"({"websphere_client_id":"read"})",
     [] { return WebSphereSSOClient().GetClientID(); }},
};
void PrintTo(const Unit& unit, std::ostream* out) {
  *out << unit.file;
}

// A line of the log, but for the file name.
struct Line {
  int priority;
  const char* message;
};
constexpr int kInfo = LOG_AUTH | LOG_INFO;
constexpr int kError = LOG_AUTH | LOG_ERR;
const Line kRaisedGroup = {kInfo, "WARNING: setresgid(-1, 0, -1)"};
const Line kRaisedUser = {kInfo, "WARNING: setresuid(-1, 0, -1)"};
const Line kEnter = {kError, "ERROR: ENTERCriticalSection"};
const Line kLeave = {kError, "ERROR: LEAVECriticalSection"};
const Line kGroupDenied = {kError, "ERROR: setresgid(-1, 0, -1) [Operation not permitted]"};
const Line kUserDenied = {kError, "ERROR: setresuid(-1, 0, -1) [Operation not permitted]"};

// A process whose ids are the given ones, and what a construction does to it. What a case does not
// name: no change fails, nothing is logged, errno is 0 and the file (root's, mode 0600) is read.
struct Case {
  Case(const char* title, test::Ids userIds, test::Ids groupIds)
      : name(title),
        user(userIds),
        group(groupIds),
        userAfter(userIds.effective),
        groupAfter(groupIds.effective) {}

  Case& failing(std::size_t nth) { return failingChange = nth, *this; }  // with EAGAIN
  Case& makes(Calls calls) { return changes = std::move(calls), *this; }
  Case& logs(std::vector<Line> lines) { return log = std::move(lines), *this; }
  Case& unread() { return readable = false, *this; }
  Case& endsAs(uid_t effectiveUser, gid_t effectiveGroup) {
    return userAfter = effectiveUser, groupAfter = effectiveGroup, *this;
  }
  Case& denied() { return errnoAfter = EPERM, *this; }

  const char* name;
  test::Ids user;
  test::Ids group;
  uid_t userAfter;
  gid_t groupAfter;
  std::size_t failingChange = 0;
  Calls changes;
  std::vector<Line> log;
  int errnoAfter = 0;
  bool readable = true;
};
void PrintTo(const Case& each, std::ostream* out) {
  *out << each.name;
}

const char* const kG0 = "setresgid(-1, 0, -1)";
const char* const kU0 = "setresuid(-1, 0, -1)";
const char* const kGBack = "setresgid(-1, 2002, -1)";
const char* const kUBack = "setresuid(-1, 1001, -1)";

const test::Ids kRootAll = {0, 0, 0};
const test::Ids kUserRootSaved = {U, U, 0};
const test::Ids kGroupRootSaved = {G, G, 0};
const test::Ids kUserRootReal = {0, U, U};
const test::Ids kGroupRootReal = {0, G, G};
const test::Ids kUserOnly = {U, U, U};
const test::Ids kGroupOnly = {G, G, G};

const Calls kWhole = {kG0, kU0, kU0, kGBack, kUBack};
const std::vector<Line> kWholeLog = {kRaisedGroup, kRaisedUser, kRaisedUser};

const Case kCases[] = {
    // With the identities that a process can really have.
    Case("RootIsSaved", kUserRootSaved, kGroupRootSaved).makes(kWhole).logs(kWholeLog),
    Case("RootIsReal", kUserRootReal, kGroupRootReal).makes(kWhole).logs(kWholeLog),
    Case("RootAlready", kRootAll, kRootAll),
    Case("RootEffectiveOnly", {U, 0, U}, {G, 0, G}),
    Case("NoRoot", kUserOnly, kGroupOnly).makes({kG0}).logs({kGroupDenied, kEnter}).unread(),
    Case("UserAlone", kUserRootSaved, kRootAll)
        .makes({kU0, kU0, kUBack})
        .logs({kRaisedUser, kRaisedUser}),
    Case("GroupAlone", kRootAll, kGroupRootSaved).makes({kG0, kGBack}).logs({kRaisedGroup}),
    // The user could be raised, but is not tried once the group has failed.
    Case("NoRootGroup", kUserRootSaved, kGroupOnly)
        .makes({kG0})
        .logs({kGroupDenied, kEnter})
        .unread(),
    Case("NoRootUser", kUserOnly, kGroupRootSaved)
        .makes({kG0, kU0, kGBack})
        .logs({kRaisedGroup, kUserDenied, kEnter})
        .unread(),
    Case("NoRootUserRootGroup", kUserOnly, kRootAll)
        .makes({kU0})
        .logs({kUserDenied, kEnter})
        .unread(),

    // Each call of the usual case fails once.
    Case("FirstFails", kUserRootSaved, kGroupRootSaved)
        .failing(1)
        .makes({kG0})
        .logs({{kError, "ERROR: setresgid(-1, 0, -1) [Resource temporarily unavailable]"}, kEnter})
        .unread(),
    Case("SecondFails", kUserRootSaved, kGroupRootSaved)
        .failing(2)
        .makes({kG0, kU0, kGBack})
        .logs({kRaisedGroup,
               {kError, "ERROR: setresuid(-1, 0, -1) [Resource temporarily unavailable]"},
               kEnter})
        .unread(),
    Case("ThirdFails", kUserRootSaved, kGroupRootSaved)
        .failing(3)
        .makes({kG0, kU0, kU0})
        .logs({kRaisedGroup,
               kRaisedUser,
               {kError, "ERROR: setresuid(-1, 0, -1) [Resource temporarily unavailable]"},
               kLeave})
        .endsAs(0, 0)
        .denied(),
    // The user is not restored once the group could not be.
    Case("FourthFails", kUserRootSaved, kGroupRootSaved)
        .failing(4)
        .makes({kG0, kU0, kU0, kGBack})
        .logs({kRaisedGroup,
               kRaisedUser,
               kRaisedUser,
               {kError, "ERROR: setresgid(-1, 2002, -1) [Resource temporarily unavailable]"},
               kLeave})
        .endsAs(0, 0)
        .denied(),
    Case("FifthFails", kUserRootSaved, kGroupRootSaved)
        .failing(5)
        .makes(kWhole)
        .logs({kRaisedGroup,
               kRaisedUser,
               kRaisedUser,
               {kError, "ERROR: setresuid(-1, 1001, -1) [Resource temporarily unavailable]"},
               kLeave})
        .endsAs(0, G)
        .denied(),

    // And those of a process where one of the ids is root's already.
    Case("GroupAloneCannotReturn", kRootAll, kGroupRootSaved)
        .failing(2)
        .makes({kG0, kGBack})
        .logs({kRaisedGroup,
               {kError, "ERROR: setresgid(-1, 2002, -1) [Resource temporarily unavailable]"},
               kLeave})
        .endsAs(0, 0)
        .denied(),
    Case("UserAloneCannotReturn", kUserRootSaved, kRootAll)
        .failing(3)
        .makes({kU0, kU0, kUBack})
        .logs({kRaisedUser,
               kRaisedUser,
               {kError, "ERROR: setresuid(-1, 1001, -1) [Resource temporarily unavailable]"},
               kLeave})
        .endsAs(0, 0)
        .denied(),
    Case("GroupIsStuckAfterTheUserFailed", kUserOnly, kGroupRootSaved)
        .failing(3)
        .makes({kG0, kU0, kGBack})
        .logs({kRaisedGroup,
               kUserDenied,
               kEnter,
               {kError, "ERROR: setresgid(-1, 2002, -1) [Resource temporarily unavailable]"},
               kLeave})
        .unread()
        .endsAs(U, 0)
        .denied(),
};

std::vector<test::Expected> linesOf(const Unit& unit, const std::vector<Line>& lines) {
  std::vector<test::Expected> expected;
  for (const Line& line : lines) expected.push_back({line.priority, unit.file, line.message});
  return expected;
}

test::Ids userIds() {
  test::Ids ids;
  EXPECT_EQ(getresuid(&ids.real, &ids.effective, &ids.saved), 0);
  return ids;
}

test::Ids groupIds() {
  test::Ids ids;
  EXPECT_EQ(getresgid(&ids.real, &ids.effective, &ids.saved), 0);
  return ids;
}

// One construction, and everything that it left behind.
struct Outcome {
  explicit Outcome(const Unit& unit, test::IdsSpy* spy) {
    errno = 77;
    value = unit.read();
    error = errno;
    changes = spy->changes;
  }
  std::string value;
  int error;
  Calls changes;
};

class Guard : public testing::TestWithParam<std::tuple<Unit, Case>> {};
INSTANTIATE_TEST_SUITE_P(, Guard,
                         testing::Combine(testing::ValuesIn(kUnits), testing::ValuesIn(kCases)),
                         [](const auto& each) {
                           const std::string file = std::get<0>(each.param).file;
                           return file.substr(0, file.find('.')) + std::get<1>(each.param).name;
                         });

TEST_P(Guard, ChangesTheEffectiveIdsAndPutsThemBack) {
  const auto& [unit, expected] = GetParam();
  test::writeConfig(unit.config, unit.text);
  test::runAs(expected.user, expected.group, [&, &unit = unit, &expected = expected] {
    test::IdsSpy spy;
    spy.failing = expected.failingChange;
    spy.error = EAGAIN;
    test::Log log;
    const Outcome outcome(unit, &spy);
    EXPECT_EQ(outcome.changes, expected.changes);
    EXPECT_TRUE(log.is(linesOf(unit, expected.log)));
    EXPECT_EQ(outcome.value, expected.readable ? "read" : "");
    EXPECT_EQ(outcome.error, expected.errnoAfter);
    EXPECT_EQ(userIds().effective, expected.userAfter);
    EXPECT_EQ(groupIds().effective, expected.groupAfter);
    EXPECT_EQ(userIds().real, expected.user.real);
    EXPECT_EQ(userIds().saved, expected.user.saved);
    EXPECT_EQ(groupIds().real, expected.group.real);
    EXPECT_EQ(groupIds().saved, expected.group.saved);
  });
}

class GuardOf : public testing::TestWithParam<Unit> {};
INSTANTIATE_TEST_SUITE_P(, GuardOf, testing::ValuesIn(kUnits), [](const auto& each) {
  const std::string file = each.param.file;
  return file.substr(0, file.find('.'));
});

TEST_P(GuardOf, LooksAtTheIdsOnceInEachHalf) {
  test::writeConfig(GetParam().config, GetParam().text);
  test::runAs(kUserRootSaved, kGroupRootSaved, [] {
    test::IdsSpy spy;
    GetParam().read();
    EXPECT_EQ(spy.all,
              (Calls{"geteuid", "getegid", kG0, kU0, "geteuid", "getegid", kU0, kGBack, kUBack}));
  });
}

TEST_P(GuardOf, LooksAtTheIdsEvenIfNothingIsToBeDone) {
  test::IdsSpy spy;
  GetParam().read();
  EXPECT_EQ(spy.all, (Calls{"geteuid", "getegid", "geteuid", "getegid"}));
}

TEST_P(GuardOf, GoesThroughBothHalvesForAMissingFile) {
  test::runAs(kUserRootSaved, kGroupRootSaved, [] {
    test::IdsSpy spy;
    test::Log log;
    const Outcome outcome(GetParam(), &spy);
    EXPECT_EQ(outcome.changes, kWhole);
    EXPECT_TRUE(log.is(linesOf(GetParam(), kWholeLog)));
    EXPECT_EQ(outcome.value, "");
    EXPECT_EQ(outcome.error, 0);
    EXPECT_EQ(userIds().effective, U);
    EXPECT_EQ(groupIds().effective, G);
  });
}

TEST_P(GuardOf, GoesThroughBothHalvesForABadFile) {
  for (const std::string& text : {std::string(), std::string("{"), std::string(3000, '[')}) {
    test::writeConfig(GetParam().config, text);
    test::runAs(kUserRootSaved, kGroupRootSaved, [] {
      test::IdsSpy spy;
      const Outcome outcome(GetParam(), &spy);
      EXPECT_EQ(outcome.changes, kWhole);
      EXPECT_EQ(outcome.value, "");
      EXPECT_EQ(outcome.error, 0);
    });
  }
}

// With the group raised and not the user, a file that root's group may read is read.
TEST_P(GuardOf, ReadsAfterAFailedRaiseToo) {
  test::writeConfig(GetParam().config, GetParam().text, 0640);
  test::runAs(kUserOnly, kGroupRootSaved, [] { EXPECT_EQ(GetParam().read(), "read"); });
  test::writeConfig(GetParam().config, GetParam().text, 0644);
  test::runAs(kUserOnly, kGroupOnly, [] { EXPECT_EQ(GetParam().read(), "read"); });
}

// The entering half leaves errno at 1 before its last line, whatever the call had failed with.
TEST_P(GuardOf, SetsErrnoBeforeTheLineThatNamesTheHalf) {
  for (std::size_t failing = 1; failing <= 5; ++failing) {
    test::runAs(kUserRootSaved, kGroupRootSaved, [&] {
      test::IdsSpy spy;
      spy.failing = failing;
      spy.error = EINVAL;
      test::Log log;
      GetParam().read();
      bool named = false;
      for (const test::LogLine& line : log.lines()) {
        if (line.text.find("CriticalSection") == std::string::npos) continue;
        named = true;
        EXPECT_EQ(line.error, EPERM) << line.text;
      }
      EXPECT_TRUE(named);
    });
  }
}

TEST_P(GuardOf, AsksForTheTextOfTheErrorInACleanBuffer) {
  for (std::size_t failing = 1; failing <= 5; ++failing) {
    test::runAs(kUserRootSaved, kGroupRootSaved, [&] {
      test::IdsSpy spy;
      spy.failing = failing;
      spy.error = EINVAL;
      GetParam().read();
      ASSERT_EQ(spy.buffers.size(), 1u);
      EXPECT_EQ(spy.buffers[0].size, 1024u);
      EXPECT_TRUE(spy.buffers[0].zero);
      EXPECT_EQ(spy.buffers[0].error, EINVAL);
    });
  }
}

// Two failures in one construction: the buffer is clean for the second one too.
TEST_P(GuardOf, CleansTheBufferBeforeEachUse) {
  test::runAs(kUserOnly, kGroupRootSaved, [&] {
    test::IdsSpy spy;
    spy.failing = 3;
    spy.error = 9999;  // its text is made in the buffer
    GetParam().read();
    ASSERT_EQ(spy.buffers.size(), 2u);
    EXPECT_TRUE(spy.buffers[0].zero);
    EXPECT_TRUE(spy.buffers[1].zero);
  });
}

// Texts that the C library keeps, and texts that it makes in the caller's buffer.
TEST_P(GuardOf, LogsTheTextOfAnyError) {
  for (const int error : {EPERM, EAGAIN, EINVAL, ENOSYS, 9999}) {
    test::runAs(kUserRootSaved, kGroupRootSaved, [&] {
      test::IdsSpy spy;
      spy.failing = 1;
      spy.error = error;
      test::Log log;
      GetParam().read();
      const std::string line =
          "ERROR: setresgid(-1, 0, -1) [" + std::string(std::strerror(error)) + "]";
      EXPECT_TRUE(log.is({{kError, GetParam().file, line},
                          {kError, GetParam().file, "ERROR: ENTERCriticalSection"}}));
    });
  }
}

// A restore is announced only if it leads to root. That takes ids that change during the read.
TEST_P(GuardOf, AnnouncesARestoreToRootAlone) {
  test::IdsSpy spy;
  spy.users = {0, U};
  spy.groups = {0, G};
  test::Log log;
  GetParam().read();
  EXPECT_EQ(spy.changes, (Calls{kU0, kG0, kU0}));
  EXPECT_TRUE(log.is(linesOf(GetParam(), {kRaisedUser, kRaisedGroup, kRaisedUser})));
}

TEST_P(GuardOf, AnnouncesARestoreOfTheGroupToRoot) {
  test::IdsSpy spy;
  spy.groups = {0, G};
  test::Log log;
  GetParam().read();
  EXPECT_EQ(spy.changes, (Calls{kG0}));
  EXPECT_TRUE(log.is(linesOf(GetParam(), {kRaisedGroup})));
}

// The file is a pipe: whoever fills it sees the ids of the reading process at that moment.
TEST_P(GuardOf, ReadsAsRoot) {
  const std::string path = test::configPath(GetParam().config);
  ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
  const std::string seen = test::asProcess(kUserRootSaved, kGroupRootSaved, [&] {
    const pid_t reader = getpid();
    int report[2];
    EXPECT_EQ(pipe(report), 0);
    test::Ids all = {0, 0, 0};
    const pid_t writer = fork();
    if (writer == 0) {
      alarm(20);
      if (setresuid(0, all.effective, 0) != 0) _exit(1);
      std::ofstream out(path);  // waits for the reader
      std::ifstream status("/proc/" + std::to_string(reader) + "/status");
      std::string line, ids;
      while (std::getline(status, line)) {
        if (line.compare(0, 4, "Uid:") == 0 || line.compare(0, 4, "Gid:") == 0) ids += line + "\n";
      }
      const bool told =
          write(report[1], ids.data(), ids.size()) == static_cast<ssize_t>(ids.size());
      out << GetParam().text;
      out.close();
      _exit(told ? 0 : 1);
    }
    alarm(20);
    EXPECT_EQ(GetParam().read(), "read");
    alarm(0);
    int status = 0;
    waitpid(writer, &status, 0);
    EXPECT_EQ(status, 0);
    char ids[256] = "";
    EXPECT_GT(read(report[0], ids, sizeof ids - 1), 0);
    return std::string(ids);
  });
  EXPECT_EQ(seen, "Uid:\t1001\t0\t0\t0\nGid:\t2002\t0\t0\t0\n");
}

// Exhausted memory is the only thing that can end the read with an exception. It passes, and the
// ids stay raised: nothing is restored on the way. (A stream may turn it into a failed read.)
TEST_P(GuardOf, LeavesTheIdsRaisedWhenMemoryRunsOut) {
  test::writeConfig(GetParam().config, GetParam().text);
  const auto readWithFailure = [](std::size_t nth) {
    test::IdsSpy spy;
    bool failed = false;
    spy.afterwards = [&](std::size_t change) {
      if (change == 2) test::failNew(nth);
      if (change != 3) return;  // the read is over
      failed = test::newFailed();
      test::failNew(0);
    };
    try {
      const std::string value = GetParam().read();
      EXPECT_EQ(spy.changes, kWhole);
      EXPECT_EQ(value, failed ? "" : "read");
    } catch (const std::bad_alloc&) {
      EXPECT_EQ(spy.changes, (Calls{kG0, kU0}));
      EXPECT_EQ(userIds().effective, 0u);
      EXPECT_EQ(groupIds().effective, 0u);
      return std::string("thrown");
    }
    return std::string(failed ? "failed to read" : "read");
  };
  std::size_t thrown = 0;
  std::string answer;
  for (std::size_t nth = 1; nth <= 400 && answer != "read"; ++nth) {
    answer = test::asProcess(kUserRootSaved, kGroupRootSaved, [&] { return readWithFailure(nth); });
    thrown += answer == "thrown" ? 1 : 0;
  }
  EXPECT_EQ(answer, "read");
  EXPECT_GT(thrown, 5u);
}

}  // namespace
