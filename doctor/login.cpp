// What the reference login program keeps beside the library: login.conf, and its store below /run.
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fstream>
#include <map>

#include "doctor/characters.h"
#include "doctor/checkup.h"
#include "doctor/file.h"
#include "doctor/paths.h"
#include "doctor/redact.h"
#include "doctor/text.h"

namespace doctor {

namespace {

constexpr char kConf[] = "/usr/qova/etc/ssoclient/login.conf";
constexpr off_t kLargestConf = 65536;
constexpr char kStore[] = "/run/ssoclient";
constexpr char kStoreParent[] = "/run";

// A key of login.conf. most 0: any text.
struct LoginKey {
  const char* name;
  int least;
  int most;
  const char* words;  // the values, if there are no others
};

constexpr LoginKey kLoginKeys[] = {{"deadline", 1, 600, ""},
                                   {"max_exchanges", 1, 1000, ""},
                                   {"max_sessions", 1, 100000, ""},
                                   {"session_lifetime", 60, 30 * 24 * 3600, ""},
                                   {"nonce_check", 0, 0, " yes no "},
                                   {"proxy", 0, 0, ""},
                                   {"no_proxy", 0, 0, ""},
                                   {"user_lookup", 0, 0, ""},
                                   {"device_name", 0, 0, ""},
                                   {"provider_name", 0, 0, ""},
                                   {"logo", 0, 0, ""}};

std::string Trim(const std::string& text) {
  const size_t begin = text.find_first_not_of(" \t\r");
  return begin == std::string::npos
             ? ""
             : text.substr(begin, text.find_last_not_of(" \t\r") - begin + 1);
}

class ConfCheck {
 public:
  explicit ConfCheck(Checkup& checked) : checkup(checked) {}

  void Run() {
    struct stat status = {};
    if (lstat(kConf, &status) != 0) {
      const std::string near = NearMiss("login.conf");
      if (near.empty()) return;
      return checkup.report.Warn("login-conf-ignored", "The login program does not read " + near,
                                 {near}, "mv '" + near + "' " + kConf);
    }
    checkup.reference_program = true;
    if (IsUsable()) ReadLines();
  }

 private:
  bool Refused(const std::string& cause, const std::string& action) {
    checkup.report.Add(
        {"login-conf-unusable", Grade::kFailure, "login.conf " + cause, {kConf}, action, {}});
    return false;
  }

  // The program does not sign any user in with a file that others could have written.
  bool IsUsable() {
    const std::string root_only = std::string("chown root:root ") + kConf + "; chmod 0644 " + kConf;
    Spot spot{kConf};
    if (stat(kConf, &spot.status) != 0) {
      return errno == ENOENT || Refused("cannot be read: " + std::string(std::strerror(errno)),
                                        "Put a regular file in its place.");
    }
    if (!S_ISREG(spot.status.st_mode)) {
      return Refused("is not a regular file", "Put a regular file in its place.");
    }
    if (spot.status.st_uid != 0 || (spot.status.st_mode & 022) != 0) {
      return Refused("can be changed by users other than root (" + spot.Owner() +
                         "), so the login program refuses it",
                     root_only);
    }
    if (spot.status.st_size > kLargestConf) {
      return Refused("is larger than 64 KB", "Remove what is not part of the settings.");
    }
    if (checkup.caller && geteuid() == 0) {
      const auto closed = ClosedTo(*checkup.caller, kConf, R_OK);
      if (closed) {
        return Refused(
            "cannot be read by " + checkup.caller->name + ": " + closed->path + " is closed (" +
                closed->Owner() + ")",
            "chmod a+r" + std::string(closed->path == kConf ? " " : "x ") + closed->path);
      }
    }
    return true;
  }

  void ReadLines() {
    std::ifstream file(kConf);
    int number = 0;
    for (std::string line; std::getline(file, line);) {
      ++number;
      line = Trim(line);
      if (!line.empty() && line[0] != '#') ReadLine(line, number);
    }
  }

  void Ignored(int number, const std::string& key, const std::string& cause,
               const std::string& action) {
    checkup.report.Warn(
        "login-conf-ignored",
        "The login program ignores line " + std::to_string(number) + " of login.conf: " + cause,
        {kConf, Shown(key, 60)}, action);
  }

  void ReadLine(const std::string& line, int number) {
    const size_t equals = line.find('=');
    const std::string key = Trim(line.substr(0, equals));
    if (equals == std::string::npos) {
      return Ignored(number, "", "it has no \"=\"", "Write it as key = value.");
    }
    const std::string value = Trim(line.substr(equals + 1));
    std::vector<std::string> names;
    for (const LoginKey& known : kLoginKeys) {
      names.push_back(known.name);
      if (key == known.name) return CheckValue(known, value, number);
    }
    const std::string near = Nearest(Skeleton(key), names);
    const std::string odd = OddCharacter(key);
    Ignored(number, key,
            "there is no key " + Quote(Shown(key, 60)) + (odd.empty() ? "" : ": it holds " + odd),
            near.empty() ? "Remove it." : "Rename it to " + Quote(near) + ".");
  }

