// The identity of the login program: the library's guard needs root as the real or saved id.
#include <grp.h>
#include <pwd.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <stdexcept>

#include "doctor/checkup.h"

namespace doctor {

namespace {

constexpr uid_t kNobody = 65534;

Caller UserByName(const std::string& name) {
  const struct passwd* const entry = getpwnam(name.c_str());
  if (entry == nullptr) throw std::runtime_error("there is no user '" + name + "'");
  Caller caller = {name, entry->pw_uid, entry->pw_gid, std::vector<gid_t>(64), true};
  int count = static_cast<int>(caller.groups.size());
  if (getgrouplist(name.c_str(), entry->pw_gid, caller.groups.data(), &count) < 0) {
    throw std::runtime_error("the user '" + name + "' is in too many groups");
  }
  caller.groups.resize(static_cast<size_t>(count));
  return caller;
}

// What keeps the program from having root as its saved id, if anything does.
bool ProgramFault(const std::string& path, Finding& finding) {
  const auto fault = [&](const char* id, const std::string& seen, const std::string& remedy) {
    finding = {id, Severity::kFailure, path, seen, {}, remedy};
    return true;
  };
  struct stat status = {};
  if (stat(path.c_str(), &status) != 0) {
    return fault("program-missing", std::strerror(errno), "Name the installed login program.");
  }
  if (!S_ISREG(status.st_mode) || (status.st_mode & S_ISUID) == 0 || status.st_uid != 0) {
    return fault(
        "program-not-set-id", "is not set-user-id root, so root is not its saved identity",
        "chown root:GROUP " + path + "; chmod 4750 " + path + " (GROUP: the web server's)");
  }
  struct statvfs system = {};
  if (statvfs(path.c_str(), &system) == 0 && (system.f_flag & ST_NOSUID) != 0) {
    return fault("program-nosuid", "stands on a file system that is mounted nosuid",
                 "Mount that file system without nosuid, or install the program on another.");
  }
  return false;
}

void CheckProgram(Checkup& checkup, Caller& caller) {
  const std::string& path = checkup.options.program;
  Finding finding;
  if (ProgramFault(path, finding)) {
    caller.saved_root = false;
    finding.library = checkup.library.Profile(&caller).ErrorLines();
    checkup.report.Add(finding);
    return;
  }
  struct stat status = {};
  if (stat(path.c_str(), &status) == 0 && (status.st_mode & S_IXOTH) != 0) {
    checkup.report.Add({"program-open",
                        Severity::kWarning,
                        path,
                        "is set-user-id root and can be started by everybody",
                        {},
                        "chmod 4750 " + path + ", with the web server's group as its group."});
  }
}

// Asks the library as the login program would. With root as saved identity it can only fail if
// this command itself lacks a right.
void CheckGuard(Checkup& checkup, const Caller* caller, const std::string& subject) {
  const Reply reply = checkup.library.Profile(caller);
  if (reply.ended && reply.Thrown().empty() && reply.ErrorLines().empty()) {
    checkup.report.Ok("identity", subject, "the library can raise its identity and put it back");
    return;
  }
  checkup.report.Add({"identity-not-checked", Severity::kUnchecked, subject,
                      "this command cannot take that identity", reply.said,
                      "Run ssoclient-doctor with all of root's rights."});
}

void CheckAsOther(Checkup& checkup) {
  Caller caller = checkup.caller ? *checkup.caller
                                 : Caller{"a user without rights", kNobody, kNobody, {}, true};
  if (!checkup.options.program.empty()) CheckProgram(checkup, caller);
  if (!caller.saved_root) return;  // said already
  CheckGuard(checkup, &caller,
             caller.name + (checkup.options.program.empty() ? " with root as saved identity"
                                                            : " in " + checkup.options.program));
}

// Without root the doctor is one more caller, and not the login program.
void CheckAsOurselves(Checkup& checkup) {
  const std::vector<Said> errors = checkup.library.Profile().ErrorLines();
  if (errors.empty()) {
    checkup.report.Ok("identity", "this command", "the library can raise its identity");
    return;
  }
  checkup.report.Add({"identity-not-checked", Severity::kUnchecked, "this command",
                      "has not root as its real or saved identity", errors,
                      "Run ssoclient-doctor as root."});
}

}  // namespace

void FindCaller(Checkup& checkup) {
  const bool other = !checkup.options.user.empty() || !checkup.options.program.empty();
  if (other && geteuid() != 0) throw std::runtime_error("--user and --program need root");
  if (!checkup.options.user.empty()) checkup.caller = UserByName(checkup.options.user);
}

void CheckIdentity(Checkup& checkup) {
  checkup.report.Begin("Identity");
  if (geteuid() != 0) {
    CheckAsOurselves(checkup);
  } else if (checkup.caller || !checkup.options.program.empty()) {
    CheckAsOther(checkup);
  } else {
    checkup.report.Note("identity", "",
                        "run as root; --user and --program tell what the login program may do");
  }
}

}  // namespace doctor
