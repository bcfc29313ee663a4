// The values of the chosen provider's settings: URLs, identifiers, client secret.
#include "doctor/checkup.h"
#include "doctor/claims.h"
#include "doctor/redact.h"
#include "doctor/text.h"
#include "doctor/url.h"

namespace doctor {

namespace {

// RFC 7518, section 3.2: a key at least as long as the digest of HS256.
constexpr size_t kShortestKey = 32;

struct Endpoint {
  const char* key;  // without the provider's prefix
  const std::string& url;
  enum { kToken, kWellknown, kAuthorization, kLogout, kRedirect } role;
};

class EndpointCheck {
 public:
  EndpointCheck(Checkup& checked, const Endpoint& one)
      : checkup(checked), endpoint(one), url(one.url), name(Quote(checked.Key(one.key))) {}

  void Run() {
    Hide(url.password());
    if (endpoint.url.empty() || checkup.bad_keys.count(checkup.Key(endpoint.key)) > 0) {
      return;  // a finding about the file
    }
    if (HasSpaceAround(endpoint.url)) {
      return Fail("url-space", "has a blank at its beginning or end", "Remove the blank.");
    }
    if (!url.valid()) {
      return Fail("url-malformed", "is not a URL", "Write a whole URL, https://...");
    }
    if (endpoint.url.find("://") == std::string::npos) {
      return Add("url-no-scheme", Grave(), "has no scheme", "Put https:// before it.",
                 {Said::Does("treats it as plain http://, or passes it on unchanged")});
    }
    if (url.scheme() != "https" && url.scheme() != "http") {
      return Fail("url-scheme", "has the scheme " + Quote(Shown(url.scheme(), 40)),
                  "Use https://.");
    }
    CheckParts();
  }

 private:
  // The WebSphere client does not use the discovery document, and a sign-in no logout.
  Grade Grave() const {
    const bool unused = endpoint.role == Endpoint::kLogout ||
                        (endpoint.role == Endpoint::kWellknown && !checkup.azure());
    return unused ? Grade::kWarning : Grade::kFailure;
  }

  void Add(const char* id, Grade grade, const std::string& cause, const std::string& action,
           const std::vector<Said>& said) {
    Place place = checkup.At(endpoint.key);
    place.url = Shown(endpoint.url, 200);
    checkup.report.Add({id, grade, name + " " + cause, place, action, said});
  }

  void Fail(const char* id, const std::string& cause, const std::string& action) {
    checkup.bad_urls.insert(endpoint.url);
    Add(id, Grave(), cause, action, WithBadUrl());
  }

  // What the library does with a URL that it cannot use.
  std::vector<Said> WithBadUrl() const {
    if (checkup.options.offline) return {};
    switch (endpoint.role) {
      case Endpoint::kToken:
        return checkup.library.TokenRequest("").said;
      case Endpoint::kWellknown:
        if (!checkup.azure()) return {Said::Does("does not use it")};
        return checkup.library.Verify(MakeToken(GoodHeader(checkup), GoodClaims(checkup))).said;
      case Endpoint::kAuthorization:
      case Endpoint::kLogout:
        return {Said::Does("sends the browser there")};
      case Endpoint::kRedirect:
        break;
    }
    return {Said::Does("sends it unchanged to the provider, which refuses it")};
  }

  void CheckParts() {
    if (!url.password().empty()) {
      Add("url-password", Grade::kWarning, "holds a password",
          "Remove user name and password from it.", {Said::Does("uses the URL unchanged")});
    }
    if (url.scheme() == "http") {
      Add("url-not-https", Grade::kWarning,
          "is not encrypted: code, secret and token can be read on the way", "Use https://.",
          {Said::Does("uses it anyway")});
    }
    if (endpoint.role == Endpoint::kAuthorization && url.has_query()) {
      Add("authorization-query", Grade::kFailure,
          "holds a query, so the provider gets no client ID",
          "Use an authorization endpoint without \"?\".",
          {Said::Does("puts a second \"?\" behind it")});
    }
    if (endpoint.role == Endpoint::kLogout && url.has_query()) {
      Add("logout-query", Grade::kWarning,
          "holds a query, so the browser does not return after logout",
          "Use an end-session endpoint without \"?\".",
          {Said::Does("puts a second \"?\" behind it")});
    }
    if (endpoint.role == Endpoint::kRedirect && url.has_fragment()) {
      Add("redirect-fragment", Grade::kFailure, "holds a fragment (\"#\"), which providers refuse",
          "Remove \"#\" and what follows (RFC 6749, section 3.1.2).", WithBadUrl());
    }
  }

