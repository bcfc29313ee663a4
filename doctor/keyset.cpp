#include "doctor/keyset.h"

#include <set>

#include "doctor/claims.h"
#include "doctor/json.h"
#include "doctor/redact.h"
#include "doctor/text.h"
#include "doctor/transfer.h"

namespace doctor {

namespace {

constexpr size_t kShortestModulus = 256;  // bytes; RFC 7518, section 3.3

Json::Value KeysOf(const Json::Value& set) {
  return set.isObject() && set["keys"].isArray() ? set["keys"] : Json::Value(Json::arrayValue);
}

class KeySetCheck {
 public:
  explicit KeySetCheck(Checkup& checked) : checkup(checked) {}

  std::string Run(const std::string& uri) {
    WebAnswer answer;
    const Destination destination{"key set", uri, Grade::kFailure, [this] { return Ask(); }};
    if (!Exchange(checkup, destination, nullptr, answer)) return "";
    place = At(destination, answer);
    if (!CheckDocument(answer)) return "";
    for (const Json::Value& key : checkup.key_set["keys"]) CheckKey(key);
    if (usable.empty()) {
      Fail("keys-none-usable",
           "None of the " + std::to_string(checkup.key_set["keys"].size()) +
               " keys has \"kid\", \"n\" and \"e\" as strings",
           "Let the provider publish RSA keys, and check \"jwks_uri\" of its discovery document.");
      return "";
    }
    AddGood();
    if (checkup.entra() && uri.find('?') == std::string::npos) CheckOwnKeys(uri);
    return *usable.begin();
  }

 private:
  // What the library says to a token that names the first of the keys.
  std::vector<Said> Ask() const {
    Json::Value header = GoodHeader(checkup);
    if (!first.empty()) header["kid"] = first;
    return checkup.library.Verify(MakeToken(header, GoodClaims(checkup))).said;
  }

  void Fail(const char* id, const std::string& cause, const std::string& action) {
    checkup.report.Fail(id, cause, place, action, Ask());
  }

  void Warn(const char* id, const std::string& cause, const std::string& does,
            const std::string& action) {
    checkup.report.Warn(id, cause, place, action, {Said::Does(does)});
  }

  bool CheckDocument(const WebAnswer& answer) {
    const std::string shown = " (HTTP " + std::to_string(answer.status) + ")";
    const std::string action = "Check \"jwks_uri\" of the provider's discovery document.";
    Json::Value& document = checkup.key_set;
    if (!ParseJson(answer.body, document)) {
      document = Json::Value();
      Fail("keys-no-json", "The key set is not JSON" + shown, action);
      return false;
    }
    if (!document.isObject() || !document.isMember("keys")) {
      Fail("keys-missing", "The key set has no \"keys\"" + shown, action);
      return false;
    }
    if (!document["keys"].isArray()) {
      Fail("keys-no-list",
           "\"keys\" of the key set is " + TypeName(document["keys"]) + ", not a list", action);
      return false;
    }
    return true;
  }

  void CheckKey(const Json::Value& key) {
    if (!key.isObject() || !key.isMember("kid")) return;  // the library skips it
    if (!key["kid"].isConvertibleTo(Json::stringValue)) {
      Fail("keys-bad-kid", "A key has " + TypeName(key["kid"]) + " as its \"kid\"",
           "Let the provider publish key identifiers that are strings.");
      return;
    }
    const std::string kid = key["kid"].asString();
    if (met.empty()) first = kid;
    if (!met.insert(kid).second) {
      Warn("keys-same-kid", "Two keys have the identifier " + Quote(Shown(kid, 60)),
           "uses the first of them, whichever signed the token",
           "Let the provider give each key its own identifier.");
      return;
    }
    if (!IsUsableKey(key)) {
      other += (other.empty() ? "" : ", ") + Shown(kid, 60);
      return;
    }
    usable.insert(kid);
    const std::string modulus = DecodeBase64Url(StringOf(key, "n"));
    if (modulus.size() < kShortestModulus) {
      Warn("keys-short",
           "The key " + Quote(Shown(kid, 60)) + " has only " + std::to_string(modulus.size() * 8) +
               " bits",
           "accepts keys of any length", "Let the provider use RSA keys of 2048 bits or more.");
    }
  }

  // An application with its own signing keys has them in a key set of its own.
  void CheckOwnKeys(const std::string& uri) {
    const std::string query = "?appid=" + checkup.settings.client_id;
    const Destination destination{"key set of the application", uri + query, Grade::kWarning, {}};
    const WebAnswer answer = Send(checkup, destination);
    Json::Value own;
    if (answer.code != CURLE_OK || !ParseJson(answer.body, own) || KeysOf(own).empty()) return;
    for (const Json::Value& key : KeysOf(own)) {
      if (met.count(StringOf(key, "kid")) > 0) return;
    }
    checkup.report.Fail("keys-of-application",
                        "The application has its own signing keys, which are not in this key set",
                        place, "Append " + query + " to azure_wellknown.", Ask());
  }

  void AddGood() const {
    std::string text = Plural(usable.size(), "RSA key") + " that the library can use";
    if (!other.empty()) text += "; it cannot use " + Clip(other, 200);
    checkup.report.Good("keys", text, place);
  }

  Checkup& checkup;
  Place place;
  std::string first;
  std::set<std::string> met;
  std::set<std::string> usable;
  std::string other;
};

}  // namespace

bool IsUsableKey(const Json::Value& key) {
  return !DecodeBase64Url(StringOf(key, "n")).empty() &&
         !DecodeBase64Url(StringOf(key, "e")).empty();
}

Json::Value AnyUsableKey(const Json::Value& key_set) {
  for (const Json::Value& key : KeysOf(key_set)) {
    if (IsUsableKey(key) && !StringOf(key, "kid").empty()) return key;
  }
  return {};
}

Json::Value KeyNamed(const Json::Value& key_set, const std::string& kid) {
  for (const Json::Value& key : KeysOf(key_set)) {
    if (key.isObject() && key.isMember("kid") && TextOf(key, "kid") == kid) return key;
  }
  return {};
}

std::string CheckKeySet(Checkup& checkup, const std::string& uri) {
  return KeySetCheck(checkup).Run(uri);
}

}  // namespace doctor
