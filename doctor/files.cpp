// The three configuration files: who can read them, and what their keys hold.
#include <unistd.h>

#include <algorithm>

#include "doctor/checkup.h"
#include "doctor/file.h"
#include "doctor/json.h"
#include "doctor/keys.h"
#include "doctor/redact.h"
#include "doctor/text.h"

namespace doctor {

namespace {

// --- keys

// The key of this file that the unknown one is most likely meant to be; null if there is none.
const Key* MeantKey(const FileKind& kind, const std::string& key) {
  std::vector<std::string> names;
  for (const Key& known : kind.keys) names.push_back(known.name);
  std::string near = Nearest(key, names);
  if (near.empty() && !kind.prefix.empty()) near = Nearest(kind.prefix + key, names);
  return FindKey(kind, near);
}

// Adds a key that the library does not know. True if it is a misspelling of the key that it
// names, which the file does not have.
bool AddUnknownKey(Checkup& checkup, const File& file, const std::string& key,
                   const Json::Value& document, bool in_use) {
  const Key* meant = MeantKey(file.kind, key);
  std::string action = "Remove it.";
  if (meant != nullptr) action = "Rename it to " + Quote(meant->name) + ".";
  for (const FileKind& other : kFileKinds) {
    if (&other == &file.kind || FindKey(other, key) == nullptr) continue;
    action = Quote(key) + " belongs in " + other.name + ".";
    meant = nullptr;
  }
  const bool missed = meant != nullptr && !document.isMember(meant->name);
  checkup.report.Add({"key-unknown",
                      missed && meant->needed && in_use ? Grade::kFailure : Grade::kWarning,
                      Quote(Shown(key, 60)) + " is not a key of " + file.kind.name,
                      file.At(Shown(key, 60)),
                      action,
                      {Said::Does("ignores it without a message")}});
  return missed;
}

// What keeps a key from having an effect; empty if nothing does.
std::string KeyFault(const Key& key, const Json::Value& document, std::string& seen) {
  if (!document.isMember(key.name)) {
    seen = "is missing";
    return "key-missing";
  }
  const Json::Value& value = document[key.name];
  const bool boolean = key.type == Json::booleanValue;
  if (boolean ? !value.isBool() : !value.isString()) {
    seen = "is " + TypeName(value) + (boolean ? ", not true or false" : ", not a string");
    return "key-wrong-type";
  }
  if (value.isString() && value.asString().empty()) {
    seen = "is empty";
    return "key-empty";
  }
  return "";
}

void CheckKeys(Checkup& checkup, const File& file, bool in_use, const Json::Value& document) {
  std::set<const Key*> misspelt;
  for (const std::string& key : document.getMemberNames()) {
    if (FindKey(file.kind, key) != nullptr) continue;
    if (AddUnknownKey(checkup, file, key, document, in_use)) {
      misspelt.insert(MeantKey(file.kind, key));
    }
  }
  for (const Key& key : file.kind.keys) {
    std::string seen;
    const std::string id = KeyFault(key, document, seen);
    if (id.empty() || (!in_use && id == "key-missing")) continue;
    checkup.report.Add({id, in_use && key.needed ? Grade::kFailure : Grade::kWarning,
                        Quote(key.name) + " " + seen, file.At(key.name),
                        "Set " + Quote(key.name) + " to " + key.meaning + ".",
                        in_use ? WithoutKey(checkup, key) : std::vector<Said>(),
                        misspelt.count(&key) > 0 ? "key-unknown" : ""});
  }
}

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
    const std::string near = Nearest(name, {"azure", "websphere"});
    checkup.report.Add(
        {"profile-unsupported", Grade::kFailure,
         "The profile " + Quote(Shown(name, 60)) + " does not exist", file.At("sso_profile"),
         "Set \"sso_profile\" to " + (near.empty() ? "\"azure\" or \"websphere\"" : Quote(near)) +
             ", in lower case.",
         UnsupportedProfile(checkup)});
  }
  if (!off && known && document["sso_enable"].isBool()) {
    checkup.report.Good("profile", "Single sign-on is on, with the profile " + Quote(name),
                        file.At());
  }
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
  checkup.report.Add(
      {"profile-private", group ? Grade::kWarning : Grade::kFailure,
       (checkup.caller ? "The user " + caller.name + " cannot read " : "Not every user can read ") +
           std::string(file.kind.name) + " (mode " + Mode(file.status) +
           ", or a folder above it is closed)",
       file.At(),
       "chmod 0644 " + file.path +
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
