#include "doctor/file.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <filesystem>

#include "doctor/characters.h"
#include "doctor/json.h"
#include "doctor/paths.h"
#include "doctor/redact.h"
#include "doctor/text.h"

namespace doctor {

namespace {

constexpr size_t kLongestFile = 64 << 20;
constexpr off_t kLargeFile = 1 << 20;  // a settings file has some hundred bytes

bool StartsWith(const std::string& text, const std::string& start) {
  return text.compare(0, start.size(), start) == 0;
}

// What the library says if it cannot use the file.
std::vector<Said> WithoutFile(const Checkup& checkup, const File& file) {
  if (!S_ISREG(file.status.st_mode) && !S_ISDIR(file.status.st_mode) && file.error == 0) {
    return {Said::Does("reads it for as long as something writes to it")};
  }
  if (file.kind.provider == Provider::kNone) return checkup.library.Login().said;
  std::vector<Said> said = {Said::Does("goes on with empty settings")};
  for (const Said& line : checkup.library.TokenRequest("").said) said.push_back(line);
  return said;
}

class FileCheck {
 public:
  FileCheck(Checkup& checked, const File& found, bool needed)
      : checkup(checked),
        file(found),
        in_use(needed),
        name(found.kind.name),
        good_mode(found.kind.secret ? "0600" : "0644") {}

  bool Run(Json::Value& document) {
    if (file.error == ENOENT || file.error == ENOTDIR) return in_use && Missing();
    if (file.error == EACCES && geteuid() != 0) {
      checkup.report.Unchecked("file-not-checked",
                               name + " cannot be read by the user of this command", file.At(),
                               "Run ssoclient-doctor as root.");
      return false;
    }
    if (file.error != 0 || !S_ISREG(file.status.st_mode)) {
      return Unusable("file-unreadable", name + " " + Unreadable(),
                      "Put a regular file in its place, owner root, mode " + good_mode + ".");
    }
    CheckAccess();
    return CheckText(document);
  }

 private:
  bool Missing() {
    const auto missing = [this](const std::string& cause, const std::string& action) {
      return Unusable("file-missing", cause, action);
    };
    struct stat status = {};
    if (lstat(file.path.c_str(), &status) == 0) {
      return missing(name + " is a symbolic link to a file that does not exist",
                     "Create the file that it leads to, or put a regular file in its place: "
                     "readlink -f " +
                         file.path);
    }
    if (stat(kFolder, &status) != 0 || !S_ISDIR(status.st_mode)) {
      return missing("The folder of the settings does not exist",
                     std::string("mkdir -p -m 0755 ") + kFolder + ", and create the files in it.");
    }
    const std::string near = NearMiss(name);
    if (near.empty()) {
      return missing(name + " does not exist",
                     "Create it: a JSON object, owner root, mode " + good_mode + ".");
    }
    return missing(name + " does not exist, but " + Quote(near) + " does",
                   "mv '" + near + "' " + file.path);
  }

  // The file of the other provider keeps no user from signing in.
  bool Unusable(const char* id, const std::string& cause, const std::string& action) {
    checkup.report.Add({id, in_use ? Grade::kFailure : Grade::kWarning, cause, file.At(), action,
                        in_use ? WithoutFile(checkup, file) : std::vector<Said>()});
    return false;
  }

  std::string Unreadable() const {
    const mode_t mode = file.status.st_mode;
    if (S_ISDIR(mode)) return "is a directory";
    if (S_ISFIFO(mode)) return "is a named pipe, not a regular file";
    if (S_ISSOCK(mode)) return "is a socket, not a regular file";
    if (S_ISCHR(mode) || S_ISBLK(mode)) return "is a device, not a regular file";
    if (file.error == EFBIG) return "is " + Megabytes() + " large";
    return "cannot be read: " + std::string(std::strerror(file.error));
  }

  std::string Megabytes() const { return std::to_string(file.status.st_size >> 20) + " MB"; }

  void Warn(const char* id, const std::string& cause, const std::string& action) {
    checkup.report.Warn(id, cause, file.At(), action,
                        {Said::Does("does not check owner and mode")});
  }

