// A token from standard input: what each check of the library says, in the library's order.
//
// Each check is put to the library with a token that is in order up to that check, so that a
// token with two faults gets both told.
#include <iostream>

#include "doctor/checkup.h"
#include "doctor/claims.h"
#include "doctor/json.h"
#include "doctor/keyset.h"
#include "doctor/text.h"

namespace doctor {

namespace {

constexpr size_t kLongestToken = 1 << 20;
constexpr char kNotSupported[] = " algorithm is not supported";

std::string ReadToken() {
  std::string token;
  char chunk[4096];
  while (std::cin.read(chunk, sizeof chunk), std::cin.gcount() > 0) {
    token.append(chunk, static_cast<size_t>(std::cin.gcount()));
    if (token.size() > kLongestToken) break;
  }
  const size_t begin = token.find_first_not_of(" \t\r\n");
  if (begin == std::string::npos) return "";
  return token.substr(begin, token.find_last_not_of(" \t\r\n") - begin + 1);
}

bool EndsWith(const std::string& text, const std::string& end) {
  return text.size() >= end.size() && text.compare(text.size() - end.size(), end.size(), end) == 0;
}

// A claim as it is shown.
std::string Shown(const Json::Value& claims, const char* name) {
  if (!claims.isObject() || !claims.isMember(name)) return "is missing";
  const Json::Value& value = claims[name];
  if (!value.isConvertibleTo(Json::stringValue)) return "is " + TypeName(value);
  return "is " + Quote(Clip(value.asString(), 100));
}

class TokenCheck {
 public:
  TokenCheck(Checkup& checked, const std::string& text)
      : checkup(checked), token(text), azure(checked.provider == Provider::kAzure) {}

  void Run() {
    if (token.empty()) {
      return Fail("token-empty", "token", "there is none", checkup.library.VerifyOffline("").said,
                  "Pass a token on standard input.");
    }
    if (!CheckFormat()) return;
    CheckExpiry();
    if (azure) CheckTenant();
    CheckAudience();
    if (azure) {
      CheckKey();
    } else {
      CheckAlgorithm("");
    }
    CheckSignature();
    CheckName();
    CheckIssuer();
    AddVerdict();
  }

 private:
  void Fail(const char* id, const char* subject, const std::string& seen,
            const std::vector<Said>& said, const std::string& remedy) {
    checkup.report.Add({id, Severity::kFailure, subject, seen, said, remedy});
  }

  // --- what is there at all

  bool CheckFormat() {
    const Reply split = checkup.library.Split(token);
    if (!split.Thrown().empty()) {
      Fail("token-format", "token", "is not three segments with two dots between", split.said,
           "Pass the whole ID token in its compact form.");
      return false;
    }
    const Reply head = checkup.library.Header(token);
    if (!head.Thrown().empty()) {
      Fail("token-header", "token", "its header (first segment) is not base64url text of JSON",
           head.said, "Pass the token unchanged; if it is, the provider made it wrongly.");
      return false;
    }
    const Reply claim_set = checkup.library.Body(token);
    if (!claim_set.Thrown().empty()) {
      Fail("token-body", "token", "its claims (second segment) are not base64url text of JSON",
           claim_set.said,
           "Pass the token unchanged; an encrypted token (five segments) is of no use.");
      return false;
    }
    header = head.result;
    claims = claim_set.result;
    checkup.report.Ok("token-format", "token", "three segments, header and claims are JSON");
    return true;
  }

  // --- claims

  // The library's word on a token that is good but for this claim.
  Reply AskAboutClaim(const char* name) const {
    Json::Value good = GoodClaims(checkup);
    good.removeMember(name);
    if (claims.isObject() && claims.isMember(name)) good[name] = claims[name];
    return checkup.library.VerifyOffline(MakeToken(GoodHeader(checkup), good));
  }

  // True if the reply says that the check passed. A list in a place of text ends any check.
  static bool Passed(const Reply& reply, const std::string& refusal) {
    return reply.ended && !reply.Threw(refusal) && reply.ThrownClass() != "Json::LogicError";
  }

