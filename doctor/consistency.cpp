// The URLs compared with one another and with the discovery document.
#include <array>

#include "doctor/checkup.h"
#include "doctor/claims.h"
#include "doctor/json.h"
#include "doctor/redact.h"
#include "doctor/text.h"
#include "doctor/url.h"

namespace doctor {

namespace {

constexpr char kPersonal[] = "9188040d-6c67-4c5b-b112-36a304b66dad";  // of personal accounts

struct Role {
  const char* key;     // without prefix
  const char* member;  // of the discovery document; nullptr: none
  const char* name;
};

constexpr std::array<Role, 4> kRoles = {
    Role{"authorization_endpoint", "authorization_endpoint", "authorization endpoint"},
    {"token_endpoint", "token_endpoint", "token endpoint"},
    {"logout_endpoint", "end_session_endpoint", "end-session endpoint"},
    {"wellknown", nullptr, "discovery document"}};

// The part of an issuer that is a tenant's ID, if there is one.
std::string TenantOf(const std::string& issuer) {
  for (size_t at = 0; at + 36 <= issuer.size(); ++at) {
    const std::string part = issuer.substr(at, 36);
    if (IsGuid(part)) return part;
  }
  return "";
}

class Consistency {
 public:
  explicit Consistency(Checkup& checked)
      : checkup(checked),
        urls({&checked.settings.authorization_endpoint, &checked.settings.token_endpoint,
              &checked.settings.logout_endpoint, &checked.settings.wellknown}) {}

  void Run() {
    CheckRoles();
    if (!checkup.azure()) return;
    const Shape page = ShapeOf(*urls[0]);
    const Shape token = ShapeOf(*urls[1]);
    if (page.version > 0 && token.version > 0 && page.version != token.version) {
      Warn("versions-mixed", 1,
           "The authorization endpoint is of v" + std::to_string(page.version) +
               ".0, the token endpoint of v" + std::to_string(token.version) + ".0",
           "If sign-ins fail, use URLs of one version.");
    }
    CheckTenants(Resolved(page.tenant), Resolved(token.tenant));
  }

 private:
  Place At(size_t i) const {
    Place place = checkup.At(kRoles[i].key);
    place.url = Shown(*urls[i], 200);
    return place;
  }

  void Warn(const char* id, size_t i, const std::string& cause, const std::string& action) {
    checkup.report.Warn(id, cause, At(i), action, {Said::Does("does not compare its URLs")});
  }

  // --- each URL is that of its own endpoint

  // What the URL leads to: an index of kRoles, or their number if that is unknown.
  size_t RoleOf(const std::string& url) const {
    for (size_t i = 0; i < kRoles.size(); ++i) {
      if (kRoles[i].member == nullptr) continue;
      const std::string there = StringOf(checkup.discovery, kRoles[i].member);
      if (!there.empty() && there == url) return i;
    }
    const std::string role = ShapeOf(url).role;
    for (size_t i = 0; i < kRoles.size(); ++i) {
      if (role == kRoles[i].key) return i;
    }
    return kRoles.size();
  }

  void CheckRoles() {
    if (RoleOf(*urls[0]) == 1 && RoleOf(*urls[1]) == 0) {
      checkup.bad_urls.insert({*urls[0], *urls[1]});
      return checkup.report.Fail(
          "endpoints-swapped", "The URLs of authorization endpoint and token endpoint are swapped",
          At(0),
          "Exchange the values of " + checkup.Key(kRoles[0].key) + " and " +
              checkup.Key(kRoles[1].key) + ".",
          Evidence(1));
    }
    for (size_t i = 0; i < kRoles.size(); ++i) {
      const size_t role = RoleOf(*urls[i]);
      const bool other = ShapeOf(*urls[i]).role == "other";
      if (urls[i]->empty() || role == i || (role == kRoles.size() && !other)) continue;
      const bool unused = i == 2 || (i == 3 && !checkup.azure());
      checkup.bad_urls.insert(*urls[i]);
      checkup.report.Add({"endpoint-other", unused ? Grade::kWarning : Grade::kFailure,
                          Quote(checkup.Key(kRoles[i].key)) + " is not the URL of the " +
                              kRoles[i].name +
                              (other ? "" : ", but of the " + std::string(kRoles[role].name)),
                          At(i), checkup.Fix(kRoles[i].key, *urls[i]), Evidence(i)});
    }
  }

  std::vector<Said> Evidence(size_t i) const {
    if (i == 1 && !checkup.options.offline) return checkup.library.TokenRequest("").said;
    return {Said::Does(i == 0 ? "sends the browser there" : "uses it")};
  }

