// The identity of the login program: the library's guard needs root as the real or saved id.
#include <grp.h>
#include <pwd.h>
#include <unistd.h>

#include <stdexcept>

#include "doctor/checkup.h"

namespace doctor {

namespace {

constexpr uid_t kNobody = 65534;
constexpr char kUsualUser[] = "www-data";

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

// The guard's own error lines.
std::vector<Said> GuardErrors(const Reply& reply) {
  std::vector<Said> lines;
  for (const Said& line : reply.ErrorLines()) {
    if (line.text.compare(0, 7, "ERROR: ") == 0) lines.push_back(line);
  }
  return lines;
}

// Asks the library as the login program would. With root as saved identity it can only fail if
// this command itself lacks a permission.
void CheckGuard(Checkup& checkup, const Caller* caller, const std::string& who) {
  const Reply reply = checkup.library.Profile(caller);
  if (!reply.ended && checkup.report.Has("file-unreadable")) {
    return checkup.report.Skip("The identity of the login program", "file-unreadable");
  }
  if (reply.ended && reply.Thrown().empty() && GuardErrors(reply).empty()) {
    checkup.report.Good("identity", "The library can become root and back as " + who);
    return;
  }
  checkup.report.Unchecked("identity-not-checked", "This command cannot become " + who, {},
                           "Run ssoclient-doctor with all of root's capabilities.", reply.said);
}

void CheckAsOther(Checkup& checkup) {
  Caller caller = checkup.caller ? *checkup.caller
                                 : Caller{"a user without permissions", kNobody, kNobody, {}, true};
  if (!checkup.options.program.empty() && !CheckProgram(checkup, caller)) return;
  CheckGuard(checkup, &caller,
             caller.name + (checkup.options.program.empty() ? " with root as saved identity"
                                                            : " in " + checkup.options.program));
}

// Without root the doctor is one more caller, and not the login program.
void CheckAsOurselves(Checkup& checkup) {
  const std::vector<Said> errors = GuardErrors(checkup.library.Profile());
  if (errors.empty()) {
    checkup.report.Good("identity", "The library can become root in this command");
    return;
  }
  checkup.report.Unchecked("identity-not-checked", "This command does not run as root", {},
                           "Run ssoclient-doctor as root.", errors);
}

}  // namespace

void FindCaller(Checkup& checkup) {
  const std::string& user = checkup.options.user;
  if (!user.empty()) checkup.caller = UserByName(user);
  const bool usual = user.empty() && !checkup.options.program.empty();
  if (usual && getpwnam(kUsualUser) != nullptr) checkup.caller = UserByName(kUsualUser);
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
