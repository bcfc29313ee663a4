#include "doctor/transfer.h"

#include <openssl/x509_vfy.h>

#include <cstring>
#include <ctime>
#include <regex>

#include "doctor/answer.h"
#include "doctor/redact.h"
#include "doctor/terminal.h"
#include "doctor/text.h"
#include "doctor/url.h"

namespace doctor {

namespace {

constexpr time_t kSoon = 14 * 86400;

// "CN = login.example.net (for login.example.net), issued by CN = Some CA"
std::string Describe(const Certificate& certificate) {
  std::string names;
  for (const std::string& name : certificate.names) names += (names.empty() ? "" : ", ") + name;
  return Shown(certificate.subject, 200) + " (for " +
         (names.empty() ? "no DNS name" : Shown(names, 200)) + "), issued by " +
         Shown(certificate.issuer, 200);
}

class TransferReport {
 public:
  TransferReport(Checkup& checked, const Destination& to, const WebAnswer& got)
      : checkup(checked),
        destination(to),
        answer(got),
        host(Shown(ParsedUrl(to.url).host(), 100)),
        detail(Shown(got.detail, 200)) {}

  bool Run() {
    if (IsProxyFault()) return AddProxy();
    switch (answer.code) {
      case CURLE_OK:
        return AddAnswer();
      case CURLE_URL_MALFORMAT:
      case CURLE_UNSUPPORTED_PROTOCOL:
        FailAt("url-unusable", "The URL cannot be used: " + detail,
               "Write a whole URL, https://...");
        break;
      case CURLE_COULDNT_RESOLVE_HOST:
        FailAt("name-not-resolved", "The host name cannot be resolved: " + detail,
               "Correct the host name or the device's name servers (/etc/resolv.conf), until it "
               "has an address: getent hosts " +
                   host);
        break;
      case CURLE_COULDNT_CONNECT:
        FailAt("connect-failed", "The server cannot be reached: " + detail + Reason(),
               "Check host and port in the URL, then routes, firewall and proxy of the device.");
        break;
      case CURLE_OPERATION_TIMEDOUT:
        AddSilent();
        break;
      case CURLE_PEER_FAILED_VERIFICATION:
        AddRefusedCertificate();
        break;
      case CURLE_SSL_CACERT_BADFILE:
        Fail("tls-no-store", "This device has no certificate authorities: " + detail,
             "Install them (package ca-certificates): " + TrustStore());
        break;
      case CURLE_SSL_CONNECT_ERROR:
        if (answer.verify_error != X509_V_OK) {
          AddRefusedCertificate();
          break;
        }
        Fail("tls-failed", "The TLS handshake fails: " + detail,
             "Check that the port speaks TLS, and TLS 1.2 or later: openssl s_client -connect " +
                 host + ":443");
        break;
      default:
        Fail("transfer-failed", "The connection breaks: " + detail,
             "Check the provider, and the proxy or load balancer between it and the device.");
    }
    return false;
  }

 private:
  void Fail(const char* id, const std::string& cause, const std::string& action) {
    Add(id, destination.grave, cause, action, destination.library());
  }

  // Of a URL that may be wrong.
  void FailAt(const char* id, const std::string& cause, const std::string& action) {
    Fail(id, cause, destination.fix.empty() ? action : destination.fix);
  }

  void Add(const char* id, Grade grade, const std::string& cause, const std::string& action,
           const std::vector<Said>& said) {
    checkup.report.Add({id, grade, cause, At(destination, answer), action, said});
  }

  std::string Reason() const {
    return answer.os_error != 0 ? " (" + std::string(std::strerror(answer.os_error)) + ")" : "";
  }

  // --- proxy and network

  bool IsProxyFault() const {
    return answer.connect_status >= 400 || answer.code == CURLE_COULDNT_RESOLVE_PROXY ||
           (answer.code == CURLE_COULDNT_CONNECT && !ProxyFor(destination.url).empty());
  }

  bool AddProxy() {
    const ParsedUrl proxy(ProxyFor(destination.url));
    const std::string who = "The proxy " + Shown(proxy.host() + ":" + proxy.port(), 100);
    const long status = answer.connect_status;
    if (status == 0) {
      Fail("proxy-failed", who + " cannot be reached: " + detail + Reason(),
           "Correct the proxy in the environment (https_proxy), or remove it.");
    } else if (status == 407) {
      Fail("proxy-failed", who + " asks for a user name and password (HTTP 407)",
           "Put user name and password of the proxy into https_proxy, or let it admit the device.");
    } else if (status >= 500) {
      Fail("proxy-failed",
           who + " does not reach " + host + " (HTTP " + std::to_string(status) + ")",
           "Check that the proxy can resolve and reach " + host + ".");
    } else {
      Fail("proxy-failed",
           who + " refuses connections to " + host + " (HTTP " + std::to_string(status) + ")",
           "Allow " + host + " at the proxy.");
    }
    return false;
  }

  bool AddAnswer() {
    Finding stranger;
    if (!destination.page || answer.status >= 400) stranger = Stranger(answer, destination.url);
    if (stranger.id.empty()) {
      AddGood();
      return true;
    }
    Add(stranger.id.c_str(), destination.grave, stranger.cause, stranger.action,
        destination.library());
    return false;
  }

