// The login program: it is run as the web server would, with a request that changes nothing.
#include <dlfcn.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <sys/wait.h>
#include <sys/xattr.h>

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <regex>

#include "doctor/checkup.h"
#include "doctor/executable.h"
#include "doctor/paths.h"
#include "doctor/privileges.h"
#include "doctor/redact.h"
#include "doctor/terminal.h"
#include "doctor/text.h"

namespace doctor {

namespace {

constexpr char kSameRelease[] =
    "Install the login program and the library of the same release, then run ldconfig.";

class ProgramCheck {
 public:
  ProgramCheck(Checkup& checked, const Caller& user)
      : checkup(checked),
        caller(user),
        path(std::filesystem::absolute(checked.options.program)),
        program(path) {
    caller.saved_root = false;
  }

  bool Examine() {
    if (stat(path.c_str(), &status) != 0) {
      Fail("program-missing", "cannot be found: " + std::string(std::strerror(errno)),
           "Name the installed login program with --program.");
    } else if (!S_ISREG(status.st_mode)) {
      Fail("program-missing", "is not a file", "Name the installed login program with --program.");
    } else {
      CheckRoot();
      CheckWritable();
      CheckRun();
    }
    return root_fault.empty();
  }

 private:
  void Add(const char* id, Grade grade, const std::string& cause, const std::string& action,
           const std::string& because = "") {
    checkup.report.Add({id, grade, "The login program " + cause, {path}, action, {}, because});
  }

  // The program gets no root.
  void Fail(const char* id, const std::string& cause, const std::string& action) {
    root_fault = id;
    checkup.report.Fail(id, "The login program " + cause, {path}, action,
                        checkup.library.Profile(&caller).ErrorLines());
  }

  void CheckRoot() {
    if (caller.uid == 0) return;
    const NoNewPrivileges none = FindNoNewPrivileges(caller.uid);
    if (!none.where.empty()) {
      return Fail("program-no-new-privs", "gets no root: no_new_privs is set for " + none.where,
                  none.file.empty()
                      ? "Start the web server without it: NoNewPrivileges=no in its unit, then "
                        "restart it."
                      : "Set NoNewPrivileges=no in " + none.file +
                            ", then systemctl daemon-reload and restart the web server.");
    }
    if (program.IsScript()) return;  // the run shows it
    const bool set_id = (status.st_mode & S_ISUID) != 0 && status.st_uid == 0;
    if (!set_id && getxattr(path.c_str(), "security.capability", nullptr, 0) < 0) {
      return Fail(
          "program-not-set-id", "is not set-user-id root, so it cannot read the settings",
          "chown root:GROUP " + path + "; chmod 4750 " + path + " (GROUP: the web server's)");
    }
    struct statvfs system = {};
    if (statvfs(path.c_str(), &system) == 0 && (system.f_flag & ST_NOSUID) != 0) {
      Fail("program-nosuid", "is on a file system that is mounted nosuid",
           "Mount that file system without nosuid, or install the program on another.");
    }
  }

  void CheckWritable() {
    Dl_info library = {};
    if (dladdr(reinterpret_cast<void*>(&QOVA::SSO::OIDCLogin), &library) == 0) return;
    for (const std::string& file : {path, std::filesystem::absolute(library.dli_fname).string()}) {
      const auto spot = WritableByOthers(file);
      if (!spot || (file == path && status.st_uid != 0)) continue;
      checkup.report.Warn("program-writable",
                          "Users other than root can become root: " + spot->path +
                              " is writable, and the login program runs " + file + " (" +
                              spot->Owner() + ")",
                          {file}, spot->Command() + (file == path ? "; chmod u+s " + path : ""));
    }
    if (root_fault.empty() && !program.IsScript() && (status.st_mode & S_IXOTH) != 0) {
      Add("program-open", Grade::kWarning, "is set-user-id root and any user can start it",
          "chmod 4750 " + path + ", with the web server's group as its group.");
    }
  }

  void CheckRun() {
    Progress("Waiting for the login program, " + path);
    run = RunProgram(path, caller, checkup.options.timeout);
    const std::string& errors = run.output.err;
    if (run.error != 0 || (program.EndsInCrLf() && !run.IsCgi())) {
      const Reason reason = WhyNotStarted(program, caller, run.error);
      return Add("program-not-started", Grade::kFailure, reason.cause, reason.action);
    }
    if (!run.IsCgi() && CheckLibraries(errors)) return;
    if (!run.output.ended) {
      return Add("program-silent", Grade::kFailure,
                 "did not end within " + std::to_string(checkup.options.timeout) + " s",
                 "See the system log for what it waits for.", Explanation());
    }
    if (WIFSIGNALED(run.output.status)) {
      return Add("program-crashed", Grade::kFailure,
                 "was ended by a signal: " + std::string(strsignal(WTERMSIG(run.output.status))),
                 std::string(kSameRelease) + " The system log has more.");
    }
    if (!run.IsCgi()) return NoAnswer();
    CheckAnswer();
  }

