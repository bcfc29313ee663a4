#include "doctor/keyset.h"

#include <set>

#include "doctor/claims.h"
#include "doctor/json.h"
#include "doctor/text.h"
#include "doctor/transfer.h"
#include "doctor/web.h"

namespace doctor {

namespace {

constexpr size_t kShortestModulus = 256;  // bytes; RFC 7518, section 3.3

class KeySetCheck {
 public:
  explicit KeySetCheck(Checkup& checked) : checkup(checked) {}

  std::string Run(const std::string& uri) {
    const WebAnswer answer = Fetch(uri, nullptr, checkup.options.timeout);
    if (!ReportTransfer(checkup, {"key set", uri, Severity::kFailure, [this] { return Ask(); }},
                        answer)) {
      return "";
    }
    if (!CheckDocument(answer)) return "";
    for (const Json::Value& key : checkup.key_set["keys"]) CheckKey(key);
    if (usable.empty()) {
      Fail(
          "keys-none-usable",
          std::to_string(checkup.key_set["keys"].size()) +
              " keys, none of them with \"kid\", \"n\" and \"e\" as texts",
          "Let the provider publish RSA keys, and look at \"jwks_uri\" of its discovery document.");
      return "";
    }
    AddGood();
    return *usable.begin();
  }

 private:
  // What the library says to a token that names the first of the keys.
  std::vector<Said> Ask() const {
    Json::Value header = GoodHeader(checkup);
    if (!first.empty()) header["kid"] = first;
    return checkup.library.Verify(MakeToken(header, GoodClaims(checkup))).said;
  }

  void Fail(const char* id, const std::string& seen, const std::string& remedy) {
    checkup.report.Add({id, Severity::kFailure, "key set", seen, Ask(), remedy});
  }

  void Warn(const char* id, const std::string& seen, const std::string& does,
            const std::string& remedy) {
    checkup.report.Add({id, Severity::kWarning, "key set", seen, {Said::Does(does)}, remedy});
  }

  bool CheckDocument(const WebAnswer& answer) {
    const std::string shown = "HTTP " + std::to_string(answer.status);
    const std::string remedy = "Look at \"jwks_uri\" of the provider's discovery document.";
    Json::Value& document = checkup.key_set;
    if (!ParseJson(answer.body, document)) {
      document = Json::Value();
      Fail("keys-no-json", shown + ", not JSON", remedy);
      return false;
    }
    if (!document.isObject() || !document.isMember("keys")) {
      Fail("keys-missing", shown + ", JSON without \"keys\"", remedy);
      return false;
    }
    if (!document["keys"].isArray()) {
      Fail("keys-no-list", "\"keys\" is " + TypeName(document["keys"]) + ", not a list", remedy);
      return false;
    }
    return true;
  }

  void CheckKey(const Json::Value& key) {
    if (!key.isObject() || !key.isMember("kid")) return;  // the library skips it
    if (!key["kid"].isConvertibleTo(Json::stringValue)) {
      Fail("keys-bad-kid", "a key has " + TypeName(key["kid"]) + " as its \"kid\"",
           "Let the provider publish key identifiers that are texts.");
      return;
    }
    const std::string kid = key["kid"].asString();
    if (met.empty()) first = kid;
    if (!met.insert(kid).second) {
      Warn("keys-same-kid", "two keys are called " + Quote(Clip(kid, 60)),
           "uses the first of them, whatever signed the token",
           "Let the provider give each key an identifier of its own.");
      return;
    }
    if (!IsUsableKey(key)) {
      other += (other.empty() ? "" : ", ") + Clip(kid, 60);
      return;
    }
    usable.insert(kid);
    const std::string modulus = DecodeBase64Url(StringOf(key, "n"));
    if (modulus.size() < kShortestModulus) {
      Warn("keys-short",
           "the key " + Quote(Clip(kid, 60)) + " has " + std::to_string(modulus.size() * 8) +
               " bits",
           "takes keys of any length", "Let the provider use RSA keys of 2048 bits or more.");
    }
  }

  void AddGood() const {
    std::string text = std::to_string(usable.size()) + " RSA keys of use";
    if (!other.empty()) text += "; of no use to the library: " + Clip(other, 200);
    checkup.report.Ok("keys", "key set", text);
  }

  Checkup& checkup;
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

std::string CheckKeySet(Checkup& checkup, const std::string& uri) {
  checkup.report.Begin("Key set");
  return KeySetCheck(checkup).Run(uri);
}

}  // namespace doctor
