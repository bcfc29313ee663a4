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
  const auto fault = [&](const char* id, const std::string& cause, const std::string& action) {
    finding = {id, Grade::kFailure, "The login program " + cause, {path}, action};
    return true;
  };
  struct stat status = {};
  if (stat(path.c_str(), &status) != 0) {
    return fault("program-missing", "cannot be found: " + std::string(std::strerror(errno)),
                 "Name the installed login program.");
  }
  if (!S_ISREG(status.st_mode) || (status.st_mode & S_ISUID) == 0 || status.st_uid != 0) {
    return fault(
        "program-not-set-id", "is not set-user-id root, so it cannot read the settings",
        "chown root:GROUP " + path + "; chmod 4750 " + path + " (GROUP: the web server's)");
  }
  struct statvfs system = {};
  if (statvfs(path.c_str(), &system) == 0 && (system.f_flag & ST_NOSUID) != 0) {
    return fault("program-nosuid", "is on a file system that is mounted nosuid",
                 "Mount that file system without nosuid, or install the program on another.");
  }
  return false;
}

void CheckProgram(Checkup& checkup, Caller& caller) {
  const std::string& path = checkup.options.program;
  Finding finding;
  if (ProgramFault(path, finding)) {
    caller.saved_root = false;
    finding.detail = checkup.library.Profile(&caller).ErrorLines();
    checkup.report.Add(finding);
    return;
  }
  struct stat status = {};
  if (stat(path.c_str(), &status) == 0 && (status.st_mode & S_IXOTH) != 0) {
    checkup.report.Warn("program-open",
                        "The login program is set-user-id root and any user can start it", {path},
                        "chmod 4750 " + path + ", with the web server's group as its group.");
  }
}

// Asks the library as the login program would. With root as saved identity it can only fail if
// this command itself lacks a permission.
void CheckGuard(Checkup& checkup, const Caller* caller, const std::string& who) {
  const Reply reply = checkup.library.Profile(caller);
  if (reply.ended && reply.Thrown().empty() && reply.ErrorLines().empty()) {
    checkup.report.Good("identity", "The library can become root and back as " + who);
    return;
  }
  checkup.report.Unchecked("identity-not-checked", "This command cannot become " + who, {},
                           "Run ssoclient-doctor with all of root's capabilities.", reply.said);
}

void CheckAsOther(Checkup& checkup) {
  Caller caller = checkup.caller ? *checkup.caller
                                 : Caller{"a user without permissions", kNobody, kNobody, {}, true};
  if (!checkup.options.program.empty()) CheckProgram(checkup, caller);
  if (!caller.saved_root) return;  // there is a finding
  CheckGuard(checkup, &caller,
             caller.name + (checkup.options.program.empty() ? " with root as saved identity"
                                                            : " in " + checkup.options.program));
}

// Without root the doctor is one more caller, and not the login program.
void CheckAsOurselves(Checkup& checkup) {
  const std::vector<Said> errors = checkup.library.Profile().ErrorLines();
  if (errors.empty()) {
    checkup.report.Good("identity", "The library can become root in this command");
    return;
  }
  checkup.report.Unchecked("identity-not-checked", "This command does not run as root", {},
                           "Run ssoclient-doctor as root.", errors);
}

}  // namespace

void FindCaller(Checkup& checkup) {
  if (!checkup.options.user.empty()) checkup.caller = UserByName(checkup.options.user);
}

void CheckIdentity(Checkup& checkup) {
  if (geteuid() != 0) {
    CheckAsOurselves(checkup);
  } else if (checkup.caller || !checkup.options.program.empty()) {
    CheckAsOther(checkup);
  } else {
    checkup.report.Good("identity", "Run as root; --user and --program check the login program");
  }
}

}  // namespace doctor
