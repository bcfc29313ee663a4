// ssoclient-port-check: checks a device's own platform functions against platform/platform.h.
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <stdexcept>

#include "contract.h"
#include "trial.h"

namespace {

using port::Function;
using port::Line;
using port::Options;
using port::Outcome;
using port::Verdict;

constexpr char kUsage[] =
    "Usage: ssoclient-port-check [OPTION...] FILE\n"
    "Checks the four platform functions in a shared library against platform/platform.h.\n"
    "  --name NAME      a user that the device's directory knows, DNS-DOMAIN\\account\n"
    "                   (AD.EXAMPLE.NET\\alice)\n"
    "  --result NAME    what the conversion must make of it\n"
    "  --only ID        the lines whose id begins with ID (see --list)\n"
    "  --seconds N      limit for each line of the contract (30)\n"
    "  --list           prints the lines and checks nothing\n"
    "Exit status: 0 the contract is kept, 1 it is broken, 2 it could not be checked whole.\n";

enum { kKept = 0, kBroken = 1, kNotChecked = 2 };

struct Totals {
  unsigned kept = 0, broken = 0, not_judged = 0;
};

std::vector<Function> Contract() {
  return {port::EncodeLines(), port::DecodeLines(), port::URLLines(), port::NameLines()};
}

void List() {
  for (const Function& function : Contract()) {
    for (const Line& line : function.lines) printf("%-16s %s\n", line.id, line.text);
  }
}

void Print(const Line& line, const Outcome& outcome) {
  const char* mark = outcome.verdict == Verdict::kKept     ? "kept"
                     : outcome.verdict == Verdict::kBroken ? "BROKEN"
                                                           : "not judged";
  printf("  %-10s  %-15s  %s\n", mark, line.id, line.text);
  if (!outcome.detail.empty()) printf("  %29s> %s\n", "", outcome.detail.c_str());
  fflush(stdout);
}

// Checks the lines of a function that are asked for.
void CheckFunction(const Function& function, const Options& options, Totals& totals) {
  bool headed = false;
  for (const Line& line : function.lines) {
    if (std::string(line.id).compare(0, options.only.size(), options.only) != 0) continue;
    if (!headed) printf("\n%s\n", function.name);
    headed = true;
    const Outcome outcome = port::Try(line, options);
    Print(line, outcome);
    totals.kept += outcome.verdict == Verdict::kKept;
    totals.broken += outcome.verdict == Verdict::kBroken;
    totals.not_judged += outcome.verdict == Verdict::kNotJudged;
  }
}

int Conclude(const Totals& totals) {
  const unsigned all = totals.kept + totals.broken + totals.not_judged;
  printf("\n%u of %u lines of the contract are kept, %u broken, %u not judged. ", totals.kept, all,
         totals.broken, totals.not_judged);
  if (totals.broken > 0) {
    puts("The library must not be used with these functions.");
    return kBroken;
  }
  const bool complete = all > 0 && totals.not_judged == 0;
  puts(complete ? "The functions keep the contract." : "The check is not complete.");
  return complete ? kKept : kNotChecked;
}

int Check(const Options& options) {
  const Outcome loaded = port::TryToLoad(options);
  if (loaded.verdict == Verdict::kNotJudged) {
    fprintf(stderr, "ssoclient-port-check: %s\n", loaded.detail.c_str());
    if (options.file.substr(options.file.find_last_of('.') + 1) == "a") {
      fputs("For an archive: cmake -S platform/check -B build/port-check -DPLATFORM=FILE\n",
            stderr);
    }
    return kNotChecked;
  }
  if (loaded.verdict == Verdict::kBroken) {
    printf("%s: %s\nThe library cannot be linked with it.\n", options.file.c_str(),
           loaded.detail.c_str());
    return kBroken;
  }
  printf("%s, with the user name %s\n", options.file.c_str(), options.name.c_str());
  Totals totals;
  for (const Function& function : Contract()) CheckFunction(function, options, totals);
  return Conclude(totals);
}

// The value of the option at `at`, which is moved on to it.
std::string Value(char** arguments, int& at) {
  if (arguments[at + 1] == nullptr) {
    throw std::invalid_argument(std::string(arguments[at]) + " needs a value");
  }
  return arguments[++at];
}

// The file as the loader wants it: a name without "/" would be looked for in its own path.
std::string Path(const std::string& file) {
  char* path = realpath(file.c_str(), nullptr);
  if (path == nullptr) throw std::invalid_argument(file + ": " + strerror(errno));
  std::string whole = path;
  free(path);
  return whole;
}

Options ReadOptions(char** arguments) {
  Options options;
  for (int at = 1; arguments[at] != nullptr; ++at) {
    const std::string argument = arguments[at];
    if (argument == "--name") {
      options.name = Value(arguments, at);
    } else if (argument == "--result") {
      options.result = Value(arguments, at);
    } else if (argument == "--only") {
      options.only = Value(arguments, at);
    } else if (argument == "--seconds") {
      options.seconds = static_cast<unsigned>(atoi(Value(arguments, at).c_str()));
    } else if (argument[0] == '-' || !options.file.empty()) {
      throw std::invalid_argument("unknown argument " + argument + "; try --help");
    } else {
      options.file = Path(argument);
    }
  }
  if (options.file.empty()) throw std::invalid_argument("needs a shared library; try --help");
  if (options.seconds == 0 || options.seconds > 3600) {
    throw std::invalid_argument("--seconds needs a number from 1 to 3600");
  }
  if (options.name.find('\\') == std::string::npos) {
    throw std::invalid_argument("--name needs DNS-DOMAIN\\account");
  }
  return options;
}

}  // namespace

int main(int argc, char** argv) {
  if (argc == 2 && strcmp(argv[1], "--help") == 0) return fputs(kUsage, stdout) < 0;
  if (argc == 2 && strcmp(argv[1], "--list") == 0) {
    List();
    return kKept;
  }
  try {
    return Check(ReadOptions(argv));
  } catch (const std::exception& error) {
    fprintf(stderr, "ssoclient-port-check: %s\n", error.what());
    return kNotChecked;
  }
}
