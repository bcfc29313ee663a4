// A token from standard input: what each check of the library says, in the library's order.
//
// Each check is put to the library with a token that is right up to that check, so that both
// faults of a token are reported.
#include <iomanip>
#include <iostream>

#include "doctor/checkup.h"
#include "doctor/claims.h"
#include "doctor/json.h"
#include "doctor/keyset.h"
#include "doctor/redact.h"
#include "doctor/text.h"

namespace doctor {

namespace {

constexpr int kLongestToken = 1 << 20;
constexpr char kNotSupported[] = " algorithm is not supported";

std::string ReadToken() {
  std::string token;
  std::cin >> std::setw(kLongestToken) >> token;
  return token;
}

class TokenCheck {
 public:
  TokenCheck(Checkup& checked, const std::string& text)
      : checkup(checked), token(text), azure(checked.azure()) {}

  void Run() {
    if (token.empty()) {
      return Fail("token-empty", "", "There is no token", "Pass a token on standard input.",
                  checkup.library.VerifyOffline("").said);
    }
    if (!CheckFormat()) return;
    CheckExpiry();
    if (azure) {
      CheckClaim("token-tenant", "tid", "tenant ID invalid", checkup.tenant,
                 "Set azure_tenant_id to the token's \"tid\" if that is your tenant.");
    }
    CheckClaim("token-audience", "aud", "client ID invalid", checkup.settings.client_id,
               "Set the client ID to the token's \"aud\" if the token is for this device.");
    if (azure) {
      CheckKey();
    } else {
      CheckAlgorithm("");
    }
    CheckSignature();
    CheckName();
    AddVerdict();
  }

 private:
  void Fail(const char* id, const char* claim, const std::string& cause, const std::string& action,
            const std::vector<Said>& said, const std::string& because = "") {
    checkup.report.Add(
        {id, Grade::kFailure, cause, {kStandardInput, claim}, action, said, because});
  }

  void Good(const char* id, const char* claim, const std::string& cause) {
    checkup.report.Good(id, cause, {kStandardInput, claim});
  }

  // --- the three segments

  bool CheckFormat() {
    const std::string whole = "Pass the whole ID token in its compact form.";
    const Reply split = checkup.library.Split(token);
    if (!split.Thrown().empty()) {
      Fail("token-format", "", "The token is not three segments with two dots between", whole,
           split.said);
      return false;
    }
    const Reply head = checkup.library.Header(token);
    if (!head.Thrown().empty()) {
      Fail("token-header", "", "The header of the token (first segment) is not JSON in base64url",
           "Pass the token unchanged; if it is, the provider made it wrongly.", head.said);
      return false;
    }
    const Reply claim_set = checkup.library.Body(token);
    if (!claim_set.Thrown().empty()) {
      Fail("token-body", "", "The claims of the token (second segment) are not JSON in base64url",
           "Pass the token unchanged; an encrypted token (five segments) cannot be used.",
           claim_set.said);
      return false;
    }
    header = head.result;
    claims = claim_set.result;
    Good("token-format", "", "The token has three segments; header and claims are JSON");
    return true;
  }

  // --- claims

  // The library's answer to a token that is right but for this claim.
  Reply AskAboutClaim(const char* name) const {
    Json::Value good = GoodClaims(checkup);
    good.removeMember(name);
    if (claims.isObject() && claims.isMember(name)) good[name] = claims[name];
    return checkup.library.VerifyOffline(MakeToken(GoodHeader(checkup), good));
  }

  // True if the check passed. A list instead of a string ends any check.
  static bool Passed(const Reply& reply, const std::string& refusal) {
    return reply.ended && !reply.Threw(refusal) && reply.ThrownClass() != "Json::LogicError";
  }

  void CheckExpiry() {
    const Reply reply = AskAboutClaim("exp");
    long long expiry = 0;
    const bool known = ParseExpiry(expiry);
    const long long left = expiry - static_cast<long long>(time(nullptr));
    std::string seen = Seen(claims, "exp");
    if (known) {
      seen += ", " + Time(static_cast<time_t>(expiry)) + ", " +
              (left < 0 ? Span(left) + " ago" : "in " + Span(left));
    }
    if (Passed(reply, "id_token expired.")) return Good("token-expiry", "exp", seen);
    if (!known) {
      return Fail("token-expired", "exp", seen,
                  "Let the provider give \"exp\" as a number of seconds.", reply.said);
    }
    const Checkup::ServerTime* const server =
        checkup.server_times.empty() ? nullptr : &checkup.server_times[0];
    if (server == nullptr || expiry < server->theirs) {
      return Fail("token-expired", "exp", "The token has expired: " + seen,
                  "Pass a fresh token. If it is fresh, set this device's clock (" +
                      Time(time(nullptr)) + ").",
                  reply.said);
    }
    const long long ahead = static_cast<long long>(server->ours) - server->theirs;
    Fail("token-expired", "exp",
         "The token has expired for this device only, whose clock is " + Span(ahead) +
             " ahead of that of " + server->server + ": " + seen,
         "Set this device's clock, best with a time service (NTP): date -u; timedatectl",
         reply.said, "clock-ahead");
  }

  bool ParseExpiry(long long& expiry) const {
    const std::string text = TextOf(claims, "exp");
    char* end = nullptr;
    expiry = std::strtoll(text.c_str(), &end, 10);
    return end != text.c_str() && expiry > 0 && expiry < 253402300800;  // the year 10000
  }

  // A claim that must equal a setting.
  void CheckClaim(const char* id, const char* name, const char* refusal,
                  const std::string& configured, const std::string& action) {
    const Reply reply = AskAboutClaim(name);
    const std::string seen = Seen(claims, name);
    if (Passed(reply, refusal)) return Good(id, name, seen);
    const bool list = reply.ThrownClass() == "Json::LogicError";
    Fail(id, name, seen + "; configured is " + Quote(Shown(configured, 100)),
         list ? "Let the provider give " + Quote(name) + " as one string, not as a list." : action,
         reply.said);
  }