  // The library is not asked: it would wait.
  void AddSilent() {
    const std::string within = " within " + std::to_string(checkup.options.timeout) + " s";
    const bool encrypted = ParsedUrl(destination.url).scheme() == "https";
    std::string cause = "The server took the request and did not answer it in full" + within;
    if (encrypted && !answer.encrypted) {
      cause = "The server did not finish the TLS handshake" + within;
    }
    if (!answer.connected) cause = "There is no connection to " + host + within;
    Add("server-silent", destination.grave, cause,
        "Check the firewall and the provider; --timeout gives more time.",
        {Said::Does("sets no time-out: the login program must end a sign-in that takes too long")});
  }

  void AddRefusedCertificate() {
    const std::vector<Certificate>& chain = answer.certificates;
    if (answer.verify_error == X509_V_OK) {
      return FailAt("tls-wrong-name",
                    "The certificate is not for " + Quote(host) + ": " +
                        (chain.empty() ? detail : Describe(chain[0])),
                    "Use a host name of the certificate, or get the provider a certificate for " +
                        Quote(host) + ".");
    }
    const Certificate* const about =
        answer.verify_depth < chain.size() ? &chain[answer.verify_depth] : nullptr;
    const std::string which = about != nullptr ? Describe(*about) : "a certificate";
    if (answer.verify_error == X509_V_ERR_CERT_HAS_EXPIRED && about != nullptr) {
      return Fail("tls-expired", "A certificate expired " + Time(about->not_after) + ": " + which,
                  "Renew the provider's certificate, if this device's clock is right (" +
                      Time(time(nullptr)) + ").");
    }
    if (answer.verify_error == X509_V_ERR_CERT_NOT_YET_VALID && about != nullptr) {
      return Fail("tls-not-yet-valid",
                  "A certificate is valid only from " + Time(about->not_before) + ": " + which,
                  "Set this device's clock (" + Time(time(nullptr)) + "), or wait.");
    }
    AddUntrusted(which);
  }

  // A firewall or proxy that opens TLS connections signs with its own authority.
  void AddUntrusted(const std::string& which) {
    static const std::regex inspects(
        "prox(y|ies)|inspect|intercept|firewall|gateway|appliance|filter|mitm|forti|zscaler|"
        "netskope|sophos|blue ?coat|palo alto|checkpoint|umbrella|decrypt",
        std::regex::icase);
    static const std::regex microsoft(
        "(.*\\.)?(microsoftonline\\.(com|us)|windows\\.net|"
        "microsoftonline\\.cn)");
    static const std::regex theirs("DigiCert|Microsoft");
    const std::string issuer = answer.certificates.empty() ? "" : answer.certificates.back().issuer;
    const std::string shown = Shown(issuer, 200);
    if (std::regex_search(issuer, inspects) ||
        (std::regex_match(host, microsoft) && !std::regex_search(issuer, theirs))) {
      return Fail("tls-intercepted",
                  "The certificate is not the provider's: a firewall or proxy between opens the "
                  "connection and signs as " +
                      shown,
                  "Exempt " + host + " from TLS inspection, or add the certificate of " + shown +
                      " to " + TrustStore() + ".");
    }
    const bool gap = answer.verify_error == X509_V_ERR_UNABLE_TO_GET_ISSUER_CERT_LOCALLY ||
                     answer.verify_error == X509_V_ERR_UNABLE_TO_VERIFY_LEAF_SIGNATURE;
    Fail("tls-untrusted",
         "This device does not trust the certificate (" + answer.verify_text + "): " + which,
         "Add the certificate authority to " + TrustStore() +
             (gap ? ", or let the server send its intermediate certificates." : "."));
  }

  void AddGood() {
    if (answer.date != 0) {
      checkup.server_times.push_back({host, answer.date, answer.received});
    }
    const Place place = At(destination, answer);
    if (answer.certificates.empty()) {
      return checkup.report.Good("connection", "The " + destination.what + " answers", place);
    }
    const Certificate& own = answer.certificates[0];
    if (own.not_after - time(nullptr) < kSoon) {
      return Add("tls-expires-soon", Grade::kWarning,
                 "The certificate expires " + Time(own.not_after) + ": " + Describe(own),
                 "Renew the provider's certificate in time.", {Said::Does("trusts it until then")});
    }
    checkup.report.Good("connection",
                        "The " + destination.what + " answers; certificate " + Describe(own) +
                            ", valid until " + Time(own.not_after),
                        place);
  }

  Checkup& checkup;
  const Destination& destination;
  const WebAnswer& answer;
  const std::string host;
  const std::string detail;
};

}  // namespace

Place At(const Destination& destination, const WebAnswer& answer) {
  return {"", "", Shown(destination.url, 200), answer.address};
}

WebAnswer Send(Checkup& checkup, const Destination& destination, const std::string* body,
               const std::string& url) {
  Progress("Waiting for the " + destination.what + ", " + destination.url);
  WebAnswer answer = Fetch(url.empty() ? destination.url : url, body, checkup.options.timeout);
  checkup.transfer_milliseconds += answer.milliseconds;
  checkup.report.AddRequest({destination.what, body == nullptr ? "GET" : "POST", destination.url,
                             answer.address, answer.status, answer.milliseconds});
  return answer;
}

bool Judge(Checkup& checkup, const Destination& destination, const WebAnswer& answer) {
  return TransferReport(checkup, destination, answer).Run();
}

bool Exchange(Checkup& checkup, const Destination& destination, const std::string* body,
              WebAnswer& answer, const std::string& url) {
  answer = Send(checkup, destination, body, url);
  return Judge(checkup, destination, answer);
}

}  // namespace doctor
