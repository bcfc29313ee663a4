#include "doctor/executable.h"

#include <elf.h>
#include <fcntl.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <regex>

#include "doctor/paths.h"
#include "doctor/redact.h"
#include "doctor/text.h"

namespace doctor {

namespace {

constexpr size_t kHead = 4096;
constexpr char kNotStarted[] = "ssoclient-doctor: exec ";

std::string Head(const std::string& path) {
  std::string head(kHead, '\0');
  const int file = open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
  const ssize_t size = file < 0 ? 0 : read(file, &head[0], head.size());
  if (file >= 0) close(file);
  head.resize(size > 0 ? static_cast<size_t>(size) : 0);
  return head;
}

// True if both are for the same kind of processor.
bool SameMachine(const std::string& one, const std::string& other) {
  constexpr size_t kMachine = offsetof(Elf64_Ehdr, e_machine);
  return one.size() > kMachine + 2 && one.compare(EI_CLASS, 2, other, EI_CLASS, 2) == 0 &&
         one.compare(kMachine, 2, other, kMachine, 2) == 0;
}

Reason WhyNotPermitted(const Executable& program, const Caller& caller) {
  for (const std::string& path : {program.path, program.Interpreter()}) {
    if (path.empty()) continue;
    struct statvfs system = {};
    if (statvfs(path.c_str(), &system) == 0 && (system.f_flag & ST_NOEXEC) != 0) {
      return {"is on a file system that is mounted noexec",
              "Mount that file system without noexec, or install the program on another."};
    }
    const auto closed = ClosedTo(caller, path, X_OK);
    if (!closed) continue;
    const bool folder = S_ISDIR(closed->status.st_mode);
    return {"cannot be started by " + caller.name + ": " + closed->path + " is closed (" +
                closed->Owner() + ")",
            folder || path != program.path ? "chmod a+x " + closed->path
                                           : "chown root:GROUP " + path + "; chmod 4750 " + path +
                                                 " (GROUP: the web server's)"};
  }
  return {"cannot be started by " + caller.name + ": the system refuses it",
          "Check the rules of the system's access control (AppArmor, SELinux) for it."};
}

}  // namespace

Executable::Executable(const std::string& file) : path(file), head(Head(file)) {}

bool Executable::IsElf() const {
  return head.compare(0, SELFMAG, ELFMAG) == 0;
}

bool Executable::EndsInCrLf() const {
  const size_t end = head.find('\n');
  return IsScript() && end != std::string::npos && head[end - 1] == '\r';
}

std::string Executable::Interpreter() const {
  if (IsScript()) {
    const size_t begin = head.find_first_not_of(" \t", 2);
    const size_t end = head.find_first_of(" \t\n", begin);
    return begin == std::string::npos ? "" : head.substr(begin, end - begin);
  }
  const size_t loader = IsElf() ? head.find("/ld-") : std::string::npos;
  if (loader == std::string::npos) return "";
  const size_t begin = head.rfind('\0', loader) + 1;
  return head.substr(begin, head.find('\0', loader) - begin);
}

Reason WhyNotStarted(const Executable& program, const Caller& caller, int error) {
  const std::string& path = program.path;
  const std::string interpreter = program.Interpreter();
  const std::string rebuild = "Install the login program that is built for this device.";
  if (program.IsElf() && !SameMachine(program.head, Head("/proc/self/exe"))) {
    return {"is built for another processor", rebuild};
  }
  if (program.EndsInCrLf()) {
    return {"has lines that end with CR LF, so its interpreter is not found",
            "sed -i 's/\\r$//' " + path};
  }
  if (error == EACCES || error == EPERM) return WhyNotPermitted(program, caller);
  if (error == ENOENT && access(path.c_str(), F_OK) == 0 && !interpreter.empty()) {
    return {"needs " + Shown(interpreter, 200) + ", which does not exist",
            program.IsElf() ? rebuild : "Install it, or name another in the first line."};
  }
  if (error == ENOEXEC && program.head.empty()) return {"is an empty file", rebuild};
  if (error == ENOEXEC && !program.IsElf()) {
    return {"is neither a program nor a script that begins with \"#!\" and its interpreter",
            "Write \"#!\" and the interpreter into the first line of the script, or " +
                std::string("install the login program.")};
  }
  return {"cannot be started: " + std::string(std::strerror(error)), rebuild};
}

bool Run::IsCgi() const {
  return std::regex_search(output.out.substr(0, kHead),
                           std::regex("^(?:[A-Za-z0-9-]+:[^\n]*\n)+\r?\n"));
}

std::string Run::Header(const std::string& name) const {
  std::smatch found;
  const std::string text = "\n" + output.out.substr(0, kHead);
  const std::regex line("\n" + name + ":[ \t]*([^\r\n]*)", std::regex::icase);
  return std::regex_search(text, found, line) ? found[1].str() : "";
}

std::string Run::FirstError() const {
  return Shown(output.err.substr(0, output.err.find('\n')), 200);
}

Run RunProgram(const std::string& path, const Caller& caller, int seconds) {
  Run run;
  run.output = Capture(
      [&](int out) {
        const int nothing = open("/dev/null", O_RDONLY);
        if (dup2(nothing, STDIN_FILENO) < 0 || dup2(out, STDOUT_FILENO) < 0) return;
        const std::string folder = path.substr(0, path.rfind('/') + 1);
        if (chdir(folder.c_str()) != 0 && chdir("/") != 0) return;
        std::string words[] = {path,
                               "GATEWAY_INTERFACE=CGI/1.1",
                               "SERVER_PROTOCOL=HTTP/1.1",
                               "REQUEST_METHOD=HEAD",
                               "QUERY_STRING=action=ssoclient-doctor",
                               "SCRIPT_NAME=/webman/login.cgi",
                               "REMOTE_ADDR=127.0.0.1",
                               "SERVER_NAME=localhost",
                               "HTTP_HOST=localhost",
                               "HTTPS=on",
                               "SERVER_PORT=443",
                               "PATH=/usr/local/bin:/usr/bin:/bin"};
        char* arguments[] = {&words[0][0], nullptr};
        char* environment[sizeof words / sizeof *words] = {};
        for (size_t i = 1; i < sizeof words / sizeof *words; ++i) {
          environment[i - 1] = &words[i][0];
        }
        std::signal(SIGPIPE, SIG_DFL);
        Become(caller);
        execve(path.c_str(), arguments, environment);
        const std::string why = kNotStarted + std::to_string(errno);
        (void)!write(STDERR_FILENO, why.c_str(), why.size());
      },
      seconds);
  if (run.output.err.compare(0, sizeof kNotStarted - 1, kNotStarted) == 0) {
    run.error = std::atoi(run.output.err.c_str() + sizeof kNotStarted - 1);
  }
  return run;
}

}  // namespace doctor