  // --- tenants

  // The tenant's ID for its domain name, where the discovery document has both.
  std::string Resolved(const std::string& tenant) const {
    const bool same = tenant == ShapeOf(*urls[3]).tenant;
    const std::string id = LowerCase(TenantOf(checkup.issuer));
    return same && !id.empty() && !tenant.empty() ? id : tenant == "consumers" ? kPersonal : tenant;
  }

  void CheckTenants(const std::string& page, const std::string& token) {
    if (IsPersonal(page, token)) return;
    WarnOfShared(page, token);
    if (IsGuid(page) && IsGuid(token) && page != token) {
      const size_t wrong = page == LowerCase(checkup.tenant) ? 1 : 0;
      return checkup.report.Fail(
          "tenants-differ", "The authorization endpoint and the token endpoint are of two tenants",
          At(wrong),
          "Put the directory (tenant) ID of the other into " + checkup.Key(kRoles[wrong].key) + ".",
          {Said::Does("does not compare its URLs")});
    }
    const std::string named = LowerCase(TenantOf(checkup.issuer));
    const std::string used = IsGuid(token) ? token : IsGuid(page) ? page : "";
    if (!used.empty() ? used != LowerCase(checkup.tenant)
                      : page.empty() && !named.empty() && named != checkup.tenant) {
      return AddOther(used.empty() ? named : used);
    }
    if (!named.empty() && !used.empty() && named != used && named != kPersonal) {
      Warn("discovery-other-tenant", 3,
           "The discovery document is that of the tenant " + named + ", not of " + used,
           "Set azure_wellknown to the document of the tenant " + used + ".");
    }
  }

  // Tokens come from another tenant than the one that is configured.
  void AddOther(const std::string& tenant) {
    if (checkup.entra() && !IsGuid(checkup.tenant)) return;  // a finding about the settings
    Json::Value claims = GoodClaims(checkup);
    claims["tid"] = tenant;
    checkup.report.Fail("discovery-other-tenant",
                        "The URLs are those of the tenant " + tenant + "; configured is " +
                            Quote(Shown(checkup.tenant, 80)),
                        checkup.At("tenant_id"),
                        "Set azure_tenant_id and the URLs to the same tenant.",
                        checkup.library.VerifyOffline(MakeToken(GoodHeader(checkup), claims)).said);
  }

  bool IsPersonal(const std::string& page, const std::string& token) {
    const bool personal = page == kPersonal || token == kPersonal;
    if (!personal || checkup.tenant == kPersonal) return false;
    checkup.report.Fail(
        "tenant-shared",
        "The URLs are those for personal accounts (\"consumers\"), which are not in the tenant " +
            Quote(Shown(checkup.tenant, 80)),
        At(page == kPersonal ? 0 : 1),
        "Put the directory (tenant) ID in place of \"consumers\" into the URLs.",
        {Said::Does("refuses tokens of other tenants: tenant ID invalid")});
    return true;
  }

  void WarnOfShared(const std::string& page, const std::string& token) {
    for (const size_t i : {size_t{0}, size_t{1}}) {
      const std::string& tenant = i == 0 ? page : token;
      if (tenant != "common" && tenant != "organizations") continue;
      Warn("tenant-shared", i,
           Quote(tenant) + " in " + checkup.Key(kRoles[i].key) +
               " lets users of other tenants sign in at the provider, whom the device then refuses",
           "If sign-ins fail, put the directory (tenant) ID in its place.");
      return;
    }
  }

  Checkup& checkup;
  const std::array<const std::string*, 4> urls;
};

}  // namespace

std::string Checkup::Documented(const std::string& name, const std::string& configured) const {
  for (const Role& role : kRoles) {
    if (name != role.key || role.member == nullptr) continue;
    const std::string there = StringOf(discovery, role.member);
    return IsSameEndpoint(there, configured) ? "" : there;
  }
  return "";
}

std::string Checkup::Fix(const std::string& name, const std::string& configured) const {
  for (const Role& role : kRoles) {
    if (name != role.key) continue;
    const std::string there = role.member != nullptr ? StringOf(discovery, role.member) : "";
    return "Set " + Key(name) + " to " +
           (there.empty() || there == configured
                ? "the URL of the provider's " + std::string(role.name)
                : Shown(there, 200)) +
           ".";
  }
  return "";
}

void CheckConsistency(Checkup& checkup) {
  if (checkup.settings_read) Consistency(checkup).Run();
}

}  // namespace doctor