  Checkup& checkup;
  const Endpoint& endpoint;
  const ParsedUrl url;
  const std::string name;
};

void Warn(Checkup& checkup, const char* id, const std::string& key, const std::string& cause,
          const std::string& action, const std::vector<Said>& said, Grade grade = Grade::kWarning) {
  if (checkup.bad_keys.count(checkup.Key(key)) > 0) return;  // a finding about the file
  checkup.report.Add(
      {id, grade, Quote(checkup.Key(key)) + " " + cause, checkup.At(key), action, said});
}

// The check of a token whose claim is that of another.
std::vector<Said> WithOther(const Checkup& checkup, const char* claim) {
  Json::Value claims = GoodClaims(checkup);
  claims[claim] = "another";
  return checkup.library.VerifyOffline(MakeToken(GoodHeader(checkup), claims)).said;
}

void CheckAzureValues(Checkup& checkup) {
  const std::string& tenant = checkup.tenant;
  const std::string& client = checkup.settings.client_id;
  // Entra ID writes IDs in lower case into its tokens; of other providers that is not known.
  const Grade grade = checkup.entra() ? Grade::kFailure : Grade::kWarning;
  const std::string lower = "Write it in lower case, as tokens do: it is compared byte by byte.";
  if (!tenant.empty() && !IsGuid(tenant)) {
    Warn(checkup, "tenant-no-guid", "tenant_id",
         "is " + Quote(Shown(tenant, 80)) + ", not a tenant ID as Azure writes it into tokens",
         "Set it to the directory (tenant) ID, not to a domain name.", WithOther(checkup, "tid"),
         grade);
  } else if (HasUpperCase(tenant)) {
    Warn(checkup, "id-upper-case", "tenant_id", "has upper-case letters: " + tenant, lower,
         WithOther(checkup, "tid"), grade);
  }
  if (IsGuid(client) && HasUpperCase(client)) {
    Warn(checkup, "id-upper-case", "client_id", "has upper-case letters: " + Shown(client, 40),
         lower, WithOther(checkup, "aud"), grade);
  }
  if (IsGuid(checkup.settings.client_secret) && !IsGuid(client) && checkup.entra()) {
    checkup.bad_urls.insert(
        {checkup.settings.authorization_endpoint, checkup.settings.token_endpoint});
    return checkup.report.Fail("secret-is-id", "Client ID and client secret are swapped",
                               checkup.At("client_id"),
                               "Exchange the values of azure_client_id and azure_client_secret.",
                               {Said::Does("sends both unchanged; the provider refuses them")});
  }
  if (IsGuid(checkup.settings.client_secret)) {
    Warn(checkup, "secret-is-id", "client_secret", "looks like an ID, not like a secret",
         "Set it to the secret's value, which is shown once, when the secret is made.",
         {Said::Does("sends it unchanged; the provider refuses it")});
  }
}

void CheckWebSphereSecret(Checkup& checkup) {
  const std::string& secret = checkup.settings.client_secret;
  const Reply reply =
      checkup.library.Verify(MakeSignedToken(GoodHeader(checkup), GoodClaims(checkup), secret));
  const std::string length = "is " + std::to_string(secret.size()) + " bytes long";
  if (!reply.Thrown().empty()) {
    checkup.report.Fail(
        "secret-too-long", "\"websphere_client_secret\" " + length + "; at most 765 can be used",
        checkup.At("client_secret"), "Set a client secret of 32 to 765 bytes.", reply.said);
  } else if (secret.size() < kShortestKey) {
    Warn(checkup, "secret-short", "client_secret",
         length + ": anyone who guesses it can sign tokens (RFC 7518, section 3.2)",
         "Set a random client secret of 32 bytes or more (HS384: 48, HS512: 64).",
         {Said::Does("accepts any length")});
  } else {
    checkup.report.Good("secret", "A token that is signed with the client secret passes the checks",
                        checkup.At("client_secret"));
  }
}

}  // namespace

void CheckSettings(Checkup& checkup) {
  if (!checkup.settings_read) return;
  const Settings& settings = checkup.settings;
  for (const Endpoint& endpoint :
       {Endpoint{"authorization_endpoint", settings.authorization_endpoint,
                 Endpoint::kAuthorization},
        Endpoint{"token_endpoint", settings.token_endpoint, Endpoint::kToken},
        Endpoint{"wellknown", settings.wellknown, Endpoint::kWellknown},
        Endpoint{"redirect_uri", settings.redirect_uri, Endpoint::kRedirect},
        Endpoint{"logout_endpoint", settings.logout_endpoint, Endpoint::kLogout}}) {
    EndpointCheck(checkup, endpoint).Run();
  }
  if (HasSpaceAround(settings.client_secret)) {
    checkup.report.Fail(
        "secret-space",
        Quote(checkup.Key("client_secret")) + " has a blank or line break at an end",
        checkup.At("client_secret"), "Remove it, unless the provider's secret has it.",
        {Said::Does("sends it unchanged")});
  }
  if (checkup.azure()) CheckAzureValues(checkup);
  if (!checkup.azure() && !settings.client_secret.empty()) CheckWebSphereSecret(checkup);
}

}  // namespace doctor
