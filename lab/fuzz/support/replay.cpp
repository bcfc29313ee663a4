// Runs files through a fuzz target, without a fuzzer.
//   fuzz_replay --list                     the names of all targets
//   fuzz_replay TARGET FILE|FOLDER...      runs them; being given nothing to run is a failure
//   fuzz_replay --named TARGET FOLDER...   and files named good-* must get through, all others
//                                          must not, and there must be at least one good one
#include <dirent.h>
#include <sys/stat.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "support/target.h"

namespace {

std::vector<std::string> filesAt(const std::string& path) {
  struct stat status {};
  if (stat(path.c_str(), &status) != 0) return {};
  if (!S_ISDIR(status.st_mode)) return {path};
  std::vector<std::string> files;
  DIR* const folder = opendir(path.c_str());
  while (const dirent* entry = folder == nullptr ? nullptr : readdir(folder)) {
    if (entry->d_name[0] != '.') files.push_back(path + "/" + entry->d_name);
  }
  if (folder != nullptr) closedir(folder);
  std::sort(files.begin(), files.end());
  return files;
}

std::string contents(const std::string& path) {
  std::ostringstream text;
  text << std::ifstream(path, std::ios::binary).rdbuf();
  return text.str();
}

bool isNamedGood(const std::string& path) {
  return path.compare(path.rfind('/') + 1, 5, "good-") == 0;
}

int replay(const fuzz::Target& target, const std::vector<std::string>& files, bool named) {
  int good = 0;
  int wrong = 0;
  for (const std::string& file : files) {
    const bool through = fuzz::runOne(target, contents(file));
    good += through;
    if (!named || through == isNamedGood(file)) continue;
    ++wrong;
    std::printf("%s: %s\n", file.c_str(), through ? "gets through" : "does not get through");
  }
  std::printf("%s: %zu inputs, %d got through\n", target.name, files.size(), good);
  if (files.empty()) std::printf("%s: nothing to replay\n", target.name);
  if (named && good == 0) std::printf("%s: no input gets through\n", target.name);
  return files.empty() || wrong > 0 || (named && good == 0) ? 1 : 0;
}

}  // namespace

int main(int argc, char** argv) {
  std::vector<std::string> arguments(argv + 1, argv + argc);
  if (arguments == std::vector<std::string>{"--list"}) {
    for (const fuzz::Target& target : fuzz::targets()) std::printf("%s\n", target.name);
    return 0;
  }
  const bool named = !arguments.empty() && arguments[0] == "--named";
  if (named) arguments.erase(arguments.begin());
  if (arguments.empty()) {
    std::fprintf(stderr, "usage: fuzz_replay --list | [--named] TARGET FILE|FOLDER...\n");
    return 2;
  }
  std::vector<std::string> files;
  for (std::size_t i = 1; i < arguments.size(); ++i) {
    for (const std::string& file : filesAt(arguments[i])) files.push_back(file);
  }
  for (const fuzz::Target& target : fuzz::targets()) {
    if (arguments[0] == target.name) return replay(target, files, named);
  }
  std::fprintf(stderr, "fuzz_replay: no target '%s'\n", arguments[0].c_str());
  return 2;
}
