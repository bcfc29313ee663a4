// The privilege guard against a table: every real, effective and saved id out of root, A and B,
// for user and group, in each constructor that uses the guard; as it goes, with each change of
// ids failing, and with that one and all after it failing. What should happen comes from a small
// model of the guard and of the kernel's rules; the calls are real.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cerrno>
#include <cstdarg>
#include <cstring>
#include <iostream>
#include <string>
#include <vector>

#include "sso/azuresso.h"
#include "sso/profile.h"
#include "sso/webspheresso.h"
#include "support/device.h"
#include "support/ids_spy.h"
#include "support/log.h"

namespace {

using namespace QOVA::SSO;
using test::Ids;

constexpr unsigned kAnyId[] = {0, 1001, 2002};

struct State {
  Ids user;
  Ids group;
};

bool operator==(const Ids& a, const Ids& b) {
  return a.real == b.real && a.effective == b.effective && a.saved == b.saved;
}

std::string textOf(const Ids& ids) {
  return std::to_string(ids.real) + "/" + std::to_string(ids.effective) + "/" +
         std::to_string(ids.saved);
}

std::string textOf(const State& state) {
  return "user " + textOf(state.user) + ", group " + textOf(state.group);
}

// A unit that reads a file under the guard, and a setting that shows whether it was read.
struct Unit {
  const char* file;
  const char* config;
  const char* text;
  std::string (*read)();
};
const Unit kProfile = {"profile.cpp", "profile.conf",
                       R"({"sso_enable":false,"sso_profile":"read"})",
                       [] { return SSOProfile().GetSSOProfile(); }};
const Unit kAzure = {"azuresso.cpp", "azure.conf", R"({"azure_client_id":"read"})",
                     [] { return AzureSSOClient().GetClientID(); }};
const Unit kWebSphere = {"webspheresso.cpp", "websphere.conf", R"({"websphere_client_id":"read"})",
                         [] { return WebSphereSSOClient().GetClientID(); }};

// Which changes of ids are made to fail: the failing-th (from 1; 0: none), perhaps all after it.
struct Plan {
  std::size_t failing;
  bool allAfter;
  int error;
};

// What one construction comes to, expected or seen.
struct Outcome {
  std::vector<std::string> calls;  // in order, the opening of the file among them
  std::size_t changes = 0;
  std::vector<std::string> log;  // "priority half message"; the half by its number
  State atRead = {{0, 0, 0}, {0, 0, 0}};
  int errnoAtRead = -1;
  State after = {{0, 0, 0}, {0, 0, 0}};
  int errnoAfter = -1;
  std::string value;
};

// --- what should happen

class Model {
 public:
  Model(const State& start, const Plan& planned) : ids(start), plan(planned) {}

  Outcome run() {
    enter();
    out.calls.push_back("open");
    out.atRead = ids;
    out.errnoAtRead = error;
    out.value = ids.user.effective == 0 ? "read" : "";  // the file is root's, mode 0600
    ++half;
    leave();
    out.after = ids;
    out.errnoAfter = error;
    return out;
  }

 private:
  void enter() {
    look(&savedUser, &savedGroup);
    error = 0;
    if (savedGroup != 0) {
      if (!change(&ids.group, "resgid", 0)) return broken("ENTER");
      announce("resgid");
    }
    if (savedUser != 0) {
      if (!change(&ids.user, "resuid", 0)) return broken("ENTER");
      announce("resuid");
    }
  }

  void leave() {
    unsigned user = 0;
    unsigned group = 0;
    look(&user, &group);
    error = 0;
    if (savedUser != user) {
      if (!change(&ids.user, "resuid", 0)) return broken("LEAVE");
      announce("resuid");
    }
    if (savedGroup != group) {
      if (!change(&ids.group, "resgid", savedGroup)) return broken("LEAVE");
      if (savedGroup == 0) announce("resgid");
    }
    if (savedUser != user) {
      if (!change(&ids.user, "resuid", savedUser)) return broken("LEAVE");
      if (savedUser == 0) announce("resuid");
    }
  }

  void look(unsigned* user, unsigned* group) {
    out.calls.push_back("geteuid");
    *user = ids.user.effective;
    out.calls.push_back("getegid");
    *group = ids.group.effective;
  }

  // The kernel lets root have any effective id, anyone else one of the three it has.
  bool change(Ids* which, const std::string& name, unsigned to) {
    const std::string call = "set" + name + "(-1, " + std::to_string(to) + ", -1)";
    out.calls.push_back(call);
    ++out.changes;
    const bool planned = plan.failing != 0 && (out.changes == plan.failing ||
                                               (plan.allAfter && out.changes > plan.failing));
    const bool allowed = ids.user.effective == 0 || to == which->real || to == which->effective ||
                         to == which->saved;
    if (!planned && allowed) {
      which->effective = to;
      return true;
    }
    log(LOG_ERR, "ERROR: " + call + " [" + std::strerror(planned ? plan.error : EPERM) + "]");
    return false;
  }

