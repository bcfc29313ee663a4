// The keys of one file: those that are missing, misspelt or in the wrong place, and their values.
#include <algorithm>
#include <map>

#include "doctor/characters.h"
#include "doctor/checkup.h"
#include "doctor/file.h"
#include "doctor/json.h"
#include "doctor/keys.h"
#include "doctor/redact.h"
#include "doctor/text.h"

namespace doctor {

namespace {

// The key of this file that the unknown one is most likely meant to be; null if there is none.
const Key* MeantKey(const FileKind& kind, const std::string& key) {
  std::vector<std::string> names;
  for (const Key& known : kind.keys) names.push_back(known.name);
  const std::string plain = Skeleton(key);
  const size_t line = plain.find('_');
  // Of the other provider, or of none.
  const std::string own =
      kind.prefix + (line == std::string::npos ? plain : plain.substr(line + 1));
  for (const std::string& form : {plain, kind.prefix + plain, own}) {
    const Key* const key_of_form = FindKey(kind, Nearest(form, names));
    if (key_of_form != nullptr) return key_of_form;
  }
  return nullptr;
}

constexpr char kBlanks[] = " \t\r\n";

class KeysCheck {
 public:
  KeysCheck(Checkup& checked, const File& found, bool needed, const Json::Value& settings)
      : checkup(checked), file(found), in_use(needed), document(settings) {}

  void Run() {
    CheckProvider();
    CheckNested();
    CheckOdd();
    for (const std::string& key : document.getMemberNames()) {
      if (FindKey(file.kind, key) == nullptr && !document[key].isObject()) AddUnknown(key);
    }
    for (const Key& key : file.kind.keys) CheckKnown(key);
  }

 private:
  Grade Grave(bool grave) const { return in_use && grave ? Grade::kFailure : Grade::kWarning; }

  // True if the file has the key, in a place where the library does not see it.
  bool IsHidden(const Key& key) const {
    return !document.isMember(key.name) && file.text.find(Quote(key.name)) != std::string::npos;
  }

  // The keys of another file alone.
  void CheckProvider() {
    for (const FileKind& other : kFileKinds) {
      size_t found = 0;
      for (const std::string& key : document.getMemberNames()) {
        if (FindKey(file.kind, key) != nullptr) return;
        if (FindKey(other, key) != nullptr) ++found;
      }
      if (found < 2) continue;
      of_another = "file-of-another";
      for (const Key& key : file.kind.keys) explained.insert({&key, of_another});
      checkup.report.Add({of_another,
                          Grave(true),
                          std::string(file.kind.name) + " holds the settings of " + other.name,
                          file.At(),
                          "Write the keys of " + std::string(file.kind.name) +
                              " into it, or set \"sso_profile\" to the other provider.",
                          {Said::Does("ignores them without a message")}});
    }
  }

  void CheckNested() {
    for (const std::string& key : document.getMemberNames()) {
      if (!document[key].isObject()) continue;
      size_t known = 0;
      for (const std::string& inner : document[key].getMemberNames()) {
        const Key* const meant = MeantKey(file.kind, inner);
        if (meant == nullptr || document.isMember(meant->name)) continue;
        explained.insert({meant, "file-nested"});
        ++known;
      }
      checkup.report.Add({"file-nested",
                          Grave(known > 0),
                          "The settings under " + Quote(Shown(key, 60)) + " in " + file.kind.name +
                              " are not read",
                          file.At(Shown(key, 60)),
                          "Put the keys directly between the outer { and }, with the names of "
                          "ssoclient(5).",
                          {Said::Does("reads the keys of the outermost object alone")}});
    }
  }

  void CheckOdd() {
    const OddJson odd = FindOdd(file.text);
    const auto add = [this](bool grave, const std::string& key, const std::string& cause,
                            const std::string& action) {
      checkup.report.Add({"file-odd",
                          Grave(grave),
                          cause,
                          file.At(key),
                          action,
                          {Said::Does("reads the file anyway; of two members the last counts")}});
    };
    if (odd.text_behind || file.text.find('\0') != std::string::npos) {
      bool grave = false;
      for (const Key& key : file.kind.keys) {
        if (!IsHidden(key) || !explained.insert({&key, "file-odd"}).second) continue;
        grave = grave || key.needed;
      }
      add(grave, "",
          std::string("In ") + file.kind.name + " there is text behind the closing brace",
          "Remove it, or put the brace behind the last member.");
    }
    if (!odd.key_twice) return;
    for (const std::string& key : document.getMemberNames()) {
      const size_t first = file.text.find(Quote(key));
      if (first == std::string::npos ||
          file.text.find(Quote(key), first + 1) == std::string::npos) {
        continue;
      }
      add(false, Shown(key, 60), Quote(Shown(key, 60)) + " is given twice; the last one counts",
          "Remove the one that is not meant.");
    }
  }

