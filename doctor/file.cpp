#include "doctor/file.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "doctor/json.h"
#include "doctor/redact.h"
#include "doctor/text.h"

namespace doctor {

namespace {

constexpr size_t kLongestFile = 1 << 20;

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
    if (file.error == ENOENT || file.error == ENOTDIR) {
      return in_use && Unusable("file-missing", name + " does not exist",
                                "Create it: a JSON object, owner root, mode " + good_mode + ".");
    }
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
  // The file of the other provider keeps no user from signing in.
  bool Unusable(const char* id, const std::string& cause, const std::string& action) {
    checkup.report.Add({id, in_use ? Grade::kFailure : Grade::kWarning, cause, file.At(), action,
                        in_use ? WithoutFile(checkup, file) : std::vector<Said>()});
    return false;
  }

  std::string Unreadable() const {
    if (S_ISDIR(file.status.st_mode)) return "is a directory";
    if (!S_ISREG(file.status.st_mode) && file.error == 0) return "is not a regular file";
    return "cannot be read: " + std::string(std::strerror(file.error));
  }

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
    }
  }

  bool CheckText(Json::Value& document) {
    const std::string& text = file.text;
    const std::string save = "Save it as UTF-8 without a byte-order mark.";
    if (text.find_first_not_of(" \t\r\n") == std::string::npos) {
      return Unusable("file-empty", name + " is empty", "Write a JSON object into it.");
    }
    if (StartsWith(text, "\xEF\xBB\xBF")) {
      return Unusable("file-byte-order-mark", name + " begins with a byte-order mark (EF BB BF)",
                      save);
    }
    if (StartsWith(text, "\xFF\xFE") || StartsWith(text, "\xFE\xFF") ||
        text.find('\0') != std::string::npos) {
      return Unusable("file-encoding", name + " is not UTF-8 (UTF-16, or zero bytes in it)", save);
    }
    std::string problem;
    if (!ParseJson(text, document, problem)) {
      return Unusable("file-syntax", name + " is not JSON: " + problem,
                      "Fix the text there: names and strings in double quotes, a comma between "
                      "members, none after the last.");
    }
    if (!document.isObject()) {
      return Unusable("file-no-object", name + " holds " + TypeName(document) + ", not an object",
                      "Put the members between { and }.");
    }
    const std::string odd = OddJson(text);
    if (!odd.empty()) {
      checkup.report.Warn("file-odd", "In " + name + " " + odd, file.At(),
                          "Remove what is not meant.",
                          {Said::Does("reads the file anyway; of two members the last counts")});
    }
    return true;
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
    stat(file.path.c_str(), &file.status);
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
  close(descriptor);
  return file;
}

bool CheckFile(Checkup& checkup, const File& file, bool in_use, Json::Value& document) {
  return FileCheck(checkup, file, in_use).Run(document);
}

std::string Mode(const struct stat& status) {
  char text[16];
  std::snprintf(text, sizeof text, "%04o", static_cast<unsigned>(status.st_mode & 07777));
  return text;
}

}  // namespace doctor
