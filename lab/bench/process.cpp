// Runs programs in turn, round after round, and prints for each the microseconds from start to end
// and those of processor time, a line per round; last the peak resident memory of each in
// kilobytes. Each runs twice and the second run counts: what ran before it is then the same for
// all.
//   bench_process ROUNDS -- PROGRAM ARGUMENT... [-- PROGRAM ARGUMENT...]...
// A separate small program: the peak that the kernel reports for a child begins with its parent's.
#include <fcntl.h>
#include <spawn.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <vector>

namespace {

struct Program {
  std::vector<char*> arguments;
  long peak = 0;
};

[[noreturn]] void fail(const char* what) {
  std::fprintf(stderr, "bench_process: %s failed\n", what);
  std::exit(EXIT_FAILURE);
}

std::vector<Program> parse(char** argument) {
  std::vector<Program> programs;
  for (; *argument != nullptr; ++argument) {
    if (std::strcmp(*argument, "--") == 0) {
      programs.emplace_back();
    } else if (!programs.empty()) {
      programs.back().arguments.push_back(*argument);
    }
  }
  for (Program& program : programs) program.arguments.push_back(nullptr);
  return programs;
}

long long microseconds(const timeval& time) {
  return 1000000LL * time.tv_sec + time.tv_usec;
}

struct Taken {
  long long time;
  long long processor;
};

// One run, its output thrown away.
Taken run(Program& program, posix_spawn_file_actions_t* silence) {
  const auto begin = std::chrono::steady_clock::now();
  pid_t child = 0;
  if (posix_spawn(&child, program.arguments[0], silence, nullptr, program.arguments.data(),
                  environ) != 0) {
    fail(program.arguments[0]);
  }
  int status = 0;
  rusage usage = {};
  if (wait4(child, &status, 0, &usage) != child || status != 0) fail(program.arguments[0]);
  const auto end = std::chrono::steady_clock::now();
  program.peak = std::max(program.peak, usage.ru_maxrss);
  return {std::chrono::duration_cast<std::chrono::microseconds>(end - begin).count(),
          microseconds(usage.ru_utime) + microseconds(usage.ru_stime)};
}

}  // namespace

int main(int count, char** arguments) {
  if (count < 4) fail("no program; it");
  std::vector<Program> programs = parse(arguments + 2);
  posix_spawn_file_actions_t silence;
  posix_spawn_file_actions_init(&silence);
  posix_spawn_file_actions_addopen(&silence, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
  for (Program& program : programs) run(program, &silence);  // into the page cache
  for (long round = std::atol(arguments[1]); round > 0; --round) {
    for (Program& program : programs) {
      run(program, &silence);
      const Taken taken = run(program, &silence);
      std::printf("%lld %lld ", taken.time, taken.processor);
    }
    std::printf("\n");
  }
  for (const Program& program : programs) std::printf("%ld ", program.peak);
  std::printf("\n");
  posix_spawn_file_actions_destroy(&silence);
}