  // --- key and algorithm

  Reply AskAboutHeader(const Json::Value& changed) const {
    return checkup.library.Verify(MakeToken(changed, GoodClaims(checkup)));
  }

  void CheckKey() {
    if (checkup.options.offline) {
      return Good("token-key", "kid", "The token's key was not checked (--offline)");
    }
    const Reply reply = AskAboutHeader(header);
    const std::string seen = Seen(header, "kid");
    if (reply.Threw("kid does not exist in Azure verified kyes")) {
      Fail("token-key-unknown", "kid", seen + ", which is not in the provider's key set",
           "Check that the token is from this provider, and the key set above.", reply.said,
           checkup.key_set.isNull() ? checkup.network_obstacle : "");
    } else if (reply.Threw("RSA public 'n' cannot be found!") ||
               reply.Threw("RSA public 'e' cannot be found!")) {
      Fail("token-key-incomplete", "kid", seen + ", a key without RSA numbers",
           "Let the provider sign with an RSA key.", reply.said);
    } else if (reply.ThrownClass() == "Json::LogicError") {
      Fail("token-no-text", "kid", seen, "Let the provider give \"alg\" and \"kid\" as strings.",
           reply.said);
    } else if (!reply.ended) {
      Fail("token-key-silent", "kid", "The provider did not send the key set in time",
           "See the findings about the key set.", {Said::Does("sets no time-out and waits")},
           checkup.network_obstacle);
    } else {
      Good("token-key", "kid", seen);
    }
    CheckAlgorithm(StringOf(AnyUsableKey(checkup.key_set), "kid"));
  }

  void CheckAlgorithm(const std::string& kid) {
    const std::string seen = Seen(header, "alg");
    if (azure && kid.empty()) {
      return Good("token-algorithm", "alg", seen + "; the library does not get that far");
    }
    Json::Value changed(Json::objectValue);
    changed["kid"] = kid;
    if (header.isObject() && header.isMember("alg")) changed["alg"] = header["alg"];
    const Reply reply = AskAboutHeader(changed);
    if (!EndsWith(reply.Thrown(), kNotSupported) && Passed(reply, "")) {
      supported = true;
      return Good("token-algorithm", "alg", seen);
    }
    Fail("token-algorithm", "alg", seen + ", which the library does not support",
         azure ? "Let the provider sign with RS256, RS384 or RS512."
               : "Let the provider sign with HS256, HS384 or HS512.",
         reply.said);
  }

  // --- signature

  void CheckSignature() {
    const Json::Value key =
        azure ? KeyNamed(checkup.key_set, TextOf(header, "kid")) : Json::Value();
    if (!supported || (azure && !IsUsableKey(key))) {
      return Good("token-signature", "", "The library does not get as far as the signature");
    }
    const std::string algorithm = TextOf(header, "alg");
    const Reply reply =
        azure ? checkup.library.VerifyRSA(token, StringOf(key, "n"), StringOf(key, "e"), algorithm)
              : checkup.library.VerifyHMAC(token, checkup.settings.client_secret, algorithm);
    if (reply.ended && reply.Thrown().empty()) {
      return Good("token-signature", "", "The signature is right");
    }
    Fail("token-signature", "", "The signature does not belong to this token",
         azure ? "Pass the token unchanged. If it is, the provider did not sign it with the key "
                 "that it names."
               : "Set websphere_client_secret to the secret that the provider signs with; the "
                 "signature must be base64url without padding.",
         reply.said);
  }

  void CheckName() {
    const Reply reply = checkup.library.UserName(token);
    const char* const claim = azure ? "unique_name, email" : "sub";
    const std::string named = StringOf(claims, "unique_name");
    if (azure && AddIfGuest(checkup, named.empty() ? StringOf(claims, "email") : named,
                            {kStandardInput, claim}, reply.said)) {
      return;
    }
    if (reply.result.isString()) {
      user = reply.result.asString();
      return Good("token-name", claim, "The user is " + Quote(Shown(user, 100)));
    }
    if (reply.Threw("cannot find the user name!")) {
      return Fail("token-no-name", claim, "The token has no user name",
                  azure
                      ? "Add the optional claim \"email\" for ID tokens under App registrations > "
                        "the application > Token configuration."
                      : "Let the provider give \"sub\" as a string.",
                  reply.said);
    }
    if (reply.Threw("QOVAWinsUserNameFqdn2Netbios failed.")) {
      return Fail(
          "token-name-refused", claim, "The directory service does not convert the name",
          "Join the device to the user's domain, and start its directory service: wbinfo -t",
          reply.said);
    }
    Fail("token-name-form", claim, "The user name is not an account, \"@\" and a DNS domain",
         "Let the provider put account@dns.domain into the claim.", reply.said);
  }

  // --- all checks at once

  void AddVerdict() {
    if (azure && checkup.options.offline) return;
    const Reply reply = checkup.library.Verify(token);
    const bool accepted = reply.ended && reply.Thrown().empty();
    if (accepted && !user.empty()) {
      return Good("token-accepted", "",
                  "The token is accepted; the user is " + Quote(Shown(user, 100)));
    }
    Fail("token-refused", "", accepted ? "The token names no user" : "The token is refused",
         "See the checks above.", accepted ? checkup.library.UserName(token).said : reply.said,
         checkup.report.Obstacle());
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
  const std::string token = ReadToken();
  Hide(token);
  if (checkup.settings_read) TokenCheck(checkup, token).Run();
}

}  // namespace doctor
