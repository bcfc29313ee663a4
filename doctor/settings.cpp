// The values of the chosen provider's settings: URLs, identifiers, client secret.
#include <curl/curl.h>

#include "doctor/checkup.h"
#include "doctor/claims.h"
#include "doctor/text.h"
#include "doctor/url.h"

namespace doctor {

namespace {

// RFC 7518, section 3.2: a key at least as long as the digest of HS256.
constexpr size_t kShortestKey = 32;

struct Endpoint {
  const char* key;  // behind the provider's prefix
  const std::string& url;
  enum { kToken, kWellknown, kAuthorization, kLogout, kRedirect } role;
};

// What the library makes of a URL that it cannot use. It may yet try.
std::vector<Said> WithBadUrl(const Checkup& checkup, const Endpoint& endpoint) {
  if (checkup.options.offline) return {};
  switch (endpoint.role) {
    case Endpoint::kToken:
      return checkup.library.TokenRequest("").said;
    case Endpoint::kWellknown:
      if (checkup.provider != Provider::kAzure) return {Said::Does("does not use it")};
      return checkup.library.Verify(MakeToken(GoodHeader(checkup), GoodClaims(checkup))).said;
    case Endpoint::kAuthorization:
    case Endpoint::kLogout:
      return {Said::Does("sends the browser there as it stands")};
    case Endpoint::kRedirect:
      break;
  }
  return {Said::Does("sends it to the provider as it stands, which refuses it")};
}

class EndpointCheck {
 public:
  EndpointCheck(Checkup& checked, const Endpoint& one)
      : checkup(checked),
        endpoint(one),
        url(one.url),
        name((checked.provider == Provider::kAzure ? "azure_" : "websphere_") +
             std::string(one.key)) {}

  void Run() {
    if (endpoint.url.empty()) return;  // a finding about the file
    if (HasSpaceAround(endpoint.url)) {
      return Fail("url-space", "has a blank at its beginning or end", "Remove the blank.");
    }
    if (!url.valid()) return Fail("url-malformed", "is no URL", "Write a whole URL, https://...");
    if (endpoint.url.find("://") == std::string::npos) {
      return Add("url-no-scheme", Grave(), "has no scheme",
                 {Said::Does("takes it for plain http://, or hands it on as it stands")},
                 "Put https:// before it.");
    }
    if (url.scheme() != "https" && url.scheme() != "http") {
      return Fail("url-scheme", "has the scheme " + Quote(url.scheme()), "Use https://.");
    }
    CheckParts();
  }

 private:
  // The WebSphere client has no use for the discovery document, and nobody signs in by logging
  // out.
  Severity Grave() const {
    const bool unused =
        endpoint.role == Endpoint::kLogout ||
        (endpoint.role == Endpoint::kWellknown && checkup.provider == Provider::kWebSphere);
    return unused ? Severity::kWarning : Severity::kFailure;
  }

  void Add(const char* id, Severity severity, const std::string& seen,
           const std::vector<Said>& said, const std::string& remedy) {
    checkup.report.Add({id, severity, name, Clip(endpoint.url, 200) + " " + seen, said, remedy});
  }

  void Fail(const char* id, const std::string& seen, const std::string& remedy) {
    checkup.bad_urls.insert(endpoint.url);
    Add(id, Grave(), seen, WithBadUrl(checkup, endpoint), remedy);
  }

  void CheckParts() {
    if (!url.password().empty()) {
      checkup.report.Hide(url.password());
      Add("url-password", Severity::kWarning, "holds a password",
          {Said::Does("uses the URL as it stands")}, "Take user name and password out of it.");
    }
    if (url.scheme() == "http") {
      Add("url-not-https", Severity::kWarning, "is not encrypted",
          {Said::Does("uses it all the same: code, secret and token can be read on the way")},
          "Use https://.");
    }
    if (endpoint.role == Endpoint::kAuthorization && url.has_query()) {
      Add("authorization-query", Severity::kFailure, "holds a query",
          {Said::Does("puts a second \"?\" behind it, so that the provider misses the client ID")},
          "Use an authorization endpoint without \"?\".");
    }
    if (endpoint.role == Endpoint::kLogout && url.has_query()) {
      Add("logout-query", Severity::kWarning, "holds a query",
          {Said::Does("puts a second \"?\" behind it, so that nobody comes back after logout")},
          "Use an end-session endpoint without \"?\".");
    }
    if (endpoint.role == Endpoint::kRedirect && url.has_fragment()) {
      Add("redirect-fragment", Severity::kFailure, "holds a fragment",
          WithBadUrl(checkup, endpoint),
          "Remove \"#\" and what follows (RFC 6749, section 3.1.2).");
    }
  }

