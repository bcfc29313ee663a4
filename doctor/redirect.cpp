// The redirect URI, as far as this device can see it: where it leads, and what is there.
#include <arpa/inet.h>
#include <openssl/x509_vfy.h>
#include <sys/socket.h>
#include <unistd.h>

#include "doctor/answer.h"
#include "doctor/checkup.h"
#include "doctor/redact.h"
#include "doctor/terminal.h"
#include "doctor/text.h"
#include "doctor/web.h"

namespace doctor {

namespace {

// True if the IP address is one of this device's.
bool IsOurs(const std::string& address) {
  struct sockaddr_in four = {};
  struct sockaddr_in6 six = {};
  four.sin_family = AF_INET;
  six.sin6_family = AF_INET6;
  const bool is_six = address.find(':') != std::string::npos;
  void* const where = is_six ? static_cast<void*>(&six.sin6_addr) : &four.sin_addr;
  if (inet_pton(is_six ? AF_INET6 : AF_INET, address.c_str(), where) != 1) return false;
  const int socket = ::socket(is_six ? AF_INET6 : AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  if (socket < 0) return false;
  const auto* const own = is_six ? reinterpret_cast<const struct sockaddr*>(&six)
                                 : reinterpret_cast<const struct sockaddr*>(&four);
  const bool ours = bind(socket, own, is_six ? sizeof six : sizeof four) == 0;
  close(socket);
  return ours;
}

class RedirectCheck {
 public:
  explicit RedirectCheck(Checkup& checked)
      : checkup(checked), url(checked.settings.redirect_uri), parsed(url) {}

  void Run() {
    Progress("Waiting for the redirect URI, " + url);
    answer = Fetch(url, nullptr, checkup.options.timeout, true);
    checkup.report.AddRequest(
        {"redirect URI", "GET", url, answer.address, answer.status, answer.milliseconds});
    grave = IsOurs(answer.address) ? Grade::kFailure : Grade::kWarning;
    const std::string detail = " (" + Shown(answer.detail, 200) + ")";
    if (answer.code == CURLE_COULDNT_RESOLVE_HOST) {
      return Add("redirect-not-resolved", Grade::kWarning,
                 "This device cannot resolve the host name of the redirect URI" + detail,
                 "Check that browsers can: nslookup " + Shown(parsed.host(), 100));
    }
    if (answer.code != CURLE_OK) {
      return Add("redirect-not-reached", Grade::kWarning,
                 "This device cannot reach the redirect URI" + detail,
                 "Open the redirect URI in a browser: the device must answer.");
    }
    CheckCertificate();
    CheckProgram();
  }

 private:
  void Add(const char* id, Grade grade, const std::string& cause, const std::string& action) {
    Place place = checkup.At("redirect_uri");
    place.url = Shown(url, 200);
    place.address = answer.address;
    checkup.report.Add(
        {id,
         grade,
         cause,
         place,
         action,
         {Said::Does("hands the URI to the provider, which sends the browser there")}});
  }

  // Browsers warn; people can go on.
  void CheckCertificate() {
    if (answer.certificates.empty()) return;
    const Certificate& own = answer.certificates[0];
    if (!answer.names_host) {
      Add("redirect-certificate", Grade::kWarning,
          "The device's certificate is not for " + Quote(Shown(parsed.host(), 100)) + ", but " +
              Shown(own.subject, 200),
          "Use the name in the device's certificate, or install a certificate for this one.");
    } else if (own.not_after < time(nullptr)) {
      Add("redirect-certificate", Grade::kWarning,
          "The device's certificate expired " + Time(own.not_after),
          "Install a new certificate on the device.");
    }
  }

  void CheckProgram() {
    const std::string described = " (" + Describe(answer) + ")";
    const std::string install = "Set " + checkup.Key("redirect_uri") +
                                " to the URL of the login program, here and at the "
                                "provider.";
    const bool page = answer.status == 200;
    if (answer.status == 404 || answer.status == 410) {
      return Add("redirect-missing", grave,
                 "There is no login program at the redirect URI" + described, install);
    }
    if (answer.status >= 500) {
      return Add("redirect-error", grave,
                 "The web server cannot run the login program at the redirect URI" + described,
                 "See the web server's error log; --program checks the program.");
    }
    if (page && answer.body.find("relay.js") != std::string::npos) {
      return Add("redirect-relay", grave, "The redirect URI is the relay page, which takes no code",
                 install);
    }
    if (page && (answer.body.compare(0, 2, "#!") == 0 || answer.body.compare(0, 4,
                                                                             "\x7f"
                                                                             "ELF") == 0)) {
      return Add("redirect-not-run", grave,
                 "The web server sends the login program to the browser and does not run it",
                 "Let the web server run it as a CGI program.");
    }
    if (answer.status == 403) {
      return Add("redirect-error", Grade::kWarning,
                 "The web server refuses the redirect URI" + described,
                 "See the web server's error log.");
    }
    Place place = checkup.At("redirect_uri");
    place.address = answer.address;
    checkup.report.Good("redirect", "The redirect URI answers" + described, place);
  }

  Checkup& checkup;
  const std::string url;
  const ParsedUrl parsed;
  WebAnswer answer;
  Grade grave = Grade::kWarning;
};

}  // namespace

void CheckRedirect(Checkup& checkup) {
  if (checkup.IsWorthRequest(checkup.settings.redirect_uri)) RedirectCheck(checkup).Run();
}

}  // namespace doctor