  void CheckAccess() {
    const mode_t mode = file.status.st_mode;
    const std::string shown = "mode " + Mode(file.status);
    if (file.kind.secret && (mode & (S_IRGRP | S_IROTH)) != 0) {
      Warn("secret-readable",
           std::string("The client secret can be read by ") +
               ((mode & S_IROTH) != 0 ? "any user" : "a group") + " (" + shown + ")",
           "chmod " + good_mode + " " + file.path + ", then set a new client secret.");
    }
    if ((mode & (S_IWGRP | S_IWOTH)) != 0 || file.status.st_uid != 0) {
      Warn("file-writable",
           "Users other than root can change " + name + " and so decide who signs in (owner " +
               std::to_string(file.status.st_uid) + ", " + shown + ")",
           "chown root:root " + file.path + "; chmod " + good_mode + " " + file.path);
    } else if (const auto spot = WritableByOthers(file.path)) {
      Warn("folder-writable",
           "Users other than root can replace " + name + ": " + spot->path + " is writable (" +
               spot->Owner() + ")",
           spot->Command());
    }
    if (file.status.st_size > kLargeFile) {
      Warn("file-odd", name + " is " + Megabytes() + " large, which each sign-in reads",
           "Remove what is not part of the settings.");
    }
  }

  bool CheckText(Json::Value& document) {
    const std::string& text = file.text;
    if (text.find_first_not_of(" \t\r\n") == std::string::npos) {
      return Unusable("file-empty", name + " is empty", "Write a JSON object into it.");
    }
    std::string problem;
    if (!ParseJson(text, document, problem)) return NotJson(problem);
    if (!document.isObject()) {
      return Unusable("file-no-object", name + " holds " + TypeName(document) + ", not an object",
                      "Put the members between { and }.");
    }
    return true;
  }

  bool NotJson(const std::string& problem) {
    const std::string& text = file.text;
    const std::string save = "Save it as UTF-8 without a byte-order mark.";
    if (StartsWith(text, "\xEF\xBB\xBF")) {
      return Unusable("file-byte-order-mark", name + " begins with a byte-order mark (EF BB BF)",
                      save);
    }
    if (StartsWith(text, "\xFF\xFE") || StartsWith(text, "\xFE\xFF") ||
        text.find('\0') != std::string::npos) {
      return Unusable("file-encoding", name + " is not UTF-8 (UTF-16, or zero bytes in it)", save);
    }
    size_t at = 0;
    const std::string odd = OddOutsideStrings(text, at);
    if (!odd.empty()) {
      return Unusable("file-syntax", name + " is not JSON: " + Position(text, at) + ": " + odd,
                      "Replace it there: quotation marks are \", and blanks are plain.");
    }
    return Unusable("file-syntax", name + " is not JSON: " + problem,
                    "Fix the text there: names and strings in double quotes, a comma between "
                    "members, none after the last, true and false in lower case.");
  }

  Checkup& checkup;
  const File& file;
  const bool in_use;
  const std::string name;
  const std::string good_mode;
};

}  // namespace

const char kFolder[] = "/usr/qova/etc/ssoclient/";

File Load(const FileKind& kind) {
  File file{kind, std::string(kFolder) + kind.name};
  const int descriptor = open(file.path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
  if (descriptor < 0) {
    file.error = errno;
    if (stat(file.path.c_str(), &file.status) != 0) file.status = {};
    return file;
  }
  fstat(descriptor, &file.status);
  char chunk[4096];
  ssize_t count = 0;
  while (S_ISREG(file.status.st_mode) && file.text.size() < kLongestFile &&
         (count = read(descriptor, chunk, sizeof chunk)) > 0) {
    file.text.append(chunk, static_cast<size_t>(count));
  }
  if (count < 0) file.error = errno;
  if (file.text.size() >= kLongestFile) file.error = EFBIG;
  close(descriptor);
  return file;
}

std::string NearMiss(const std::string& name) {
  const std::string stem = name.substr(0, name.find('.'));
  for (const char* folder : {kFolder, "/usr/qova/etc/", "/etc/ssoclient/"}) {
    std::error_code error;
    for (const auto& entry : std::filesystem::directory_iterator(folder, error)) {
      const std::string file = entry.path().filename();
      const std::string plain = Skeleton(file);
      if (file[0] == '.' || !entry.is_regular_file(error)) continue;
      if (folder == std::string(kFolder) && FindKind(file) != nullptr) continue;
      if (Nearest(plain, {name}) == name || Nearest(plain.substr(0, name.size()), {name}) == name ||
          Nearest(plain.substr(0, plain.find('.')), {stem}) == stem) {
        return Shown(entry.path(), 200);
      }
    }
  }
  return "";
}

bool CheckFile(Checkup& checkup, const File& file, bool in_use, Json::Value& document) {
  return FileCheck(checkup, file, in_use).Run(document);
}

}  // namespace doctor
