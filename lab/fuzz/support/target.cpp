#include "support/target.h"

#include <cstdio>
#include <cstdlib>

#include "support/device.h"
#include "support/transport.h"

namespace fuzz {

std::vector<Target>& targets() {
  static std::vector<Target> all;
  return all;
}

bool runOne(const Target& target, const std::string& input) {
  device().reset();
  transport().reset();
  const bool through = target.run(input);
  require(device().openFiles() == 0, "a file was left open");
  require(transport().openHandles() == 0, "a transfer handle was left");
  return through;
}

void require(bool good, const char* what) {
  if (good) return;
  std::fprintf(stderr, "fuzz: %s\n", what);
  std::abort();
}

std::vector<std::string> parts(const std::string& input, std::size_t count) {
  static const std::string kBetween = "\n%%\n";
  std::vector<std::string> all;
  std::size_t at = 0;
  while (all.size() + 1 < count) {
    const std::size_t end = input.find(kBetween, at);
    if (end == std::string::npos) break;
    all.push_back(input.substr(at, end - at));
    at = end + kBetween.size();
  }
  all.push_back(input.substr(at));
  all.resize(count);
  return all;
}

void requireOneOf(const std::exception& thrown, const std::vector<Thrown>& expected) {
  for (const Thrown& e : expected) {
    if (e.type == typeid(thrown) && (e.message.empty() || e.message == thrown.what())) return;
  }
  std::fprintf(stderr, "fuzz: threw %s: %s\n", typeid(thrown).name(), thrown.what());
  std::abort();
}

}  // namespace fuzz
