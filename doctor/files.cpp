// The three configuration files: can they be read, by whom, and what stands in them.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "doctor/checkup.h"
#include "doctor/json.h"
#include "doctor/keys.h"
#include "doctor/text.h"
#include "sso/utils.h"

namespace doctor {

namespace {

constexpr char kFolder[] = "/usr/qova/etc/ssoclient/";

// A configuration file as it was found.
struct File {
  const FileKind& kind;
  std::string path;
  int error = 0;  // errno of the failed open or read; 0: `text` holds the file
  struct stat status = {};
  std::string text = {};
};

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
  ssize_t count;
  while ((count = read(descriptor, chunk, sizeof chunk)) > 0) {
    file.text.append(chunk, static_cast<size_t>(count));
  }
  if (count < 0) file.error = errno;
  close(descriptor);
  return file;
}

// What the library says if it finds no use for the file.
std::vector<Said> WithoutFile(const Checkup& checkup, const FileKind& kind) {
  if (kind.provider == Provider::kNone) return checkup.library.Login().said;
  std::vector<Said> said = {Said::Does("goes on with empty settings")};
  for (const Said& line : checkup.library.TokenRequest("").said) said.push_back(line);
  return said;
}

// A finding about a file as a whole. What is wrong with the file of the other provider keeps
// nobody from signing in.
void AddUnusable(Checkup& checkup, const File& file, bool in_use, const std::string& id,
                 const std::string& seen, const std::string& remedy) {
  Finding finding{id, Severity::kWarning, file.kind.name, seen, {}, remedy};
  if (in_use) {
    finding.severity = Severity::kFailure;
    finding.library = WithoutFile(checkup, file.kind);
  }
  checkup.report.Add(finding);
}

bool StartsWith(const std::string& text, const std::string& start) {
  return text.compare(0, start.size(), start) == 0;
}

// True if the file holds a JSON object, which is then in `document`.
bool CheckText(Checkup& checkup, const File& file, bool in_use, Json::Value& document) {
  const auto unusable = [&](const char* id, const std::string& seen, const std::string& remedy) {
    AddUnusable(checkup, file, in_use, id, seen, remedy);
    return false;
  };
  const std::string& text = file.text;
  if (text.find_first_not_of(" \t\r\n") == std::string::npos) {
    return unusable("file-empty", "is empty", "Write a JSON object into it.");
  }
  if (StartsWith(text, "\xEF\xBB\xBF")) {
    return unusable("file-byte-order-mark", "begins with a byte-order mark (EF BB BF)",
                    "Save it as UTF-8 without a byte-order mark.");
  }
  if (StartsWith(text, "\xFF\xFE") || StartsWith(text, "\xFE\xFF") ||
      text.find('\0') != std::string::npos) {
    return unusable("file-encoding", "is not UTF-8 text (UTF-16, or zero bytes in it)",
                    "Save it as UTF-8 without a byte-order mark.");
  }
  std::string problem;
  if (!ParseJson(text, document, problem)) {
    return unusable("file-syntax", "is not JSON: " + problem,
                    "Mend the text at this place: names and texts in double quotes, a comma "
                    "between members, none behind the last.");
  }
  if (!document.isObject()) {
    return unusable("file-no-object", "holds " + TypeName(document) + ", not an object",
                    "Put the members between { and }.");
  }
  const std::string odd = OddJson(text);
  if (!odd.empty()) {
    checkup.report.Add({"file-odd",
                        Severity::kWarning,
                        file.kind.name,
                        odd,
                        {Said::Does("reads the file all the same; of two members the last counts")},
                        "Remove what is not meant."});
  }
  return true;
}

std::string Mode(const struct stat& status) {
  char text[16];
  std::snprintf(text, sizeof text, "%04o", static_cast<unsigned>(status.st_mode & 07777));
  return text;
}

void CheckAccess(Checkup& checkup, const File& file) {
  const auto warn = [&](const char* id, const std::string& seen, const std::string& remedy) {
    checkup.report.Add({id,
                        Severity::kWarning,
                        file.kind.name,
                        seen,
                        {Said::Does("does not look at owner and mode")},
                        remedy});
  };
  const mode_t mode = file.status.st_mode;
  const std::string shown = "mode " + Mode(file.status);
  const std::string good = file.kind.secret ? "0600" : "0644";
  if (file.kind.secret && (mode & (S_IRGRP | S_IROTH)) != 0) {
    warn("secret-readable",
         std::string("the client secret can be read by ") +
             ((mode & S_IROTH) != 0 ? "everybody" : "a group") + " (" + shown + ")",
         "chmod " + good + " " + file.path + ", and take a new client secret.");
  }
  if ((mode & (S_IWGRP | S_IWOTH)) != 0 || file.status.st_uid != 0) {
    warn("file-writable",
         "others than root can change it (owner " + std::to_string(file.status.st_uid) + ", " +
             shown + ") and so decide who signs in",
         "chown root:root " + file.path + "; chmod " + good + " " + file.path);
  }
}

// True if the file could be read; then `document` holds its object, or null.
bool CheckFile(Checkup& checkup, const File& file, bool in_use, Json::Value& document) {
  if (file.error == ENOENT || file.error == ENOTDIR) {
    if (!in_use) return false;
    AddUnusable(checkup, file, in_use, "file-missing", "does not exist in " + std::string(kFolder),
                "Create it, owner root, mode " + std::string(file.kind.secret ? "0600." : "0644."));
    return false;
  }
  if (file.error == EACCES && geteuid() != 0) {
    checkup.report.Add({"file-not-checked",
                        Severity::kUnchecked,
                        file.kind.name,
                        "cannot be read by the user of this command",
                        {},
                        "Run ssoclient-doctor as root."});
    return false;
  }
  if (file.error != 0 || !S_ISREG(file.status.st_mode)) {
    const std::string why = S_ISDIR(file.status.st_mode) ? "is a directory"
                            : !S_ISREG(file.status.st_mode) && file.error == 0
                                ? "is not a regular file"
                                : "cannot be read: " + std::string(std::strerror(file.error));
    AddUnusable(checkup, file, in_use, "file-unreadable", why,
                "Put a regular file in its place, owner root, mode " +
                    std::string(file.kind.secret ? "0600." : "0644."));
    return false;
  }
  CheckAccess(checkup, file);
  return CheckText(checkup, file, in_use, document);
}

// Says of a key that the file does not have which one may be meant.
std::string KeyRemedy(const FileKind& kind, const std::string& key) {
  for (const FileKind& other : kFileKinds) {
    if (&other != &kind && FindKey(other, key) != nullptr) {
      return Quote(key) + " belongs into " + other.name + ".";
    }
  }
  std::vector<std::string> names;
  for (const Key& known : kind.keys) names.push_back(known.name);
  std::string near = Nearest(key, names);
  if (near.empty() && !kind.prefix.empty()) near = Nearest(kind.prefix + key, names);
  return near.empty() ? "Remove it." : "Rename it to " + Quote(near) + ".";
}

void CheckUnknownKeys(Checkup& checkup, const FileKind& kind, const Json::Value& document) {
  for (const std::string& key : document.getMemberNames()) {
    if (FindKey(kind, key) != nullptr) continue;
    checkup.report.Add({"key-unknown",
                        Severity::kWarning,
                        kind.name,
                        Quote(Clip(key, 60)) + " is no key of this file",
                        {Said::Does("ignores it, without a message")},
                        KeyRemedy(kind, key)});
  }
}

// What keeps a key from having an effect; empty if nothing does.
std::string KeyFault(const Key& key, const Json::Value& document, std::string& seen) {
  if (!document.isMember(key.name)) {
    seen = "is missing";
    return "key-missing";
  }
  const Json::Value& value = document[key.name];
  const bool right = key.type == Json::booleanValue ? value.isBool() : value.isString();
  if (!right) {
    seen = "is " + TypeName(value) +
           (key.type == Json::booleanValue ? ", not true or false" : ", not a string");
    return "key-wrong-type";
  }
  if (value.isString() && value.asString().empty()) {
    seen = "is empty";
    return "key-empty";
  }
  return "";
}

void CheckKeys(Checkup& checkup, const FileKind& kind, bool in_use, const Json::Value& document) {
  CheckUnknownKeys(checkup, kind, document);
  for (const Key& key : kind.keys) {
    std::string seen;
    const std::string id = KeyFault(key, document, seen);
    if (id.empty() || (!in_use && id == "key-missing")) continue;
    Finding finding{id,        Severity::kWarning,
                    kind.name, Quote(key.name) + " " + seen,
                    {},        "Set " + Quote(key.name) + " to " + key.meaning + "."};
    if (in_use) {
      finding.severity = key.needed ? Severity::kFailure : Severity::kWarning;
      finding.library = WithoutKey(checkup, key);
    }
    checkup.report.Add(finding);
  }
}

std::vector<Said> UnsupportedProfile(const Checkup& checkup) {
  std::vector<Said> said = checkup.library.Profile().ErrorLines();
  for (const Said& line : checkup.library.Login().said) {
    if (line.kind == Said::Kind::kThrows) said.push_back(line);
  }
  return said;
}

// What the profile file chooses, once it has both keys.
void CheckProfile(Checkup& checkup, const Json::Value& document) {
  const std::string name = StringOf(document, "sso_profile");
  const bool known = ProviderOf(name) != Provider::kNone;
  const bool off = document["sso_enable"].isBool() && !document["sso_enable"].asBool();
  if (off) {
    checkup.report.Add({"sso-disabled", Severity::kFailure, kFileKinds[0].name,
                        "\"sso_enable\" is false: single sign-on is off",
                        checkup.library.Login().said, "Set \"sso_enable\" to true."});
  }
  if (!known && !name.empty()) {
    const std::string near = Nearest(name, {"azure", "websphere"});
    checkup.report.Add({"profile-unsupported", Severity::kFailure, kFileKinds[0].name,
                        "\"sso_profile\" is " + Quote(Clip(name, 60)), UnsupportedProfile(checkup),
                        "Set \"sso_profile\" to " +
                            (near.empty() ? "\"azure\" or \"websphere\"" : Quote(near)) +
                            ", in small letters."});
  }
  if (!off && known && document["sso_enable"].isBool()) {
    checkup.report.Ok("profile", kFileKinds[0].name,
                      "single sign-on is on, with the profile " + Quote(name));
  }
}

// OIDCLogin reads the profile file without the guard, with the caller's own rights.
void CheckProfileReader(Checkup& checkup, const File& file) {
  if (geteuid() != 0) return;
  const Caller nobody = {"nobody", 65534, 65534, {}, true};
  const Caller& caller = checkup.caller ? *checkup.caller : nobody;
  const Reply reply = checkup.library.Login(&caller);
  if (!reply.Threw("read profile file failed.")) return;
  const bool group =
      !checkup.caller && (file.status.st_mode & S_IRGRP) != 0 && file.status.st_gid != 0;
  checkup.report.Add(
      {"profile-private", group ? Severity::kWarning : Severity::kFailure, file.kind.name,
       (checkup.caller ? "the user " + caller.name + " cannot read it"
                       : "not everybody can read it") +
           std::string(" (mode ") + Mode(file.status) + "; or a folder above it is closed)",
       reply.said,
       std::string("chmod 0644 ") + file.path +
           (group ? ", or name the login program's user with --user to know." : ".")});
}

// Whoever can write in the folder can put files of his own there.
void CheckFolder(Checkup& checkup) {
  struct stat status = {};
  if (stat(kFolder, &status) != 0) return;  // a finding about the files
  if (status.st_uid == 0 && (status.st_mode & (S_IWGRP | S_IWOTH)) == 0) return;
  checkup.report.Add({"folder-writable",
                      Severity::kWarning,
                      kFolder,
                      "others than root can put files into it (owner " +
                          std::to_string(status.st_uid) + ", mode " + Mode(status) + ")",
                      {Said::Does("does not look at owner and mode")},
                      std::string("chown root:root ") + kFolder + "; chmod 0755 " + kFolder});
}

// In every form in which a server may repeat it.
void HideSecret(Report& report, const std::string& secret) {
  report.Hide(secret);
  report.Hide(QOVA::SSO::URLEncode(secret));
  const std::string quoted = WriteJson(secret, JsonStyle::kCompact);
  report.Hide(quoted.substr(1, quoted.size() - 2));
}

}  // namespace

void CheckFiles(Checkup& checkup) {
  checkup.report.Begin("Files");
  CheckFolder(checkup);
  const File profile = Load(kFileKinds[0]);
  Json::Value document;
  if (CheckFile(checkup, profile, true, document)) {
    checkup.provider = ProviderOf(StringOf(document, "sso_profile"));
    checkup.library.Choose(checkup.provider);
    CheckKeys(checkup, kFileKinds[0], true, document);
    CheckProfile(checkup, document);
    CheckProfileReader(checkup, profile);
  }
  if (checkup.provider != Provider::kNone) {
    checkup.library.ReadSettings(checkup.settings);
    HideSecret(checkup.report, checkup.settings.client_secret);
  }
  for (const FileKind& kind : kFileKinds) {
    if (kind.provider == Provider::kNone) continue;
    const bool in_use = kind.provider == checkup.provider;
    const File file = Load(kind);
    Json::Value settings;
    if (!CheckFile(checkup, file, in_use, settings)) continue;
    if (in_use) {
      checkup.settings_read = true;
      checkup.tenant = StringOf(settings, "azure_tenant_id");
    }
    CheckKeys(checkup, kind, in_use, settings);
  }
}

}  // namespace doctor
