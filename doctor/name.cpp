// The conversion of a user name, through the library and the device's platform behind it.
#include "doctor/checkup.h"
#include "doctor/claims.h"
#include "doctor/redact.h"
#include "doctor/text.h"

namespace doctor {

namespace {

void AddRefused(Checkup& checkup, const Reply& reply, const std::string& shown) {
  Finding finding{"name-form",
                  Grade::kFailure,
                  "The name " + shown + " is not an account, \"@\" and a DNS domain",
                  {},
                  "Set \"unique_name\" or \"email\" to account@dns.domain at the provider.",
                  reply.said};
  if (!reply.ended) {
    finding.id = "name-silent";
    if (!checkup.settings_read) finding.because = "file-unreadable";
    finding.cause = "The device's directory service did not answer within " +
                    std::to_string(checkup.options.timeout) + " s";
    finding.detail = {Said::Does("waits for it")};
    finding.action = "Check the device's directory service: wbinfo --ping-dc";
  } else if (reply.Threw("QOVAWinsUserNameFqdn2Netbios failed.")) {
    finding.id = "name-refused";
    finding.cause = "The device's directory service does not know the domain of " + shown;
    finding.action =
        "Join the device to the domain of this user, and start its directory service: wbinfo -t";
  }
  checkup.report.Add(finding);
}

// Winbind's state, and whether it knows the user, if one is given.
void CheckWinbind(Checkup& checkup, const std::string& user) {
  const Reply reply = checkup.library.Winbind(user);
  if (reply.ended && !reply.result.isObject()) return;  // another platform
  if (!reply.ended || !reply.result["ping"].asBool()) {
    return checkup.report.Fail("directory-down",
                               "Winbind, which converts user names, does not answer", {},
                               "Start it: systemctl start winbind; wbinfo --ping",
                               {Said::Does("cannot convert a name without it")});
  }
  if (user.empty()) return checkup.report.Good("directory", "Winbind answers");
  if (reply.result["known"].asBool()) return;
  checkup.report.Warn(
      "name-unknown", "Winbind does not know the user " + Quote(Shown(user, 80)), {},
      "Create the account in the directory, or check it: wbinfo -n " + Quote(Shown(user, 80)),
      {Said::Does("signs the user in without looking the account up")});
}

// The form that the platform is given: DNS.DOMAIN\account.
bool IsUnchanged(const std::string& principal, const std::string& user) {
  const size_t at = principal.find('@');
  const size_t slash = user.find('\\');
  return slash != std::string::npos && at == user.size() - slash - 1 &&
         user.size() == principal.size() &&
         user.compare(slash + 1, std::string::npos, principal, 0, at) == 0;
}

}  // namespace

bool AddIfGuest(Checkup& checkup, const std::string& name, const Place& place,
                const std::vector<Said>& said) {
  const bool guest =
      name.find("#EXT#") != std::string::npos || name.compare(0, 9, "live.com#") == 0;
  if (!guest) return false;
  checkup.report.Fail("name-guest",
                      "The user " + Quote(Shown(name, 100)) +
                          " is a guest of the tenant, whose name is not of the device's directory",
                      place, "Sign in with an account of the directory instead of the guest's.",
                      said);
  return true;
}

void CheckName(Checkup& checkup) {
  const std::string& name = checkup.options.name;
  if (checkup.azure()) CheckWinbind(checkup, "");
  if (name.empty()) return;
  const std::string shown = Quote(Shown(name, 80));
  if (checkup.provider != Provider::kAzure) {
    return checkup.report.Good("name",
                               "The profile \"websphere\" does not convert names; the "
                               "user is \"sub\"");
  }
  Json::Value claims(Json::objectValue);
  claims["unique_name"] = name;
  const Reply reply = checkup.library.UserName(MakeToken(GoodHeader(checkup), claims));
  if (AddIfGuest(checkup, name, {}, reply.said)) return;
  if (!reply.result.isString()) return AddRefused(checkup, reply, shown);
  const std::string user = reply.result.asString();
  const std::string becomes = "The name " + shown + " becomes " + Quote(Shown(user, 80));
  CheckWinbind(checkup, user);
  if (!IsUnchanged(name, user)) return checkup.report.Good("name", becomes);
  checkup.report.Add(
      {"name-unchanged",
       Grade::kWarning,
       becomes + ", with the DNS domain unchanged",
       {},
       "Build the library with SSOCLIENT_PLATFORM=winbind or the device's own platform library, "
       "unless users have names of this form.",
       {Said::Does("signs the user in under this name")}});
}

}  // namespace doctor