  void CheckValue(const LoginKey& key, const std::string& value, int number) {
    const std::string name = key.name;
    const bool digits = !value.empty() && value.size() < 10 &&
                        value.find_first_not_of("0123456789") == std::string::npos;
    const int parsed = digits ? std::stoi(value) : 0;
    const bool word = std::string(key.words).find(" " + value + " ") != std::string::npos;
    if (key.most > 0 && (!digits || parsed < key.least || parsed > key.most)) {
      return Ignored(number, name, Quote(name) + " has a value that it cannot use",
                     "Set " + Quote(name) + " to a number from " + std::to_string(key.least) +
                         " to " + std::to_string(key.most) + ".");
    }
    if (*key.words != '\0' && !word) {
      return Ignored(number, name, Quote(name) + " has a value that it cannot use",
                     "Set " + Quote(name) + " to one of:" + key.words);
    }
    if (name == "deadline") checkup.login_deadline = parsed;
    if (name == "user_lookup" && value != "none" && value != "nss") CheckLookup(value);
    // The requests of the doctor take the same way.
    if (name == "proxy" && !value.empty()) setenv("all_proxy", value.c_str(), 1);
    if (name == "no_proxy" && !value.empty()) setenv("no_proxy", value.c_str(), 1);
  }

  void CheckLookup(const std::string& command) {
    if (command[0] == '/' && access(command.c_str(), X_OK) == 0) return;
    if (command[0] != '/') errno = EINVAL;
    checkup.report.Fail(
        "login-conf-unusable",
        "The command of \"user_lookup\" cannot be started: " + std::string(std::strerror(errno)),
        {kConf, "user_lookup"}, "Set it to none, nss, or the path of an installed command.");
  }

  Checkup& checkup;
};

// The program opens its store as root and takes no folder or file that is not root's.
void CheckStored(Checkup& checkup, const std::string& path, bool folder) {
  Spot spot{path};
  if (lstat(path.c_str(), &spot.status) != 0) return;
  const mode_t mode = spot.status.st_mode;
  if ((folder ? !S_ISDIR(mode) : !S_ISREG(mode)) ||
      (folder && (spot.status.st_uid != 0 || (mode & 022) != 0))) {
    checkup.report.Fail("store-unsafe",
                        "The login program refuses its store: " + path +
                            (folder ? " is not a folder that root alone can write to ("
                                    : " is not a regular file (") +
                            spot.Owner() + ")",
                        {path}, "rm -r " + path + "; the login program makes it again.");
  } else if (spot.status.st_uid != 0 || (mode & 022) != 0) {
    checkup.report.Warn(
        "store-writable",
        "Users other than root can change the store of the login program (" + spot.Owner() + ")",
        {path}, spot.Command());
  }
}

void CheckStoreSystem(Checkup& checkup) {
  struct statvfs system = {};
  const char* const path = access(kStore, F_OK) == 0 ? kStore : kStoreParent;
  if (statvfs(path, &system) != 0) {
    return checkup.report.Fail("store-unsafe",
                               "The login program cannot make its store: there is no folder /run",
                               {kStore}, "mkdir -m 0755 /run");
  }
  if ((system.f_flag & ST_RDONLY) != 0) {
    return checkup.report.Fail("store-read-only",
                               "The store of the login program is on a file system that is mounted "
                               "read-only",
                               {kStore}, std::string("mount -o remount,rw ") + path);
  }
  const bool no_files = system.f_files > 0 && system.f_ffree == 0;
  if (no_files || (system.f_blocks > 0 && system.f_bfree == 0)) {
    checkup.report.Fail("store-full",
                        std::string("The file system of the login program's store has no room for "
                                    "another ") +
                            (no_files ? "file" : "block"),
                        {kStore},
                        std::string(no_files ? "Remove files: df -i " : "Free space: df ") + path);
  }
}

// True for the requests of one sign-in.
bool IsOfSignIn(const std::string& what) {
  return what == "token endpoint" || what == "discovery document" || what == "key set";
}

}  // namespace

void CheckLoginSettings(Checkup& checkup) {
  ConfCheck(checkup).Run();
}

void CheckStore(Checkup& checkup) {
  if (!checkup.reference_program && access(kStore, F_OK) != 0) return;
  const std::string store = kStore;
  CheckStoreSystem(checkup);
  for (const char* folder : {"", "/sessions", "/slots"}) CheckStored(checkup, store + folder, true);
  for (const char* file : {"/key", "/redeemed"}) CheckStored(checkup, store + file, false);
}

void CheckDeadline(Checkup& checkup) {
  if (!checkup.reference_program) return;
  std::map<std::string, long> longest;
  for (const Request& request : checkup.report.Requests()) {
    if (!IsOfSignIn(request.what)) continue;
    long& time = longest[request.what];
    time = std::max(time, request.milliseconds);
  }
  long total = 0;
  for (const auto& [what, time] : longest) total += time;
  const long limit = 1000L * checkup.login_deadline;
  if (total * 2 < limit) return;
  checkup.report.Add({"deadline-short",
                      total >= limit ? Grade::kFailure : Grade::kWarning,
                      "The provider's answers take " + std::to_string(total / 1000) +
                          " s together; the login program ends a sign-in after " +
                          std::to_string(checkup.login_deadline) + " s",
                      {kConf, "deadline"},
                      "Find out why the provider is slow, or set \"deadline\" to " +
                          std::to_string(std::min(600L, 3 * total / 1000 + 1)) + " in login.conf.",
                      {}});
}

}  // namespace doctor