  void CheckExpiry() {
    const Reply reply = AskAboutClaim("exp");
    long long expiry = 0;
    const bool known = ParseExpiry(expiry);
    const long long left = expiry - static_cast<long long>(time(nullptr));
    std::string seen = Shown(claims, "exp");
    if (known) {
      seen += ", " + Time(static_cast<time_t>(expiry)) + ", " +
              (left < 0 ? Span(left) + " ago" : "in " + Span(left));
    }
    if (Passed(reply, "id_token expired.")) return checkup.report.Ok("token-expiry", "exp", seen);
    Fail("token-expired", "exp", seen, reply.said,
         known ? "Pass a fresh token. If it is fresh, set this device's clock (" +
                     Time(time(nullptr)) + ")."
               : "Let the provider give \"exp\" as a number of seconds.");
  }

  bool ParseExpiry(long long& expiry) const {
    const std::string text = TextOf(claims, "exp");
    char* end = nullptr;
    expiry = std::strtoll(text.c_str(), &end, 10);
    return end != text.c_str() && expiry > 0 && expiry < 253402300800;  // the year 10000
  }

  void CheckTenant() {
    const Reply reply = AskAboutClaim("tid");
    const std::string seen = Shown(claims, "tid");
    if (Passed(reply, "tenant ID invalid")) return checkup.report.Ok("token-tenant", "tid", seen);
    Fail("token-tenant", "tid", seen + "; configured is " + Quote(checkup.tenant), reply.said,
         "Set azure_tenant_id to the token's \"tid\" if that is your tenant.");
  }

  void CheckAudience() {
    const Reply reply = AskAboutClaim("aud");
    const std::string seen = Shown(claims, "aud");
    if (Passed(reply, "client ID invalid")) return checkup.report.Ok("token-audience", "aud", seen);
    const bool list = reply.ThrownClass() == "Json::LogicError";
    Fail("token-audience", "aud", seen + "; configured is " + Quote(checkup.settings.client_id),
         reply.said,
         list ? "Let the provider give \"aud\" as one text, not as a list."
              : "Set the client ID to the token's \"aud\" if the token was meant for this device.");
  }

  // --- key and algorithm

  Reply AskAboutHeader(const Json::Value& changed) const {
    return checkup.library.Verify(MakeToken(changed, GoodClaims(checkup)));
  }

  void CheckKey() {
    if (checkup.options.offline) {
      return checkup.report.Note("token-key", "kid", "not looked at (--offline)");
    }
    const Reply reply = AskAboutHeader(header);
    const std::string seen = Shown(header, "kid");
    if (reply.Threw("kid does not exist in Azure verified kyes")) {
      Fail("token-key-unknown", "kid", seen + ", which is no key of the key set", reply.said,
           "Look whether the token is one of this provider, and at the key set above.");
    } else if (reply.Threw("RSA public 'n' cannot be found!") ||
               reply.Threw("RSA public 'e' cannot be found!")) {
      Fail("token-key-incomplete", "kid", seen + ", a key without RSA numbers", reply.said,
           "Let the provider sign with an RSA key.");
    } else if (reply.ThrownClass() == "Json::LogicError") {
      Fail("token-no-text", "kid", seen, reply.said,
           "Let the provider give \"alg\" and \"kid\" as texts.");
    } else if (!reply.ended) {
      Fail("token-key-silent", "kid", "no key set came in time",
           {Said::Does("waits for as long as it takes: it sets no time-out")},
           "Look at the findings about the key set.");
    } else {
      checkup.report.Ok("token-key", "kid", seen);
    }
    CheckAlgorithm(UsableKid());
  }

  // The identifier of a key with which the library gets as far as the algorithm.
  std::string UsableKid() const {
    for (const Json::Value& key : Keys()) {
      if (IsUsableKey(key) && key.isMember("kid") && key["kid"].isString()) {
        return key["kid"].asString();
      }
    }
    return "";
  }

  Json::Value Keys() const {
    const Json::Value& set = checkup.key_set;
    return set.isObject() && set["keys"].isArray() ? set["keys"] : Json::Value(Json::arrayValue);
  }

  void CheckAlgorithm(const std::string& kid) {
    if (azure && kid.empty()) {
      return checkup.report.Note("token-algorithm", "alg",
                                 Shown(header, "alg") + "; the library does not get so far");
    }
    Json::Value changed(Json::objectValue);
    changed["kid"] = kid;
    if (header.isObject() && header.isMember("alg")) changed["alg"] = header["alg"];
    const Reply reply = AskAboutHeader(changed);
    const std::string seen = Shown(header, "alg");
    if (!EndsWith(reply.Thrown(), kNotSupported) && Passed(reply, "")) {
      supported = true;
      return checkup.report.Ok("token-algorithm", "alg", seen);
    }
    Fail("token-algorithm", "alg", seen, reply.said,
         azure ? "Let the provider sign with RS256, RS384 or RS512."
               : "Let the provider sign with HS256, HS384 or HS512.");
  }