  // True if the dynamic linker ended the program.
  bool CheckLibraries(const std::string& errors) {
    static const std::regex kMissing("error while loading shared libraries: ([^:\n]+): ([^\n]*)");
    static const std::regex kOther(
        "(symbol lookup error|relocation error): [^\n]*|"
        "version `[^\n]*' not found[^\n]*");
    std::smatch found;
    if (std::regex_search(errors, found, kMissing)) {
      const std::string library = Shown(found[1], 100);
      const std::string why = Shown(found[2], 200);
      std::string action = "Install the " + library + " that is built for this device.";
      if (why.find("No such file") != std::string::npos) {
        action = "Install " + library +
                 " in a folder of the dynamic linker, such as /usr/lib, and run ldconfig; "
                 "LD_LIBRARY_PATH has no effect on a set-user-id program.";
      } else if (why.find("Permission denied") != std::string::npos) {
        action = "Let every user read it: chmod a+r on the library, a+rx on its folders.";
      }
      Add("program-library", Grade::kFailure, "cannot load " + library + ": " + why, action);
      return true;
    }
    if (!std::regex_search(errors, found, kOther)) return false;
    Add("program-library", Grade::kFailure,
        "does not fit a library on this device: " + Shown(found[0], 200), kSameRelease);
    return true;
  }

  void NoAnswer() {
    const std::string status_text = "exit status " + std::to_string(WEXITSTATUS(run.output.status));
    const std::string error = run.FirstError();
    const std::string& out = run.output.out;
    if (out.empty()) {
      return Add(
          "program-no-answer", Grade::kFailure,
          "ended without an answer (" + status_text + ")" + (error.empty() ? "" : ": " + error),
          error.empty() ? "See the system log." : "Fix what it reports.", Explanation());
    }
    Add("program-bad-answer", Grade::kFailure,
        "does not answer as a CGI program (" + status_text + "); its output begins with " +
            Quote(Shown(out.substr(0, out.find('\n')), 80)),
        "Let it write header lines and an empty line before anything else.", root_fault);
  }

  void CheckAnswer() {
    const std::string location = run.Header("Location");
    const std::string code = run.Header("Status").substr(0, 3);
    std::smatch found;
    checkup.reference_program = location.find("/ssoclient/relay.html") != std::string::npos;
    const bool failed =
        std::regex_search(location, found, std::regex("reason=([a-z-]+)\\.([A-Za-z0-9]+)"));
    const std::string reason = failed ? found[1].str() : "";
    if (checkup.reference_program && EndsWith(location, "#success=false")) {
      return Add("program-launcher", Grade::kFailure, "is a launcher that cannot start its target",
                 "Install the login program, with mode 0755, at the path that the launcher was "
                 "built with (SSOCLIENT_LOGIN_PROGRAM).",
                 root_fault);
    }
    // The settings have their own findings; "bad-request" is the right answer.
    const bool settled =
        std::string(" bad-request disabled not-set-up ").find(" " + reason + " ") !=
        std::string::npos;
    if (failed && !settled && caller.uid == 0) {
      return Add("program-error", Grade::kFailure, "does not serve a web server that runs as root",
                 "Let the web server run as a separate user, and name it with --user.");
    }
    if (checkup.reference_program ? failed && !settled : code >= "500") {
      return Add(
          "program-error", Grade::kFailure,
          "answers any request with an error: " + (failed ? reason : "HTTP " + Shown(code, 3)),
          failed
              ? "See the system log: journalctl | grep -F 'sign-in failed [" + found[2].str() + "]'"
              : "See the web server's error log and the system log.",
          Explanation());
    }
    if (!checkup.reference_program && program.IsScript()) return CheckScript();
    checkup.report.Good("program", "The login program starts as " + caller.name + " and answers",
                        {path});
  }

  // The earlier finding that explains an error of the program.
  std::string Explanation() const {
    for (const char* id : {"login-conf-unusable", "profile-private", "file-unreadable"}) {
      if (checkup.report.Has(id)) return id;
    }
    return root_fault;
  }

  void CheckScript() {
    if ((status.st_mode & S_ISUID) != 0) {
      return Fail("program-not-set-id", "is a script: the system ignores its set-user-id bit",
                  "Install a compiled login program or launcher, owner root, mode 4750.");
    }
    Add("program-not-checked", Grade::kUnchecked, "is a script, which gets no root by itself",
        "Name the program that it starts with --program.");
  }

  Checkup& checkup;
  Caller caller;
  const std::string path;
  const Executable program;
  struct stat status = {};
  Run run;
  std::string root_fault;  // the finding that says why the program gets no root
};

}  // namespace

bool CheckProgram(Checkup& checkup, Caller caller) {
  return ProgramCheck(checkup, caller).Examine();
}

}  // namespace doctor
