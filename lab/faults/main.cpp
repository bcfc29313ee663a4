// Runs every operation of the library with each allocation, and each call that can fail, failing
// once: alone, and with all that follow. After each run: the outcome is one of those expected,
// nothing was kept (memory, descriptors), the process ids are what the guard leaves, and the
// system log holds the library's own lines alone. Each operation runs in its own process.
//   fault_test [--every N] [--fresh N] [--measured] [NAME...]
// NAME limits it to operations that begin so; --every N takes every N-th allocation of those that
// talk TLS, --fresh N of those in fresh processes. --measured: the library carries a run time of
// the compiler's that measures, with its own imports.
#include <curl/curl.h>
#include <cxxabi.h>
#include <dirent.h>
#include <dlfcn.h>
#include <execinfo.h>
#include <sys/mman.h>
#include <sys/time.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <map>
#include <set>
#include <stdexcept>
#include <typeinfo>

#include "faults/exports.h"
#include "faults/lines.h"
#include "faults/operation.h"
#include "support/device.h"
#include "support/support_call.h"

namespace faults {
namespace {

constexpr unsigned kUser = 1001;
constexpr unsigned kGroup = 2002;
constexpr int kSlice = 40;          // seconds that one process runs; the provider lives for 100
constexpr long kMostRuns = 200000;  // of one operation
const char kBadAlloc[] = "std::bad_alloc: std::bad_alloc";

long every = 1;
long everyFresh = 1;
bool measured = false;

// What a child process reports to its parent, and where it was when it died.
struct Report {
  Plan next;  // where to go on
  bool finished;
  bool cold;
  long passed;
  long failed;
  long once;         // runs that kept memory, and kept none when they were repeated: caches
  long foreign[4];   // crashes underneath that are known, by their number
  char crash[1000];  // where the last process crashed
  char owners[600];
  char text[4000];
  Called called[64];
};
Report* report = nullptr;

void complain(const std::string& text) {
  const std::size_t used = std::strlen(report->text);
  std::snprintf(report->text + used, sizeof report->text - used, "%s\n", text.c_str());
}

bool matches(const std::string& outcome, const std::string& pattern) {
  if (!pattern.empty() && pattern.back() == '*') {
    return outcome.compare(0, pattern.size() - 1, pattern, 0, pattern.size() - 1) == 0;
  }
  return outcome == pattern;
}

bool anyMatches(const std::string& outcome, const Outcomes& patterns) {
  return std::any_of(patterns.begin(), patterns.end(),
                     [&](const std::string& pattern) { return matches(outcome, pattern); });
}

std::string textOf(const Plan& plan, const char* name) {
  return std::string(plan.kind == Kind::kMemory ? "allocation " : "call ") +
         std::to_string(plan.nth) + (plan.allAfter ? " and all after it" : "") + " (" + name + ")";
}

// The outcome is expected for the function that failed; when more than one kind of function
// failed, for any of them.
bool isLaidDown(const Operation& operation, const Plan& plan, const Seen& what,
                const std::string& outcome) {
  if (!what.hit) return matches(outcome, operation.good);
  if (plan.kind == Kind::kMemory) {
    const auto found = operation.on.find("memory");
    return matches(outcome, operation.good) || matches(outcome, kBadAlloc) ||
           (found != operation.on.end() && anyMatches(outcome, found->second));
  }
  const auto found = operation.on.find(what.name);
  const auto together = operation.on.find(std::string(what.name) + "+");
  if (plan.allAfter && together != operation.on.end()) return anyMatches(outcome, together->second);
  if (!plan.allAfter) {
    return found == operation.on.end() ? matches(outcome, operation.good)
                                       : anyMatches(outcome, found->second);
  }
  return matches(outcome, operation.good) ||
         std::any_of(operation.on.begin(), operation.on.end(), [&](const auto& each) {
           return each.first != "memory" && anyMatches(outcome, each.second);
         });
}

// --- the system log

// The first of the guard's changes that failed, and the line that ends its half.
void checkGuardLines(const Seen& what, Run* run) {
  static const struct {
    std::string change;
    const char* half;
  } kChanges[] = {{"setresgid(-1, 0, -1)", "ENTER"},
                  {"setresuid(-1, 0, -1)", "ENTER"},
                  {"setresuid(-1, 0, -1)", "LEAVE"},
                  {"setresgid(-1, " + std::to_string(kGroup) + ", -1)", "LEAVE"},
                  {"setresuid(-1, " + std::to_string(kUser) + ", -1)", "LEAVE"}};
  const auto& changed = kChanges[(what.idsChange - 1) % 5];
  const std::string first = " ERROR: " + changed.change + " [Resource temporarily unavailable]";
  const std::string second = std::string(" ERROR: ") + changed.half + "CriticalSection";
  const auto endsWith = [](const std::string& text, const std::string& end) {
    return text.size() > end.size() && text.compare(text.size() - end.size(), end.size(), end) == 0;
  };
  const auto& lines = run->lines();
  bool found = false;
  for (std::size_t i = 0; !found && i + 1 < lines.size(); ++i) {
    found = endsWith(lines[i].text, first) && endsWith(lines[i + 1].text, second);
  }
  run->expect(found, "the log does not say" + first + " and" + second);
}

void checkLog(const Operation& operation, const Plan& plan, const Seen& what, Run* run) {
  for (const test::LogLine& line : run->lines()) {
    run->expect(isOwn(line), "a strange line in the log: " + line.text);
  }
  if (operation.quiet) run->expect(run->lines().empty(), "the log is for the callers");
  // Keys that a failure kept away were asked for, and the fetch that failed was logged.
  const std::string no_key = "std::invalid_argument: kid does not exist in Azure verified kyes";
  const bool kept_away = run->outcome() == no_key && operation.good != no_key;
  run->expect(
      !kept_away || std::any_of(run->lines().begin(), run->lines().end(),
                                [](const test::LogLine& line) { return line.priority == LOG_ERR; }),
      "the log does not say why there are no keys");
  if (!what.hit || plan.kind == Kind::kMemory || operation.quiet) return;
  if (what.idsChange != 0) checkGuardLines(what, run);
  const std::vector<Line> wanted = calledFor(what.name, plan.allAfter);
  run->expect(wanted.empty() || run->hasLine(wanted),
              "the log does not say that " + std::string(what.name) + " failed");
}

// --- process ids

struct EffectiveIds {
  unsigned user;
  unsigned group;
};

// What the guard leaves. Its changes are, in the usual case: group up, user up, user up again,
// group back, user back; the ids depend on which of them failed. Exhausted memory between its
// halves, and nothing else, leaves the ids raised.
EffectiveIds expectedIds(const Plan& plan, const Seen& what, const Run& run) {
  const EffectiveIds own = {kUser, kGroup};
  const bool left = !run.returned() && run.outcome() == kBadAlloc && plan.kind == Kind::kMemory;
  if (what.idsChange == 0) return left && what.looks % 2 != 0 ? EffectiveIds{0, 0} : own;
  switch ((what.idsChange - 1) % 5 + 1) {
    case 2:
      return plan.allAfter ? EffectiveIds{kUser, 0} : own;
    case 3:
      return {0, 0};
    case 4:
      return {0, 0};
    case 5:
      return {0, kGroup};
    default:
      return own;
  }
}

void checkIds(const Plan& plan, const Seen& what, Run* run) {
  const EffectiveIds expected = expectedIds(plan, what, *run);
  run->expect(geteuid() == expected.user && getegid() == expected.group,
              "the ids are " + std::to_string(geteuid()) + "/" + std::to_string(getegid()) +
                  " instead of " + std::to_string(expected.user) + "/" +
                  std::to_string(expected.group));
  const unsigned keep = static_cast<unsigned>(-1);
  if (setresuid(keep, 0, keep) != 0 || setresgid(keep, kGroup, keep) != 0 ||
      setresuid(keep, kUser, keep) != 0) {
    abort();
  }
}

int openDescriptors() {
  DIR* const folder = opendir("/proc/self/fd");
  int count = 0;
  while (readdir(folder) != nullptr) ++count;
  closedir(folder);
  return count;
}

// --- runs

// No run may take longer than that of the processor's time.
void limitTime(int seconds) {
  itimerval limit = {};
  limit.it_value.tv_sec = seconds;
  setitimer(ITIMER_PROF, &limit, nullptr);
}

// One run; true if it was as it should be. `more` blocks of memory stay behind it.
bool runOnce(const Operation& operation, const Plan& plan, bool* hit, long* more) {
  Run run(plan);
  const long kept_before = kept().blocks;
  const int before = openDescriptors();
  limitTime(5);
  operation.body(run);
  limitTime(0);
  const Seen what = seen();
  *more = kept().blocks - kept_before;
  checkLog(operation, plan, what, &run);
  checkIds(plan, what, &run);
  run.forgetLines();
  run.expect(openDescriptors() == before, "a descriptor is left open");
  run.expect(isLaidDown(operation, plan, what, run.outcome()),
             "the outcome is \"" + run.outcome() + "\"");
  *hit = what.hit;
  if (run.complaints().empty()) return true;
  complain("  " + operation.name + ", " + textOf(plan, what.name) + ":\n" + run.complaints());
  return false;
}

void addOwner(const std::string& owner) {
  const std::string name = " " + owner.substr(owner.rfind('/') + 1);
  if (std::strstr(report->owners, name.c_str()) != nullptr) return;
  const std::size_t used = std::strlen(report->owners);
  std::snprintf(report->owners + used, sizeof report->owners - used, "%s", name.c_str());
}

// Whether memory stays behind every time. A cache is filled once; OpenSSL's queue of errors has
// room for 16, each with texts.
bool leaks(const Operation& operation, const Plan& plan) {
  const std::string owner = kept().owner;
  long more = 0;
  for (int again = 0; again < 20; ++again) {
    bool hit = false;
    runOnce(operation, plan, &hit, &more);
    if (more > 0) continue;
    ++report->once;
    addOwner(owner);
    return false;
  }
  complain("  " + operation.name + ", " + textOf(plan, seen().name) + ": " + std::to_string(more) +
           " blocks of memory stay, of " + owner);
  return true;
}

// The plan after this one; false when that was the last.
bool advance(const Operation& operation, bool hit, Plan* plan) {
  const bool tls = operation.server == Operation::Server::kTls ||
                   operation.server == Operation::Server::kStranger;
  const bool many = tls && plan->kind == Kind::kMemory;
  const long step = report->cold ? everyFresh : many ? every : 1;
  plan->nth += step;
  if (hit) return true;
  plan->nth = 1;
  if (!plan->allAfter) {
    plan->allAfter = true;
  } else if (plan->kind == Kind::kMemory) {
    *plan = {Kind::kCall, 1, false};
  } else {
    return false;
  }
  return true;
}

void warmUp(const Operation& operation) {
  long more = 0;
  for (int i = 0; i < 20; ++i) {
    bool hit = false;
    if (!runOnce(operation, {Kind::kMemory, 0, false}, &hit, &more)) ++report->failed;
  }
  if (more > 0) {
    ++report->failed;
    complain("  " + operation.name + ": keeps memory, of " + kept().owner);
  }
}

void count(bool good, bool hit) {
  if (!good) {
    ++report->failed;
  } else if (hit) {  // otherwise there are no more calls: nothing was injected
    ++report->passed;
  }
}

// As many plans as fit into a slice of time.
void runWarm(const Operation& operation) {
  const time_t start = time(nullptr);
  warmUp(operation);
  while (report->failed < 5 && time(nullptr) - start < kSlice) {
    bool hit = false;
    long more = 0;
    const Plan plan = report->next;
    bool good = runOnce(operation, plan, &hit, &more);
    if (good && more > 0) good = !leaks(operation, plan);
    count(good, hit);
    if (advance(operation, hit, &report->next)) continue;
    report->finished = true;
    return;
  }
}

// One plan, in a process in which the libraries have done nothing yet. What they set up for
// good is not told apart from what they lose, so memory is not looked at.
void runCold(const Operation& operation) {
  ignoreMemory();
  bool hit = false;
  long more = 0;
  const bool good = runOnce(operation, report->next, &hit, &more);
  count(good, hit);
  report->finished = !advance(operation, hit, &report->next);
}

// How a process ends by the fault of a library underneath, and of no caller: `where` is the way
// down to the crash, from its innermost frame on, or for a loop (SIGPROF) a part of it.
struct KnownCrash {
  int number;
  const char* where;
  const char* what;
  bool fresh;  // in fresh processes alone
  long most;   // in a whole run: twice what was seen
};
const KnownCrash kKnownCrashes[] = {
    {SIGSEGV,
     ", libcrypto.so.3 CRYPTO_THREAD_read_lock, libcrypto.so.3 ?, libcrypto.so.3 "
     "RAND_get0_primary",
     "OpenSSL locks a part of its context that it could not make", true, 98},
    {SIGABRT, ", libcurl.so.4 ?, libcurl.so.4 ?, libcurl.so.4 ?, libcurl.so.4 curl_easy_cleanup",
     "libcurl frees a TLS session twice that it could not remember", false, 14},
    {SIGPROF, ", libcurl.so.4 curl_easy_perform",
     "libcurl goes on for ever with a transfer over TLS", false, 8},
};

// How often it may come: in a run of every n-th failure an n-th of that, and three by chance.
long mostOf(const KnownCrash& known) {
  const long step = known.fresh ? everyFresh : std::min(every, everyFresh);
  return std::min(known.most, known.most / step + 3);
}

// Notes where a process crashed, the frames of the system's and the test's own left out; the
// process ends as it would have.
void noteCrash(int number) {
  const test::SupportCall support_call;
  void* frames[40];
  const int depth = backtrace(frames, 40);
  for (int i = 0; i < depth; ++i) {
    Dl_info info;
    if (dladdr(frames[i], &info) == 0) continue;
    const char* const slash = std::strrchr(info.dli_fname, '/');
    const char* const file = slash != nullptr ? slash + 1 : info.dli_fname;
    if (std::strcmp(file, "libc.so.6") == 0 || std::strcmp(file, "fault_test") == 0) continue;
    const std::size_t used = std::strlen(report->crash);
    std::snprintf(report->crash + used, sizeof report->crash - used, ", %s %s", file,
                  info.dli_sname != nullptr ? info.dli_sname : "?");
  }
  std::signal(number, SIG_DFL);
  raise(number);
}

// Whether that is a known crash; it is counted then.
bool isKnownCrash(int number) {
  const std::string where = report->crash;
  for (std::size_t i = 0; i < std::size(kKnownCrashes); ++i) {
    const KnownCrash& known = kKnownCrashes[i];
    const std::size_t found = where.find(known.where);
    if (number != known.number || found == std::string::npos || (known.fresh && !report->cold) ||
        (number != SIGPROF && found != 0) || where.find("libssoclient") < found) {
      continue;
    }
    ++report->foreign[i];
    return true;
  }
  return false;
}

void watchForCrashes() {
  void* frames[1];
  backtrace(frames, 1);  // loads what it needs
  std::signal(SIGSEGV, noteCrash);
  std::signal(SIGABRT, noteCrash);
  std::signal(SIGPROF, noteCrash);
}

[[noreturn]] void child(const Operation& operation) {
  watchForCrashes();
  if (setresgid(kGroup, kGroup, 0) != 0 || setresuid(kUser, kUser, 0) != 0) _exit(2);
  alarm(90);
  report->cold ? runCold(operation) : runWarm(operation);
  const auto called = calledSoFar();
  for (const Called& each : called) {
    for (Called& known : report->called) {
      if (known.name != nullptr && known.name != each.name) continue;
      known.name = each.name;
      known.times += each.times;
      break;
    }
  }
  std::fflush(nullptr);
  leaveProvider();
  if (setresuid(0, 0, 0) == 0 && setresgid(0, 0, 0) == 0) exit(0);  // keeps coverage counts
  _exit(0);
}

// A process that did not end by itself.
void noteEnd(const Operation& operation, int status) {
  if (WIFSIGNALED(status) && isKnownCrash(WTERMSIG(status))) return;
  ++report->failed;
  complain("  " + operation.name + (report->cold ? " [fresh]" : "") + ": ended by " +
           (WIFSIGNALED(status) ? "signal " + std::to_string(WTERMSIG(status))
                                : "status " + std::to_string(WEXITSTATUS(status))) +
           (report->cold ? " at " : " after ") + textOf(report->next, "?") + report->crash);
}

// Runs the operation to the end, in one process after the other.
void runAll(const Operation& operation, bool cold) {
  report->next = {Kind::kMemory, 1, false};
  report->finished = false;
  report->cold = cold;
  const long failedBefore = report->failed;
  time_t started = 0;
  while (!report->finished && report->failed < failedBefore + 5) {
    if (report->passed > kMostRuns) {
      ++report->failed;
      complain("  " + operation.name + ": does not come to an end");
      break;
    }
    if (time(nullptr) - started > (cold ? kSlice : 0)) {
      startProvider(operation.server);
      if (operation.configure) operation.configure();
      started = time(nullptr);
    }
    std::fflush(nullptr);
    report->crash[0] = '\0';
    const pid_t process = fork();
    if (process == 0) child(operation);
    int status = 0;
    waitpid(process, &status, 0);
    if (status == 0) continue;
    noteEnd(operation, status);
    bool hit = true;
    if (!advance(operation, hit, &report->next)) break;
  }
  stopProvider();
}

struct Totals {
  long passed = 0;
  long failed = 0;
  long foreign = 0;  // ended by a known fault underneath
  std::set<std::string> owners;
};

void runOperation(const Operation& operation, bool cold, Totals* totals) {
  report->passed = report->failed = report->once = 0;
  report->text[0] = report->owners[0] = '\0';
  runAll(operation, cold);
  std::printf("%7ld of %7ld  %s%s\n%s", report->passed, report->passed + report->failed,
              operation.name.c_str(), cold ? " [fresh processes]" : "", report->text);
  std::fflush(stdout);
  if (report->passed + report->failed == 0) {
    static const std::set<std::string> kNothing = {
        "SSOClient::isEnable",       "SSOClient::GetToken",     "SSOClient::SetCode",
        "SSOClient::SetRedirectURI", "SSOProfile::SSOIsEnable", "SSOProfile::GetSSOProfile",
        "SSOProfile::GetSSOClient"};  // they take no memory and make no call
    if (kNothing.count(operation.name) == 0) {
      std::printf("  %s: nothing was injected\n", operation.name.c_str());
      ++totals->failed;
    }
  }
  totals->passed += report->passed;
  totals->failed += report->failed;
  const std::string owners = report->owners;
  for (std::size_t at = 0; at < owners.size();) {
    const std::size_t end = std::min(owners.find(' ', at + 1), owners.size());
    totals->owners.insert(owners.substr(at + 1, end - at - 1));
    at = end;
  }
}

// A fault underneath that comes more often than it did is a failure: it may be another one, or
// the library's.
void limitKnownCrashes(Totals* totals) {
  for (std::size_t i = 0; i < std::size(kKnownCrashes); ++i) {
    const long seen_times = report->foreign[i];
    const long most = mostOf(kKnownCrashes[i]);
    std::printf("known fault, %ld times of at most %ld: %s\n", seen_times, most,
                kKnownCrashes[i].what);
    totals->foreign += seen_times;
    if (seen_times > most) ++totals->failed;
  }
}

void printTotals(const Totals& totals) {
  std::printf("calls seen while something could fail:");
  for (const Called& each : report->called) {
    if (each.name != nullptr) std::printf(" %s %ld", each.name, each.times);
  }
  std::printf("\nmemory kept once and not again, of:");
  for (const std::string& owner : totals.owners) std::printf(" %s", owner.c_str());
  std::printf("\n");
  std::printf("%ld passed, %ld failed, %ld ended by a known fault underneath\n", totals.passed,
              totals.failed, totals.foreign);
}

void compare(const char* what, const Compared& compared, Totals* totals) {
  const long missing = static_cast<long>(compared.missing.size());
  std::printf("%7ld of %7ld  %s of the library are dealt with\n", compared.all - missing,
              compared.all, what);
  for (const std::string& name : compared.missing) std::printf("  not: %s\n", name.c_str());
  totals->passed += compared.all - missing;
  totals->failed += missing + (compared.all == 0 ? 1 : 0);
}

int injectFaults(const std::vector<std::string>& names) {
  test::requireSandbox();
  prepare();
  report = static_cast<Report*>(
      mmap(nullptr, sizeof *report, PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0));
  makeFixtures();
  Totals totals;
  std::set<std::string> covered;
  for (const Operation& operation : operations()) {
    covered.insert(operation.name.substr(0, operation.name.find(',')));
    const bool wanted =
        names.empty() || std::any_of(names.begin(), names.end(), [&](const std::string& name) {
          return operation.name.compare(0, name.size(), name) == 0;
        });
    if (!wanted) continue;
    runOperation(operation, false, &totals);
    if (operation.cold) runOperation(operation, true, &totals);
  }
  compare("exports", compareExports(covered), &totals);
  if (!measured) compare("imports", compareImports(), &totals);
  limitKnownCrashes(&totals);
  printTotals(totals);
  return totals.failed == 0 ? 0 : 1;
}

}  // namespace

void Run::armed(const std::function<void()>& call) {
  const test::Log log;
  {
    const Armed now(plan);
    try {
      call();
      back = true;
      result = "ok";
    } catch (const std::exception& e) {
      const test::SupportCall support_call;
      int status = 0;
      char* const name = abi::__cxa_demangle(typeid(e).name(), nullptr, nullptr, &status);
      result = std::string(name) + ": " + e.what();
      std::free(name);
    }
  }
  written = log.lines();
}

bool Run::hasLine(const std::vector<Line>& any) const {
  return std::any_of(written.begin(), written.end(), [&](const test::LogLine& line) {
    return std::any_of(any.begin(), any.end(), [&](const Line& each) { return is(line, each); });
  });
}

void Run::logged(const std::vector<Line>& any) {
  const auto errors = std::count_if(written.begin(), written.end(), [](const test::LogLine& line) {
    return line.priority == LOG_ERR;
  });
  expect(any.empty() ? errors == 0 : errors == 1 && hasLine(any),
         any.empty() ? "there is an error in the log, and none was met"
                     : "the log does not hold the one line about what was met");
}

void Run::gave(const std::string& text) {
  result = "ok: " + text;
}

void Run::expect(bool good, const std::string& what) {
  if (!good) wrong += "    " + what + "\n";
}

}  // namespace faults

int main(int argc, char** argv) {
  std::vector<std::string> names;
  for (int i = 1; i < argc; ++i) {
    if (std::strcmp(argv[i], "--every") == 0 && i + 1 < argc) {
      faults::every = std::max(1L, std::atol(argv[++i]));
    } else if (std::strcmp(argv[i], "--fresh") == 0 && i + 1 < argc) {
      faults::everyFresh = std::max(1L, std::atol(argv[++i]));
    } else if (std::strcmp(argv[i], "--measured") == 0) {
      faults::measured = true;
    } else {
      names.emplace_back(argv[i]);
    }
  }
  return faults::injectFaults(names);
}