  void AddUnknown(const std::string& key) {
    const Key* meant = MeantKey(file.kind, key);
    std::string action = "Remove it.";
    if (meant != nullptr) action = "Rename it to " + Quote(meant->name) + ".";
    const bool missed = meant != nullptr && !document.isMember(meant->name);
    for (const FileKind& other : kFileKinds) {
      if (missed || &other == &file.kind || FindKey(other, key) == nullptr) continue;
      action = Quote(key) + " belongs in " + other.name + ".";
    }
    if (missed) explained.insert({meant, "key-unknown"});
    const std::string odd = OddCharacter(key);
    checkup.report.Add({"key-unknown",
                        Grave(missed && meant->needed),
                        Quote(Shown(key, 60)) + " is not a key of " + file.kind.name +
                            (odd.empty() ? "" : ": it holds " + odd),
                        file.At(Shown(key, 60)),
                        action,
                        {Said::Does("ignores it without a message")},
                        of_another});
  }

  // What keeps a key from having an effect; empty if nothing does.
  std::string Fault(const Key& key, std::string& seen) const {
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

  void CheckKnown(const Key& key) {
    std::string seen;
    const std::string id = Fault(key, seen);
    if (id.empty()) return CheckValue(key);
    if (!in_use && id == "key-missing") return;
    const auto reason = explained.find(&key);
    checkup.report.Add({id, Grave(key.needed), Quote(key.name) + " " + seen, file.At(key.name),
                        "Set " + Quote(key.name) + " to " + key.meaning + ".",
                        in_use ? WithoutKey(checkup, key) : std::vector<Said>(),
                        reason == explained.end() ? "" : reason->second});
  }

  // What is wrong with a string, whatever the key is for.
  void CheckValue(const Key& key) {
    if (!in_use || key.type != Json::stringValue || file.kind.provider == Provider::kNone) return;
    const std::string value = document[key.name].asString();
    const std::string name = key.name;
    const bool url = value.find("://") != std::string::npos;
    const bool secret = EndsWith(name, "_secret");
    const bool id = EndsWith(name, "_id");
    const auto add = [&](const char* finding, bool grave, const std::string& cause,
                         const std::string& action) {
      checkup.bad_keys.insert(name);
      if (url) checkup.bad_urls.insert(value);
      checkup.report.Add({finding,
                          Grave(grave && key.needed),
                          Quote(name) + " " + cause,
                          file.At(name),
                          action,
                          {Said::Does("uses the value unchanged")}});
    };
    const Placeholder placeholder = PlaceholderOf(value);
    const size_t begin = std::min(value.find_first_not_of(kBlanks), value.size());
    const std::string odd =
        OddCharacter(value.substr(begin, value.find_last_not_of(kBlanks) + 1 - begin));
    if (IsInQuotes(value)) {
      add("value-quoted", true, "has quotation marks inside its value",
          "Remove the inner quotation marks.");
    } else if (placeholder != Placeholder::kNone || (url && IsPlaceholderUrl(value))) {
      add("value-placeholder", checkup.azure() || placeholder != Placeholder::kPossible,
          "looks like the placeholder of an example" +
              (secret ? "" : ", " + Quote(Shown(value, 80))),
          "Set " + Quote(name) + " to " + key.meaning + ".");
    } else if (!odd.empty()) {
      add("value-odd", checkup.azure() || id || url, "holds " + odd,
          "Type the value again in plain ASCII, or copy it as plain text.");
    } else if (id && HasSpaceAround(value)) {
      add("value-space", true, "has a blank at its beginning or end", "Remove the blank.");
    }
  }

  Checkup& checkup;
  const File& file;
  const bool in_use;
  const Json::Value& document;
  std::string of_another;                       // the finding that the file is another's
  std::map<const Key*, std::string> explained;  // missing keys, and the finding that says why
};

}  // namespace

void CheckKeys(Checkup& checkup, const File& file, bool in_use, const Json::Value& document) {
  KeysCheck(checkup, file, in_use, document).Run();
}

}  // namespace doctor
