// A benchmark program: one operation after another, timed from within, or counted by callgrind.
#pragma once

#include <valgrind/callgrind.h>

#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <fstream>
#include <functional>
#include <iterator>
#include <map>
#include <stdexcept>
#include <string>

namespace bench {

inline std::string contents(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  if (!file) throw std::runtime_error("cannot read " + path);
  return {std::istreambuf_iterator<char>(file), {}};
}

// What an operation needs, made by bench_material.
class Material {
 public:
  explicit Material(std::string path) : folder(std::move(path)) {}

  std::string operator[](const std::string& name) const { return contents(folder + "/" + name); }
  std::string url(const std::string& name) const { return "file://" + folder + "/" + name; }

 private:
  const std::string folder;
};

inline void require(bool good, const char* what) {
  if (good) return;
  std::fprintf(stderr, "bench: %s\n", what);
  std::exit(EXIT_FAILURE);
}

// Makes an operation ready; what it returns is the operation.
using Operation = std::function<void()>;
using Maker = std::function<Operation(const Material&)>;
using Makers = std::map<std::string, Maker>;

// The time that this process has had the processor for, in nanoseconds: other programs do not
// count.
inline double processorTime() {
  timespec now = {};
  clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &now);
  return 1e9 * static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec);
}

// Nanoseconds for one operation.
inline double time(const Operation& operation, long times) {
  operation();
  const double begin = processorTime();
  for (long i = 0; i < times; ++i) operation();
  return (processorTime() - begin) / static_cast<double>(times);
}

// Leaves the instructions of `times` operations in callgrind's output, under the operation's name;
// or, of a `first` one, with all that happens once only, as in a login program's process.
inline void count(const std::string& name, const Operation& operation, long times, bool first) {
  if (!first) operation();
  CALLGRIND_ZERO_STATS;
  for (long i = 0; i < times; ++i) operation();
  CALLGRIND_DUMP_STATS_AT(name.c_str());
}

// PROGRAM FOLDER time|count|first OPERATION:TIMES...; "time" prints the nanoseconds for each.
inline int run(int arguments_count, char** arguments, const Makers& makers) try {
  require(arguments_count >= 4, "arguments: FOLDER time|count|first OPERATION:TIMES...");
  const Material material(arguments[1]);
  const std::string way = arguments[2];
  for (int i = 3; i < arguments_count; ++i) {
    const std::string wanted = arguments[i];
    const size_t colon = wanted.find(':');
    require(colon != wanted.npos && std::atol(&wanted[colon + 1]) > 0, "how many times?");
    const long times = std::atol(&wanted[colon + 1]);
    const std::string name = wanted.substr(0, colon);
    const auto maker = makers.find(name);
    require(maker != makers.end(), "no such operation");
    const Operation operation = maker->second(material);
    if (way == "time") {
      std::printf("%.1f\n", time(operation, times));
    } else {
      count(name, operation, times, way == "first");
    }
  }
  return EXIT_SUCCESS;
} catch (const std::exception& e) {
  std::fprintf(stderr, "bench: %s\n", e.what());
  return EXIT_FAILURE;
}

}  // namespace bench