  void announce(const std::string& name) { log(LOG_INFO, "WARNING: set" + name + "(-1, 0, -1)"); }

  void broken(const std::string& name) {
    error = 1;
    log(LOG_ERR, "ERROR: " + name + "CriticalSection, errno 1");
  }

  void log(int priority, const std::string& message) {
    out.log.push_back(std::to_string(LOG_AUTH | priority) + " " + std::to_string(half) + " " +
                      message);
  }

  State ids;
  Plan plan;
  Outcome out;
  unsigned savedUser = 0;
  unsigned savedGroup = 0;
  int error = 0;
  int half = 1;
};

// --- what does happen

State currentIds() {
  State now;
  EXPECT_EQ(getresuid(&now.user.real, &now.user.effective, &now.user.saved), 0);
  EXPECT_EQ(getresgid(&now.group.real, &now.group.effective, &now.group.saved), 0);
  return now;
}

test::IdsSpy* watched = nullptr;
State idsAtOpen;
int errnoAtOpen = -1;

void noteOpen(const char* path) {
  const int error = errno;
  if (watched == nullptr || std::strncmp(path, "/usr/qova/", 10) != 0) return;
  errnoAtOpen = error;
  idsAtOpen = currentIds();
  watched->all.push_back("open");
  errno = error;
}

// "priority line message", with errno where a line names its half.
std::vector<std::string> linesOf(const Unit& unit, const std::vector<test::LogLine>& lines) {
  std::vector<std::string> texts;
  for (const test::LogLine& line : lines) {
    const std::size_t colon = line.text.find(':');
    const std::size_t blank = line.text.find(' ');
    std::string message = line.text.substr(blank + 1);
    if (line.text.substr(0, colon) != unit.file) message += " from " + line.text.substr(0, colon);
    if (message.find("CriticalSection") != std::string::npos) {
      message += ", errno " + std::to_string(line.error);
    }
    texts.push_back(std::to_string(line.priority) + " " +
                    line.text.substr(colon + 1, blank - colon - 1) + " " + message);
  }
  return texts;
}

Outcome observe(const Unit& unit, const Plan& plan) {
  Outcome seen;
  test::IdsSpy spy;
  spy.failing = plan.failing;
  spy.allAfter = plan.allAfter;
  spy.error = plan.error;
  test::Log log;
  log.spoilErrno();
  watched = &spy;
  errno = 77;
  seen.value = unit.read();
  seen.errnoAfter = errno;
  watched = nullptr;
  seen.calls = spy.all;
  seen.changes = spy.changes.size();
  seen.log = linesOf(unit, log.lines());
  seen.atRead = idsAtOpen;
  seen.errnoAtRead = errnoAtOpen;
  seen.after = currentIds();
  return seen;
}

// As text, so that a difference can be read. The line numbers of the halves become their names.
std::string textOf(const Outcome& outcome, int enterLine, int leaveLine) {
  std::string text;
  for (const std::string& call : outcome.calls) text += "  " + call + "\n";
  for (const std::string& line : outcome.log) {
    const std::size_t first = line.find(' ') + 1;
    const std::size_t end = line.find(' ', first);
    const int number = std::stoi(line.substr(first, end - first));
    const std::string half = number == enterLine   ? "enter"
                             : number == leaveLine ? "leave"
                                                   : "line ?";
    text += "  log " + line.substr(0, first) + half + line.substr(end) + "\n";
  }
  text += "  at the read: " + textOf(outcome.atRead) + ", errno " +
          std::to_string(outcome.errnoAtRead) + "\n";
  text += "  after: " + textOf(outcome.after) + ", errno " + std::to_string(outcome.errnoAfter) +
          ", value \"" + outcome.value + "\"\n";
  return text;
}

int numberIn(const std::string& line) {
  return std::stoi(line.substr(line.find(' ') + 1));
}

// The line numbers that a unit's two halves log, learned from one construction of the usual kind.
struct Halves {
  int enter;
  int leave;
};

// --- the table

struct Tally {
  int runs = 0;
  int wrong = 0;
  std::string report;  // the first few differences
};

// Puts the ids of a process back; false if it can not.
bool reset(const State& state) {
  if (setresuid(0, 0, 0) != 0) return false;
  return setresgid(state.group.real, state.group.effective, state.group.saved) == 0 &&
         setresuid(state.user.real, state.user.effective, state.user.saved) == 0;
}

// Root may take any ids at all, so no row of the table can be missing.
bool hasIds(const State& state) {
  const State now = currentIds();
  return now.user == state.user && now.group == state.group;
}

void checkOne(const Unit& unit, const State& state, const Plan& plan, const Halves& halves,
              Tally* tally) {
  const Outcome expected = Model(state, plan).run();
  const Outcome seen = observe(unit, plan);
  const std::string wanted = textOf(expected, 1, 2);
  const std::string got = textOf(seen, halves.enter, halves.leave);
  ++tally->runs;
  if (wanted == got) return;
  if (++tally->wrong > 3) return;
  tally->report += textOf(state) + ", change " + std::to_string(plan.failing) +
                   (plan.allAfter ? " and all after it" : "") + " failing: should be\n" + wanted +
                   "and is\n" + got;
}

std::vector<Plan> plansFor(const State& state) {
  const int kErrors[] = {EAGAIN, EINVAL, ENOSYS, 9999};
  std::vector<Plan> plans = {{0, false, 0}};
  const std::size_t changes = Model(state, plans[0]).run().changes;
  for (std::size_t nth = 1; nth <= changes; ++nth) {
    for (const bool all : {false, true}) plans.push_back({nth, all, kErrors[plans.size() % 4]});
  }
  return plans;
}

std::string packed(const Tally& tally) {
  return std::to_string(tally.runs) + " " + std::to_string(tally.wrong) + " " + tally.report;
}

void add(const std::string& text, Tally* tally) {
  std::size_t end = 0;
  const std::size_t blank = text.find(' ');
  if (blank == std::string::npos) return;  // the child process has said why
  tally->runs += std::stoi(text);
  tally->wrong += std::stoi(text.substr(blank + 1), &end);
  const std::string report = text.substr(blank + 1 + end + 1);
  if (tally->report.size() < 4000) tally->report += report;
}

// All plans in one process if it can get its ids back, otherwise in one each.
void checkState(const Unit& unit, const State& state, const Halves& halves, Tally* tally) {
  const std::vector<Plan> plans = plansFor(state);
  const bool returns = state.user.real == 0 || state.user.effective == 0 || state.user.saved == 0;
  for (std::size_t next = 0; next < plans.size();) {
    const std::size_t end = returns ? plans.size() : next + 1;
    add(test::asProcess(state.user, state.group,
                        [&] {
                          Tally own;
                          for (std::size_t i = next; i < end; ++i) {
                            EXPECT_TRUE((i == next || reset(state)) && hasIds(state))
                                << textOf(state);
                            checkOne(unit, state, plans[i], halves, &own);
                          }
                          return packed(own);
                        }),
        tally);
    next = end;
  }
}

Halves learn(const Unit& unit) {
  const std::string lines = test::asProcess({1001, 1001, 0}, {1001, 1001, 0}, [&] {
    const Outcome usual = observe(unit, {0, false, 0});
    if (usual.log.size() != 3) return std::string("0 0");
    return std::to_string(numberIn(usual.log[0])) + " " + std::to_string(numberIn(usual.log[2]));
  });
  return {std::stoi(lines), numberIn(lines)};
}

std::vector<Ids> allIds() {
  std::vector<Ids> all;
  for (const unsigned real : kAnyId) {
    for (const unsigned effective : kAnyId) {
      for (const unsigned saved : kAnyId) all.push_back({real, effective, saved});
    }
  }
  return all;
}

void checkTable(const Unit& unit) {
  test::writeConfig(unit.config, unit.text);
  const Halves halves = learn(unit);
  EXPECT_GT(halves.enter, 0);
  EXPECT_GT(halves.leave, halves.enter);
  Tally tally;
  int states = 0;
  for (const Ids& user : allIds()) {
    for (const Ids& group : allIds()) {
      checkState(unit, {user, group}, halves, &tally);
      ++states;
    }
  }
  EXPECT_EQ(states, 729);
  EXPECT_GT(tally.runs, 5 * states);
  EXPECT_EQ(tally.wrong, 0) << tally.report;
  std::cout << unit.file << ": " << states << " sets of ids, " << tally.runs << " constructions, "
            << tally.wrong << " wrong\n";
}

TEST(GuardTable, HoldsForTheProfile) {
  checkTable(kProfile);
}
TEST(GuardTable, HoldsForTheAzureClient) {
  checkTable(kAzure);
}
TEST(GuardTable, HoldsForTheWebSphereClient) {
  checkTable(kWebSphere);
}

}  // namespace

extern "C" __attribute__((visibility("default"))) int open(const char* path, int flags, ...) {
  noteOpen(path);
  va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = (flags & O_CREAT) != 0 ? va_arg(arguments, mode_t) : 0;
  va_end(arguments);
  return openat(AT_FDCWD, path, flags, mode);
}
