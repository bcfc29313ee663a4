#include "names.h"

#include <fcntl.h>
#include <pwd.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <vector>

#include "environment.h"
#include "failure.h"
#include "process.h"
#include "utf8.h"

namespace {

constexpr size_t kLongestName = 256;
constexpr size_t kLargestEntry = 1 << 20;

[[noreturn]] void Refuse(const std::string& text) {
  throw Failure(FailureCode::kUnknownUser, text);
}

bool IsKnown(const std::string& name) {
  passwd entry;
  passwd* found = nullptr;
  std::vector<char> buffer(4096);
  int result = ERANGE;
  while (result == ERANGE && buffer.size() <= kLargestEntry) {
    buffer.resize(buffer.size() * 4);
    result = getpwnam_r(name.c_str(), &entry, buffer.data(), buffer.size(), &found);
  }
  if (found != nullptr) return true;
  // These mean "no such user" too; any other is a service that does not work.
  if (result == 0 || result == ENOENT || result == ESRCH || result == EPERM || result == EBADF) {
    return false;
  }
  throw Failure(FailureCode::kInternal,
                std::string("user_lookup: the name service failed: ") + std::strerror(result));
}

[[noreturn]] void RunCommand(const std::string& command, const std::string& name, pid_t parent) {
  process::DieWithParent(parent);
  std::string program = command;
  std::string argument = name;
  std::string path = std::string("PATH=") + kPath;
  char* const arguments[] = {&program[0], &argument[0], nullptr};
  char* const environment[] = {&path[0], nullptr};
  execve(command.c_str(), arguments, environment);
  _exit(127);
}

// The command's exit status, 127 if it cannot be run.
int Ask(const std::string& command, const std::string& name) {
  const pid_t parent = getpid();
  const pid_t child = fork();
  if (child == 0) RunCommand(command, name, parent);
  int status = 0;
  while (child > 0 && waitpid(child, &status, 0) < 0 && errno == EINTR) {
  }
  return child > 0 && WIFEXITED(status) ? WEXITSTATUS(status) : 127;
}

}  // namespace

void CheckUserName(const std::string& name, const char* what) {
  const std::string subject = std::string("user name (") + what + ") ";
  if (name.empty()) Refuse(subject + "is empty");
  if (name.size() > kLongestName) Refuse(subject + "is longer than 256 bytes");
  if (!IsUTF8(name)) Refuse(subject + "is not UTF-8");
  if (HasControl(name)) Refuse(subject + "holds a control character");
  if (BeginsOrEndsBlank(name)) Refuse(subject + "begins or ends with a blank");
  if (name == "." || name == "..") Refuse(subject + "is \".\" or \"..\"");
}

void LookUp(const std::string& name, const Settings& settings) {
  if (settings.user_lookup == "none") return;
  if (settings.user_lookup == "nss") {
    if (!IsKnown(name)) Refuse("user is not known to the name service: " + name);
    return;
  }
  const bool usable = settings.user_lookup.substr(0, 1) == "/";
  const int status = usable ? Ask(settings.user_lookup, name) : 127;
  if (status == 127 || status == 126) {
    throw Failure(FailureCode::kInternal, "user_lookup: cannot be run: " + settings.user_lookup);
  }
  if (status != 0) Refuse("user is not known to " + settings.user_lookup + ": " + name);
}