  // --- signature

  const Json::Value* FindKey(const Json::Value& keys) const {
    for (const Json::Value& key : keys) {
      if (key.isObject() && key.isMember("kid") && TextOf(key, "kid") == TextOf(header, "kid")) {
        return &key;
      }
    }
    return nullptr;
  }

  void CheckSignature() {
    const Json::Value keys = Keys();
    const Json::Value* const key = azure ? FindKey(keys) : nullptr;
    if (!supported || (azure && (key == nullptr || !IsUsableKey(*key)))) {
      return checkup.report.Note("token-signature", "signature", "the library does not get so far");
    }
    const std::string algorithm = TextOf(header, "alg");
    const Reply reply =
        azure
            ? checkup.library.VerifyRSA(token, StringOf(*key, "n"), StringOf(*key, "e"), algorithm)
            : checkup.library.VerifyHMAC(token, checkup.settings.client_secret, algorithm);
    if (reply.ended && reply.Thrown().empty()) {
      return checkup.report.Ok("token-signature", "signature", "belongs to this token");
    }
    Fail("token-signature", "signature", "does not belong to this token", reply.said,
         azure ? "Pass the token unchanged. If it is, the provider did not sign it with the key "
                 "that it names."
               : "Set websphere_client_secret to the secret under which the provider signs; the "
                 "signature must be base64url without padding.");
  }

  // --- user name and issuer

  void CheckName() {
    const Reply reply = checkup.library.UserName(token);
    const char* const subject = azure ? "unique_name, email" : "sub";
    if (reply.result.isString()) {
      user = reply.result.asString();
      return checkup.report.Ok("token-name", subject, "the user is " + Quote(Clip(user, 100)));
    }
    if (reply.Threw("cannot find the user name!")) {
      return Fail("token-no-name", subject, "no such claim is a text", reply.said,
                  azure ? "Let the provider add the optional claim \"email\" (v2.0 tokens) or "
                          "\"unique_name\" (v1.0 tokens)."
                        : "Let the provider give \"sub\" as a text.");
    }
    if (reply.Threw("QOVAWinsUserNameFqdn2Netbios failed.")) {
      return Fail("token-name-refused", subject, "the directory service does not convert the name",
                  reply.said,
                  "Join the device to the user's domain, and see that its directory "
                  "service runs.");
    }
    Fail("token-name-form", subject, "the claim is not an account, \"@\" and a DNS domain",
         reply.said, "Let the provider put account@dns.domain into it.");
  }

  void CheckIssuer() {
    const std::string issuer = StringOf(claims, "iss");
    if (checkup.issuer.empty() || issuer == checkup.issuer) return;
    checkup.report.Add({"token-other-issuer",
                        Severity::kWarning,
                        "iss",
                        Shown(claims, "iss") + "; the discovery document's issuer is " +
                            Quote(Clip(checkup.issuer, 100)),
                        {Said::Does("does not check the issuer")},
                        "Look whether token endpoint and discovery document belong together."});
  }

  // --- all of it at once

  void AddVerdict() {
    if (azure && checkup.options.offline) return;
    const Reply reply = checkup.library.Verify(token);
    if (reply.ended && reply.Thrown().empty() && !user.empty()) {
      return checkup.report.Ok("token-accepted", "token",
                               "is accepted; the user is " + Quote(Clip(user, 100)));
    }
    const bool name = reply.ended && reply.Thrown().empty();
    Fail("token-refused", "token", name ? "is in order, and names no user" : "is refused",
         name ? checkup.library.UserName(token).said : reply.said, "See the checks above.");
  }

  Checkup& checkup;
  const std::string token;
  const bool azure;
  Json::Value header;
  Json::Value claims;
  std::string user;
  bool supported = false;
};

}  // namespace

void CheckToken(Checkup& checkup) {
  if (!checkup.options.token) return;
  checkup.report.Begin("Token");
  const std::string token = ReadToken();
  checkup.report.Hide(token);
  if (!checkup.settings_read) {
    checkup.report.Add({"token-not-checked",
                        Severity::kUnchecked,
                        "token",
                        "there are no settings to check it by",
                        {},
                        "Mend the files first."});
    return;
  }
  TokenCheck(checkup, token).Run();
}

}  // namespace doctor
