#include "habits.h"

#include <dirent.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/time.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <clocale>
#include <cstdio>
#include <cstdlib>
#include <utility>

#include "trial.h"

extern char** environ;

namespace port {

namespace {

std::string Told(const Result& result) {
  return result.ok ? "success with " + Shown(result.bytes) : "failure";
}

bool Same(const Result& a, const Result& b) {
  return a.ok == b.ok && (!a.ok || a.bytes == b.bytes);
}

size_t Entries(const char* folder) {
  DIR* directory = opendir(folder);
  size_t count = 0;
  while (directory != nullptr && readdir(directory) != nullptr) ++count;
  if (directory != nullptr) closedir(directory);
  return count;
}

std::string Ids() {
  uid_t real, effective, saved;
  gid_t real_group, effective_group, saved_group;
  if (getresuid(&real, &effective, &saved) != 0) return "";
  if (getresgid(&real_group, &effective_group, &saved_group) != 0) return "";
  std::string ids;
  for (const auto id : {real, effective, saved, real_group, effective_group, saved_group}) {
    ids += std::to_string(id) + " ";
  }
  return ids;
}

std::string SignalActions() {
  std::string actions;
  for (int number = 1; number < NSIG; ++number) {
    struct sigaction action;
    if (sigaction(number, nullptr, &action) != 0) continue;
    actions += std::to_string(number) + ":" +
               std::to_string(reinterpret_cast<size_t>(action.sa_sigaction)) + " ";
  }
  return actions;
}

std::string BlockedSignals() {
  sigset_t blocked;
  sigprocmask(SIG_SETMASK, nullptr, &blocked);
  std::string numbers;
  for (int number = 1; number < NSIG; ++number) {
    if (sigismember(&blocked, number) == 1) numbers += std::to_string(number) + " ";
  }
  return numbers;
}

std::string Timer() {
  itimerval timer;
  getitimer(ITIMER_REAL, &timer);
  return timer.it_value.tv_sec != 0 || timer.it_value.tv_usec != 0 ? "set" : "not set";
}

std::string Environment() {
  std::string all;
  for (char** entry = environ; entry != nullptr && *entry != nullptr; ++entry) {
    all += std::string(*entry) + "\n";
  }
  return all;
}

std::string WorkingFolder() {
  char path[4096];
  return getcwd(path, sizeof path) == nullptr ? "" : path;
}

std::string FileMask() {
  const mode_t mask = umask(0);
  umask(mask);
  return std::to_string(mask);
}

std::string Children() {
  return waitpid(-1, nullptr, WNOHANG) < 0 && errno == ECHILD ? "none" : "some";
}

using Traits = std::vector<std::pair<const char*, std::string>>;

Traits ProcessTraits() {
  return {{"the user or group ids", Ids()},
          {"the locale", setlocale(LC_ALL, nullptr)},
          {"what signals do", SignalActions()},
          {"which signals are blocked", BlockedSignals()},
          {"the alarm timer", Timer()},
          {"the environment", Environment()},
          {"the working directory", WorkingFolder()},
          {"the file mode mask", FileMask()},
          {"the number of threads", std::to_string(Entries("/proc/self/task"))},
          {"the child processes", Children()}};
}

void CallRounds(Call call, const Platform& platform, const Options& options, unsigned rounds) {
  Arguments memory;
  for (unsigned i = 0; i < rounds * kCalls; ++i) call(platform, options, memory, i % kCalls);
}

void CheckNothingPrinted() {
  fflush(stdout);
  struct stat output;
  Expect(fstat(STDOUT_FILENO, &output) == 0, "closed the standard output");
  Expect(output.st_size == 0, "printed " + std::to_string(output.st_size) +
                                  " bytes to the standard output, where the web server reads");
}

size_t ResidentKilobytes() {
  size_t total = 0, resident = 0;
  FILE* file = fopen("/proc/self/statm", "r");
  if (file == nullptr || fscanf(file, "%zu %zu", &total, &resident) != 2) NotJudged("no /proc");
  fclose(file);
  return resident * static_cast<size_t>(sysconf(_SC_PAGESIZE)) / 1024;
}

}  // namespace

void CheckRepeat(Call call, const Platform& platform, const Options& options) {
  Arguments memory;
  std::vector<Result> first;
  for (unsigned which = 0; which < kCalls; ++which) {
    errno = 0;
    first.push_back(call(platform, options, memory, which));
  }
  unsigned which = 0;
  for (unsigned i = 0; i < 2000; ++i) {
    which = (which * 5 + 3 + i / kCalls) % kCalls;  // each of them after each other one
    errno = i % 3 == 0 ? 0 : i % 3 == 1 ? ERANGE : ENOENT;
    const Result now = call(platform, options, memory, which);
    Expect(Same(now, first[which]),
           "first " + Told(first[which]) + ", after other calls " + Told(now));
  }
}

void CheckPointers(Call call, const Platform& platform, const Options& options) {
  for (unsigned i = 0; i < 4 * kCalls; ++i) {
    // Never given back: the same addresses must not serve again.
    Arguments& memory = *new Arguments;
    call(platform, options, memory, i * 3 % kCalls);
    memory.in.Lock();
    memory.out.Lock();
  }
}

void CheckProcess(Call call, const Platform& platform, const Options& options) {
  const Traits before = ProcessTraits();
  Arguments memory;
  for (unsigned which = 0; which < kCalls; ++which) {
    call(platform, options, memory, which);
    const Traits after = ProcessTraits();
    for (size_t i = 0; i < before.size(); ++i) {
      Expect(before[i].second == after[i].second, std::string("changed ") + before[i].first);
    }
  }
  CheckNothingPrinted();
  // A connection that is kept is not a leak.
  const size_t open = Entries("/proc/self/fd");
  CallRounds(call, platform, options, 10);
  Expect(Entries("/proc/self/fd") <= open, "leaves files open with every call");
}

void CheckMemory(Call call, const Platform& platform, const Options& options) {
  constexpr unsigned kRounds = 100000 / kCalls, kWarmUp = 500;
  using Clock = std::chrono::steady_clock;
  const Clock::time_point end = Clock::now() + std::chrono::seconds(options.seconds / 2);
  CallRounds(call, platform, options, kWarmUp);
  const size_t before = ResidentKilobytes();
  unsigned rounds = 0;
  while (rounds < kRounds && (Clock::now() < end || rounds < kWarmUp)) {
    CallRounds(call, platform, options, 100);
    rounds += 100;
  }
  const size_t after = ResidentKilobytes();
  const size_t grown = after > before ? after - before : 0;
  // A byte a call, and what the C library may take in one piece.
  Expect(grown < 256 + rounds * kCalls / 1024, "grew by " + std::to_string(grown) + " KB over " +
                                                   std::to_string(rounds * kCalls) + " calls");
}

}  // namespace port