  Checkup& checkup;
  const Endpoint& endpoint;
  const ParsedUrl url;
  const std::string name;
};

void Warn(Checkup& checkup, const char* id, const std::string& key, const std::string& seen,
          const std::vector<Said>& said, const std::string& remedy) {
  checkup.report.Add({id, Severity::kWarning, key, seen, said, remedy});
}

void CheckAzureValues(Checkup& checkup) {
  const std::string& tenant = checkup.tenant;
  Json::Value claims = GoodClaims(checkup);
  claims["tid"] = "another";
  if (!tenant.empty() && !IsGuid(tenant)) {
    Warn(checkup, "tenant-no-guid", "azure_tenant_id",
         Quote(tenant) + " is not a tenant ID as Azure writes it into tokens",
         checkup.library.VerifyOffline(MakeToken(GoodHeader(checkup), claims)).said,
         "Set it to the directory (tenant) ID, not to a domain name.");
  } else if (HasUpperCase(tenant)) {
    Warn(checkup, "id-upper-case", "azure_tenant_id", Quote(tenant) + " holds capital letters",
         checkup.library.VerifyOffline(MakeToken(GoodHeader(checkup), claims)).said,
         "Write it in small letters, as tokens do: it is compared byte by byte.");
  }
  if (IsGuid(checkup.settings.client_id) && HasUpperCase(checkup.settings.client_id)) {
    claims = GoodClaims(checkup);
    claims["aud"] = "another";
    Warn(checkup, "id-upper-case", "azure_client_id",
         Quote(checkup.settings.client_id) + " holds capital letters",
         checkup.library.VerifyOffline(MakeToken(GoodHeader(checkup), claims)).said,
         "Write it in small letters, as tokens do: it is compared byte by byte.");
  }
  if (IsGuid(checkup.settings.client_secret)) {
    Warn(checkup, "secret-is-id", "azure_client_secret", "looks like the ID of a secret",
         {Said::Does("sends it as it is; the provider refuses it")},
         "Set it to the secret's value, which is shown once, when the secret is made.");
  }
}

void CheckWebSphereSecret(Checkup& checkup) {
  const std::string& secret = checkup.settings.client_secret;
  const Reply reply =
      checkup.library.Verify(MakeSignedToken(GoodHeader(checkup), GoodClaims(checkup), secret));
  const std::string length = std::to_string(secret.size()) + " bytes long";
  if (!reply.Thrown().empty()) {
    checkup.report.Add({"secret-too-long", Severity::kFailure, "websphere_client_secret",
                        "is " + length + "; 765 fit", reply.said,
                        "Take a shorter client secret, 32 to 765 bytes."});
  } else if (secret.size() < kShortestKey) {
    Warn(checkup, "secret-short", "websphere_client_secret",
         "is " + length + ", too short a key for HS256 (RFC 7518, section 3.2)",
         {Said::Does("takes any length: who guesses the secret can sign tokens")},
         "Take a random client secret of 32 bytes or more (HS384: 48, HS512: 64).");
  } else {
    checkup.report.Ok("secret", "websphere_client_secret",
                      "a token signed under it passes the library's checks");
  }
}

}  // namespace

void CheckSettings(Checkup& checkup) {
  if (!checkup.settings_read) return;
  checkup.report.Begin("Settings");
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
    Warn(checkup, "secret-space", "client secret", "has a blank or line end around it",
         {Said::Does("sends it with them")}, "Remove them, unless the provider's has them.");
  }
  if (checkup.provider == Provider::kAzure) CheckAzureValues(checkup);
  if (checkup.provider == Provider::kWebSphere && !settings.client_secret.empty()) {
    CheckWebSphereSecret(checkup);
  }
}

}  // namespace doctor
