// Faults that show at a provider as Entra ID and WebSphere Liberty are, each confirmed by a real
// sign-in; and sound devices, where the doctor has nothing to say.
#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <ostream>

#include "twin_site.h"

namespace {

using test::Outcome;
using test::Twin;
using test::TwinSite;

enum class Works { kYes, kNo, kNotTried };  // a sign-in

struct TwinFault {
  const char* name;
  Twin twin;
  std::function<void(TwinSite&)> seed;
  const char* id;
  const char* grade;
  const char* cause;   // a part of it
  const char* action;  // a part of it
  Works works;
};

std::ostream& operator<<(std::ostream& out, const TwinFault& fault) {
  return out << fault.name;
}

using Seed = std::function<void(TwinSite&)>;

// Settings of the twin.
Seed twin(const char* name, const Json::Value& value) {
  return [=](TwinSite& site) { site.twin[name] = value; };
}

// The same, and the secret is tried.
Seed tried(const char* name, const Json::Value& value) {
  return [=](TwinSite& site) {
    site.twin[name] = value;
    site.arguments = {"--try-secret"};
  };
}

// An endpoint of the twin that answers with a code.
Seed fails(const char* endpoint, const Json::Value& code) {
  return [=](TwinSite& site) { site.twin["fail"][endpoint] = code; };
}

// Settings of the device.
Seed set(const char* key, const std::string& value) {
  return [=](TwinSite& site) { site.settings[key] = value; };
}

Seed part(const char* key, const std::string& from, const std::string& to) {
  return [=](TwinSite& site) { site.replace(key, from, to); };
}

Seed all(const std::vector<Seed>& seeds) {
  return [=](TwinSite& site) {
    for (const Seed& seed : seeds) seed(site);
  };
}

Seed trySecret() {
  return [](TwinSite& site) { site.arguments = {"--try-secret"}; };
}

// Both endpoints of a sign-in.
Seed tenant(const std::string& name) {
  return all({part("azure_authorization_endpoint", test::kTwinTenant, name),
              part("azure_token_endpoint", test::kTwinTenant, name)});
}

constexpr char kAuth[] = "azure_authorization_endpoint";
constexpr char kToken[] = "azure_token_endpoint";
constexpr char kWellknown[] = "azure_wellknown";
constexpr char kOther[] = "11111111-2222-4333-8444-555555555555";

const std::vector<TwinFault> kEntraFaults = {
    // The authorization endpoint
    {"RedirectNotRegistered", Twin::kEntra2, twin("redirect_uris", Json::Value(Json::arrayValue)),
     "authorization-refused", "failure", "AADSTS50011", "azure_redirect_uri", Works::kNo},
    {"RedirectWithSlash", Twin::kEntra1, part("azure_redirect_uri", "login.cgi", "login.cgi/"),
     "authorization-refused", "failure", "redirect URI", "character for character", Works::kNo},
    {"ClientUnknown", Twin::kEntra2, set("azure_client_id", kOther), "authorization-refused",
     "failure", "AADSTS700016", "azure_client_id", Works::kNo},
    {"TenantUnknown", Twin::kEntra2, tenant(kOther), "authorization-refused", "failure",
     "AADSTS90002", "tenant", Works::kNo},
    {"TenantMisspelt", Twin::kEntra1, tenant("adexamplenet"), "authorization-refused", "failure",
     "AADSTS900023", "placeholder", Works::kNo},
    {"TenantUnknownForTokens", Twin::kEntra2,
     part(kToken, test::kTwinTenant, "unknown.example.net"), "token-endpoint-refuses", "failure",
     "AADSTS90002", "tenant", Works::kNo},
    {"TenantsDiffer", Twin::kEntra2, part(kToken, test::kTwinTenant, kOther), "tenants-differ",
     "failure", "two tenants", "azure_token_endpoint", Works::kNo},
    {"TenantIdOfAnother", Twin::kEntra2, set("azure_tenant_id", kOther), "discovery-other-tenant",
     "failure", test::kTwinTenant, "azure_tenant_id", Works::kNo},
    {"TenantIdIsADomain", Twin::kEntra1, set("azure_tenant_id", "ad.example.net"), "tenant-no-guid",
     "failure", "ad.example.net", "tenant) ID", Works::kNo},
    {"TenantIdInUpperCase", Twin::kEntra2,
     set("azure_tenant_id", "3F2A8F6E-5B1C-4D7E-9A60-2C4E8D10B7F5"), "id-upper-case", "failure",
     "upper-case", "lower case", Works::kNo},
    {"CommonForOneTenant", Twin::kEntra2, tenant("common"), "authorization-refused", "failure",
     "AADSTS50194", "\"common\"", Works::kNo},
    {"CommonForManyTenants", Twin::kEntra2, all({tenant("common"), twin("multi_tenant", true)}),
     "tenant-shared", "warning", "\"common\"", "If sign-ins fail", Works::kYes},
    {"Organizations", Twin::kEntra1, all({tenant("organizations"), twin("multi_tenant", true)}),
     "tenant-shared", "warning", "\"organizations\"", "If sign-ins fail", Works::kYes},
    {"Consumers", Twin::kEntra2, tenant("consumers"), "tenant-shared", "failure", "personal",
     "\"consumers\"", Works::kNo},
    {"WellknownOfAnotherTenant", Twin::kEntra2,
     [](TwinSite& site) {
       site.twin["other_tenants"].append(kOther);
       site.replace(kWellknown, test::kTwinTenant, kOther);
     },
     "discovery-other-tenant", "warning", kOther, "azure_wellknown", Works::kYes},
    {"WellknownOfNoTenant", Twin::kEntra2, part(kWellknown, test::kTwinTenant, kOther),
     "discovery-refused", "failure", "AADSTS90002", "tenant", Works::kNo},
    {"VersionsMixed", Twin::kEntra2, part(kToken, "/v2.0", ""), "versions-mixed", "warning", "v1.0",
     "If sign-ins fail", Works::kYes},
    {"VersionsMixedRefused", Twin::kEntra2,
     all({part(kToken, "/v2.0", ""), twin("mixed_versions", 70000)}), "versions-mixed", "warning",
     "v1.0", "one version", Works::kNo},
    {"Swapped", Twin::kEntra2,
     all({part(kAuth, "authorize", "token"), part(kToken, "token", "authorize")}),
     "endpoints-swapped", "failure", "swapped", "Exchange the values", Works::kNo},
    {"TokenTwice", Twin::kEntra1, part(kAuth, "authorize", "token"), "endpoint-other", "failure",
     "token endpoint", "/oauth2/authorize", Works::kNo},
    {"AuthorizeTwice", Twin::kEntra2, part(kToken, "token", "authorize"), "endpoint-other",
     "failure", "authorization endpoint", "/oauth2/v2.0/token", Works::kNo},
    {"LogoutInstead", Twin::kEntra2, part(kAuth, "authorize", "logout"), "endpoint-other",
     "failure", "end-session", "/oauth2/v2.0/authorize", Works::kNo},
    {"KeysInsteadOfDocument", Twin::kEntra2,
     part(kWellknown, "/v2.0/.well-known/openid-configuration", "/discovery/v2.0/keys"),
     "endpoint-other", "failure", "discovery document", "azure_wellknown", Works::kNo},
    {"AuthorizePathWrong", Twin::kEntra2, part(kAuth, "authorize", "authorise"),
     "authorization-wrong", "failure", "no authorization endpoint", "/oauth2/v2.0/authorize",
     Works::kNo},
    {"TokenPathWrong", Twin::kEntra2, part(kToken, "token", "tokens"), "token-endpoint-wrong",
     "failure", "no token endpoint", "/oauth2/v2.0/token", Works::kNo},
    {"NotAssigned", Twin::kEntra2, fails("authorize", 50105), "authorization-refused", "failure",
     "AADSTS50105", "Users and groups", Works::kNo},
    // Token endpoint and secret
    {"SecretWrong", Twin::kEntra2, tried("client_secret", "another"), "secret-refused", "failure",
     "AADSTS7000215", "value, not to its ID", Works::kNo},
    {"SecretWrongInV1", Twin::kEntra1, tried("client_secret", "another"), "secret-refused",
     "failure", "secret is wrong", "azure_client_secret", Works::kNo},
    {"SecretExpired", Twin::kEntra2, tried("secret_expired", true), "secret-refused", "failure",
     "AADSTS7000222", "Add a new secret", Works::kNo},
    {"SecretExpiredEarlyForm", Twin::kEntra1,
     all({tried("secret_expired", true), twin("era", 2018)}), "secret-refused", "failure",
     "AADSTS7000222", "Add a new secret", Works::kNo},
    {"PublicClient", Twin::kEntra2, tried("public_client", true), "client-refused", "failure",
     "public client", "\"Web\"", Works::kNo},
    {"SecretAtCommon", Twin::kEntra2,
     all({part(kToken, test::kTwinTenant, "common"), twin("multi_tenant", true),
          tried("client_secret", "another")}),
     "secret-refused", "failure", "AADSTS7000215", "azure_client_secret", Works::kNo},
    {"TokensBlocked", Twin::kEntra2, fails("token", 53003), "token-endpoint-refuses", "failure",
     "AADSTS53003", "policy", Works::kNo},
    {"NoSigningKey", Twin::kEntra2, fails("token", 50146), "token-endpoint-refuses", "failure",
     "AADSTS50146", "", Works::kNo},
    {"CodeAlwaysExpired", Twin::kEntra2, all({fails("token", 70008), trySecret()}),
     "secret-not-checked", "unchecked", "does not report", "browser", Works::kNo},
    {"IdAndSecretSwapped", Twin::kEntra2,
     all({set("azure_client_id", test::kTwinSecret),
          set("azure_client_secret", test::kTwinClient)}),
     "secret-is-id", "failure", "swapped", "Exchange the values", Works::kNo},
    {"KeySetRefused", Twin::kEntra2, fails("keys", 90002), "keys-missing", "failure", "\"keys\"",
     "jwks_uri", Works::kNo},
    {"AuthorizeWithSlash", Twin::kEntra2, part(kAuth, "authorize", "authorize/"),
     "authorization-wrong", "failure", "no authorization endpoint", "/oauth2/v2.0/authorize.",
     Works::kNo},
    {"KeysOfTheApplication", Twin::kEntra2, twin("app_key", "own"), "keys-of-application",
     "failure", "own signing keys", "?appid=", Works::kNo},
    // The redirect URI
    {"RedirectIsTheRelayPage", Twin::kEntra2,
     [](TwinSite& site) {
       site.loginProgram = test::ok("<script src=\"relay.js\" defer></script>");
     },
     "redirect-relay", "failure", "relay page", "login program", Works::kNo},
    {"RedirectLeadsNowhere", Twin::kEntra2,
     [](TwinSite& site) { site.loginProgram = test::failed(404, ""); }, "redirect-missing",
     "failure", "no login program", "azure_redirect_uri", Works::kNo},
    {"LoginProgramBroken", Twin::kEntra2,
     [](TwinSite& site) { site.loginProgram = test::failed(500, "<title>Error</title>"); },
     "redirect-error", "failure", "HTTP 500", "error log", Works::kNo},
    {"LoginProgramNotRun", Twin::kEntra2,
     [](TwinSite& site) { site.loginProgram = test::ok("#!/bin/sh\n"); }, "redirect-not-run",
     "failure", "does not run it", "CGI", Works::kNo},
    {"DeviceForbids", Twin::kEntra2,
     [](TwinSite& site) { site.loginProgram = test::failed(403, ""); }, "redirect-error", "warning",
     "refuses", "error log", Works::kNotTried},
    {"DeviceCertificateOfAnother", Twin::kEntra2,
     [](TwinSite& site) { site.deviceNames = {"other.example.org"}; }, "redirect-certificate",
     "warning", "not for \"device.example.net\"", "certificate", Works::kYes},
    {"DeviceDown", Twin::kEntra2, [](TwinSite& site) { site.deviceNames = {}; },
     "redirect-not-resolved", "warning", "cannot resolve", "nslookup device.example.net",
     Works::kNotTried},
    {"RedirectOfAnotherPort", Twin::kEntra2,
     [](TwinSite& site) {
       const std::string uri = "https://device.example.net:1/webman/login.cgi";
       site.settings["azure_redirect_uri"] = uri;
       site.twin["redirect_uris"][0] = uri;
     },
     "redirect-not-reached", "warning", "cannot reach", "browser", Works::kNotTried},
};

constexpr char kLibertyAuth[] = "websphere_authorization_endpoint";
constexpr char kLibertyToken[] = "websphere_token_endpoint";

const std::vector<TwinFault> kLibertyFaults = {
    {"ClientUnknown", Twin::kLiberty, set("websphere_client_id", "another"),
     "authorization-refused", "failure", "CWOAU0061E", "websphere_client_id", Works::kNo},
    {"RedirectNotRegistered", Twin::kLiberty, twin("redirect_uris", Json::Value(Json::arrayValue)),
     "authorization-refused", "failure", "CWOAU0062E", "websphere_redirect_uri", Works::kNo},
    {"ProviderUnknown", Twin::kLiberty,
     all({part(kLibertyAuth, "/OP/", "/Login/"), part(kLibertyToken, "/OP/", "/Login/")}),
     "authorization-wrong", "failure", "no authorization endpoint", "/oidc/endpoint/OP/authorize",
     Works::kNo},
    {"TokenPathWrong", Twin::kLiberty, part(kLibertyToken, "/token", "/tokens"),
     "token-endpoint-wrong", "failure", "no token endpoint", "/oidc/endpoint/OP/token", Works::kNo},
    {"Swapped", Twin::kLiberty,
     all({part(kLibertyAuth, "authorize", "token"), part(kLibertyToken, "token", "authorize")}),
     "endpoints-swapped", "failure", "swapped", "Exchange the values", Works::kNo},
    {"IntrospectionInstead", Twin::kLiberty, part(kLibertyToken, "token", "introspect"),
     "endpoint-other", "failure", "token endpoint", "/oidc/endpoint/OP/token", Works::kNo},
    {"SecretWrong", Twin::kLiberty, tried("client_secret", std::string(40, 'y')), "secret-refused",
     "failure", "CWWKS1406E", "websphere_client_secret", Works::kNo},
    {"SecretInTheHeaderOnly", Twin::kLiberty, tried("auth_method", "basic"), "secret-refused",
     "failure", "CWWKS1406E", "websphere_client_secret", Works::kNo},
    {"ServerFails", Twin::kLiberty, fails("token", "CWWKS1455E"), "token-endpoint-refuses",
     "failure", "CWWKS1455E", "signatureAlgorithm", Works::kNo},
    {"SecretShortForTheAlgorithm", Twin::kLiberty, twin("algorithm", "HS512"), "secret-short",
     "warning", "needs 64", "64 bytes or more", Works::kNo},
    {"SignsWithRsa", Twin::kLiberty, twin("algorithm", "RS256"), "algorithms-unsupported",
     "failure", "RS256", "HS256", Works::kNo},
    {"NoClientCredentials", Twin::kLiberty,
     [](TwinSite& site) {
       site.twin["grant_types"].append("authorization_code");
       site.arguments = {"--try-secret"};
     },
     "secret-not-checked", "unchecked", "does not report", "browser", Works::kYes},
};

class DoctorAtATwin : public testing::TestWithParam<TwinFault> {};

TEST_P(DoctorAtATwin, FindsTheFault) {
  const TwinFault& fault = GetParam();
  TwinSite site(fault.twin);
  fault.seed(site);
  site.deploy();
  const Outcome run = runDoctor(site);
  const std::vector<Json::Value> findings = run.findings(fault.id);
  ASSERT_FALSE(findings.empty()) << run.out << run.err;
  const auto holds = [](const Json::Value& finding, const char* member, const char* text) {
    return finding[member].asString().find(text) != std::string::npos;
  };
  const auto found = std::find_if(findings.begin(), findings.end(), [&](const Json::Value& one) {
    return holds(one, "cause", fault.cause) && holds(one, "action", fault.action);
  });
  ASSERT_NE(found, findings.end()) << run.out;
  EXPECT_EQ((*found)["grade"].asString(), fault.grade);
  EXPECT_EQ(run.out.find(test::kTwinSecret), std::string::npos) << run.out;

  // Only the fault: nothing that contradicts it or sends people elsewhere.
  for (const Json::Value& other : run.document["findings"]) {
    if (other["grade"].asString() != "failure" || !other["because"].asString().empty()) continue;
    EXPECT_EQ(fault.works, Works::kNo) << test::compact(other);
  }
  EXPECT_TRUE(run.findings("secret-accepted").empty()) << run.out;
  if (fault.works == Works::kNotTried) return;
  const std::string outcome = site.signIn();
  EXPECT_EQ(outcome.empty(), fault.works == Works::kYes) << outcome;
}

INSTANTIATE_TEST_SUITE_P(Entra, DoctorAtATwin, testing::ValuesIn(kEntraFaults),
                         [](const auto& given) { return std::string(given.param.name); });
INSTANTIATE_TEST_SUITE_P(Liberty, DoctorAtATwin, testing::ValuesIn(kLibertyFaults),
                         [](const auto& given) { return std::string(given.param.name); });

// --- sound devices

struct Sound {
  const char* name;
  Twin twin;
  Seed seed;
};

std::ostream& operator<<(std::ostream& out, const Sound& sound) {
  return out << sound.name;
}

const std::vector<Sound> kSound = {
    {"EntraV1", Twin::kEntra1, trySecret()},
    {"EntraV2", Twin::kEntra2, trySecret()},
    {"Liberty", Twin::kLiberty, trySecret()},
    {"LibertyWithAnyMethod", Twin::kLiberty, twin("auth_method", "any")},
    {"TenantByDomain", Twin::kEntra2,
     all({tenant("ad.example.net"), part(kWellknown, test::kTwinTenant, "ad.example.net"),
          trySecret()})},
    {"DomainInTheUrlsOnly", Twin::kEntra1, tenant("ad.example.net")},
    {"KeysOfCommon", Twin::kEntra2, part(kWellknown, test::kTwinTenant, "common")},
    {"DocumentOfTheOtherVersion", Twin::kEntra1,
     part(kWellknown, "/.well-known", "/v2.0/.well-known")},
    {"TenantInUpperCaseInUrls", Twin::kEntra2, tenant("3F2A8F6E-5B1C-4D7E-9A60-2C4E8D10B7F5")},
    {"KeysOfTheApplication", Twin::kEntra2,
     all({twin("app_key", "own"), part(kWellknown, "configuration",
                                       "configuration?appid=" + std::string(test::kTwinClient))})},
    {"ManyKeys", Twin::kEntra2, twin("keys", 8)},
    {"KeysRollOver", Twin::kEntra2, all({twin("keys", 5), twin("rollover", 1)})},
    {"EarlyFormOfErrors", Twin::kEntra1, all({twin("era", 2018), trySecret()})},
    {"LoginProgramShowsAPage", Twin::kEntra2,
     [](TwinSite& site) { site.loginProgram = test::ok("<p>a login program with a page"); }},
};

class DoctorAtASoundTwin : public testing::TestWithParam<Sound> {};

TEST_P(DoctorAtASoundTwin, FindsNothing) {
  TwinSite site(GetParam().twin);
  GetParam().seed(site);
  site.deploy();
  const Outcome run = runDoctor(site);
  EXPECT_EQ(run.status, 0) << run.out << run.err;
  for (const Json::Value& finding : run.document["findings"]) {
    EXPECT_EQ(finding["grade"].asString(), "good") << test::compact(finding);
  }
  const bool tried = !site.arguments.empty();
  EXPECT_EQ(run.findings("secret-accepted").size(), tried ? 1u : 0u) << run.out;
  EXPECT_EQ(run.findings("authorization-endpoint").size(), 1u);
  EXPECT_EQ(run.findings("redirect").size(), 1u);
  EXPECT_EQ(run.out.find(test::kTwinSecret), std::string::npos) << run.out;
  EXPECT_EQ(site.signIn(), "");
}

INSTANTIATE_TEST_SUITE_P(Providers, DoctorAtASoundTwin, testing::ValuesIn(kSound),
                         [](const auto& given) { return std::string(given.param.name); });

}  // namespace
