// The three configuration files: who can read them, and what their keys hold.
#include <unistd.h>

#include <algorithm>
#include <filesystem>

#include "doctor/characters.h"
#include "doctor/checkup.h"
#include "doctor/file.h"
#include "doctor/json.h"
#include "doctor/keys.h"
#include "doctor/paths.h"
#include "doctor/redact.h"
#include "doctor/text.h"

namespace doctor {

namespace {

// --- the profile file

std::vector<Said> UnsupportedProfile(const Checkup& checkup) {
  std::vector<Said> said = checkup.library.Profile().ErrorLines();
  for (const Said& line : checkup.library.Login().said) {
    if (line.kind == Said::Kind::kThrows) said.push_back(line);
  }
  return said;
}

// What the profile file chooses, once it has both keys.
void CheckProfile(Checkup& checkup, const File& file, const Json::Value& document) {
  const std::string name = StringOf(document, "sso_profile");
  const bool known = ProviderOf(name) != Provider::kNone;
  const bool off = document["sso_enable"].isBool() && !document["sso_enable"].asBool();
  if (off) {
    checkup.report.Fail("sso-disabled", "Single sign-on is switched off", file.At("sso_enable"),
                        "Set \"sso_enable\" to true.", checkup.library.Login().said);
  }
  if (!known && !name.empty()) {
    const std::string near = Nearest(Skeleton(name), {"azure", "websphere"});
    const std::string odd = OddCharacter(name);
    checkup.report.Add({"profile-unsupported", Grade::kFailure,
                        "The profile " + Quote(Shown(name, 60)) + " does not exist" +
                            (odd.empty() ? "" : ": it holds " + odd),
                        file.At("sso_profile"),
                        "Set \"sso_profile\" to " +
                            (near.empty() ? "\"azure\" or \"websphere\"" : Quote(near)) +
                            ", in lower case.",
                        UnsupportedProfile(checkup)});
  }
  if (!off && known && document["sso_enable"].isBool()) {
    checkup.report.Good("profile", "Single sign-on is on, with the profile " + Quote(name),
                        file.At());
  }
}

// The command that lets users read the file.
std::string Opening(const File& file, const Spot& closed) {
  if (closed.path == file.path) return "chmod 0644 " + file.path;
  if (file.path.compare(0, closed.path.size(), closed.path) == 0) {
    return "chmod a+rx " + closed.path;
  }
  return "Put the file itself in place of the link: cp --remove-destination $(readlink -f " +
         file.path + ") " + file.path;
}

// OIDCLogin reads the profile file without the guard, with the caller's own permissions.
void CheckProfileReader(Checkup& checkup, const File& file) {
  if (geteuid() != 0) return;
  const Caller nobody = {"nobody", 65534, 65534, {}, true};
  const Caller& caller = checkup.caller ? *checkup.caller : nobody;
  const Reply reply = checkup.library.Login(&caller);
  if (!reply.Threw("read profile file failed.")) return;
  const bool group =
      !checkup.caller && (file.status.st_mode & S_IRGRP) != 0 && file.status.st_gid != 0;
  const auto closed = ClosedTo(caller, file.path, R_OK);
  const Spot spot = closed ? *closed : Spot{file.path, file.status};
  checkup.report.Add(
      {"profile-private", group ? Grade::kWarning : Grade::kFailure,
       (checkup.caller ? "The user " + caller.name + " cannot read " : "Not every user can read ") +
           std::string(file.kind.name) + ": " + spot.path + " is closed (" + spot.Owner() + ")",
       file.At(),
       Opening(file, spot) +
           (group ? ", or name the login program's user with --user to know." : ""),
       reply.said});
}

// Whoever can write in the folder can replace the files.
void CheckFolder(Checkup& checkup) {
  struct stat status = {};
  if (stat(kFolder, &status) != 0) return;  // a finding about the files
  if (status.st_uid == 0 && (status.st_mode & (S_IWGRP | S_IWOTH)) == 0) return;
  const std::string folder = kFolder;
  checkup.report.Warn("folder-writable",
                      "Users other than root can put settings files into the folder (owner " +
                          std::to_string(status.st_uid) + ", mode " + Mode(status) + ")",
                      {folder}, "chown root:root " + folder + "; chmod 0755 " + folder,
                      {Said::Does("does not check owner and mode")});
}

// Copies that editors and people leave behind.
void CheckCopies(Checkup& checkup) {
  std::error_code error;
  for (const auto& entry : std::filesystem::directory_iterator(kFolder, error)) {
    const std::string name = entry.path().filename();
    Spot spot{entry.path()};
    if (FindKind(name) != nullptr || lstat(spot.path.c_str(), &spot.status) != 0) continue;
    const bool copy =
        std::any_of(std::begin(kFileKinds), std::end(kFileKinds), [&name](const FileKind& kind) {
          return kind.secret && name.find(kind.name) < 2 &&
                 access((kFolder + std::string(kind.name)).c_str(), F_OK) == 0;
        });
    if (!copy || !S_ISREG(spot.status.st_mode) || (spot.status.st_mode & 044) == 0) continue;
    const std::string shown = Shown(spot.path, 200);
    checkup.report.Warn(
        "secret-readable",
        "Users other than root can read a copy of the settings (" + spot.Owner() + ")", {shown},
        "rm '" + shown + "', and set a new client secret.");
  }
}

// --- secrets

// The kinds of characters of a generated secret.
bool LooksGenerated(const std::string& text) {
  int kinds = 0;
  for (const char* kind : {"abcdefghijklmnopqrstuvwxyz", "ABCDEFGHIJKLMNOPQRSTUVWXYZ", "0123456789",
                           "~!@#$%^&*()+=/,;"}) {
    if (text.find_first_of(kind) != std::string::npos) ++kinds;
  }
  return text.size() >= 16 && kinds >= 3 && !IsGuid(text);
}

// Whatever a file calls a secret is one; and the client ID may be the secret in the wrong place.
void HideSecrets(const FileKind& kind, const Json::Value& document) {
  for (const std::string& key : document.getMemberNames()) {
    const std::string value = StringOf(document, key.c_str());
    if (key.find("secret") != std::string::npos || key.find("password") != std::string::npos) {
      Hide(value);
    }
  }
  const std::string id = StringOf(document, (kind.prefix + "client_id").c_str());
  if (LooksGenerated(id) || IsGuid(StringOf(document, (kind.prefix + "client_secret").c_str()))) {
    Hide(id);
  }
}

}  // namespace

void CheckFiles(Checkup& checkup) {
  CheckFolder(checkup);
  CheckCopies(checkup);
  const File profile = Load(kFileKinds[0]);
  Json::Value document;
  if (CheckFile(checkup, profile, true, document)) {
    checkup.provider = ProviderOf(StringOf(document, "sso_profile"));
    checkup.library.Choose(checkup.provider);
    CheckKeys(checkup, profile, true, document);
    CheckProfile(checkup, profile, document);
    CheckProfileReader(checkup, profile);
  }
  for (const FileKind& kind : kFileKinds) {
    if (kind.provider == Provider::kNone) continue;
    const bool in_use = kind.provider == checkup.provider;
    const File file = Load(kind);
    Json::Value settings;
    if (!CheckFile(checkup, file, in_use, settings)) continue;
    HideSecrets(kind, settings);
    if (in_use) {
      checkup.settings = checkup.library.ReadSettings();
      checkup.settings_read = true;
      checkup.settings_file = file.path;
      checkup.tenant = StringOf(settings, "azure_tenant_id");
    }
    CheckKeys(checkup, file, in_use, settings);
  }
  if (!checkup.settings_read) {
    checkup.report.Skip("The settings, the provider and the token", checkup.report.Obstacle());
  }
}

}  // namespace doctor
