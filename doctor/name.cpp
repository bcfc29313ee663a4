// The conversion of a user name, through the library and the device's platform behind it.
#include "doctor/checkup.h"
#include "doctor/claims.h"
#include "doctor/text.h"

namespace doctor {

namespace {

void AddRefused(Checkup& checkup, const Reply& reply) {
  const std::string& name = checkup.options.name;
  Finding finding{
      "name-form",    Severity::kFailure,
      Clip(name, 80), "is not an account, \"@\" and a DNS domain",
      reply.said,     "Let the provider put account@dns.domain into \"unique_name\" or \"email\"."};
  if (!reply.ended) {
    finding.id = "name-silent";
    finding.seen = "the device's directory service gave no answer within " +
                   std::to_string(checkup.options.timeout) + " s";
    finding.library = {Said::Does("waits for it")};
    finding.remedy = "Look at the device's directory service.";
  } else if (reply.Threw("QOVAWinsUserNameFqdn2Netbios failed.")) {
    finding.id = "name-refused";
    finding.seen = "the device's directory service does not convert it";
    finding.remedy =
        "Join the device to the domain of this user, and see that its directory "
        "service runs.";
  }
  checkup.report.Add(finding);
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

void CheckName(Checkup& checkup) {
  const std::string& name = checkup.options.name;
  if (name.empty()) return;
  checkup.report.Begin("User name");
  if (checkup.provider != Provider::kAzure) {
    checkup.report.Note("name", Clip(name, 80),
                        "names are converted by the profile \"azure\" alone; \"websphere\" takes "
                        "\"sub\" as it is");
    return;
  }
  Json::Value claims(Json::objectValue);
  claims["unique_name"] = name;
  const Reply reply = checkup.library.UserName(MakeToken(GoodHeader(checkup), claims));
  if (!reply.result.isString()) return AddRefused(checkup, reply);
  const std::string user = reply.result.asString();
  if (IsUnchanged(name, user)) {
    checkup.report.Add(
        {"name-unchanged",
         Severity::kWarning,
         Clip(name, 80),
         "becomes " + Quote(Clip(user, 80)) + ", with the DNS domain as it was",
         {Said::Does("signs the user in under this name")},
         "Build the library with SSOCLIENT_PLATFORM=winbind or the device's own platform "
         "library, unless users are known by this form."});
    return;
  }
  checkup.report.Ok("name", Clip(name, 80), "becomes " + Quote(Clip(user, 80)));
}

}  // namespace doctor
