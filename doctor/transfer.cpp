#include "doctor/transfer.h"

#include <openssl/x509_vfy.h>

#include <cstring>
#include <ctime>

#include "doctor/text.h"
#include "doctor/url.h"

namespace doctor {

namespace {

constexpr time_t kSoon = 14 * 86400;

std::string Names(const Certificate& certificate) {
  std::string names;
  for (const std::string& name : certificate.names) names += (names.empty() ? "" : ", ") + name;
  return names.empty() ? "no DNS name" : names;
}

// "CN = login.example.net (for login.example.net), issued by CN = Some CA"
std::string Describe(const Certificate& certificate) {
  return certificate.subject + " (for " + Names(certificate) + "), issued by " + certificate.issuer;
}

class TransferReport {
 public:
  TransferReport(Checkup& checked, const Destination& to, const WebAnswer& got)
      : checkup(checked), destination(to), answer(got), host(ParsedUrl(to.url).host()) {}

  bool Run() {
    if (answer.code == CURLE_OK) {
      AddGood();
      return true;
    }
    switch (answer.code) {
      case CURLE_URL_MALFORMAT:
      case CURLE_UNSUPPORTED_PROTOCOL:
        Fail("url-unusable", Clip(destination.url, 200) + ": " + answer.detail,
             "Write a whole URL, https://...");
        break;
      case CURLE_COULDNT_RESOLVE_HOST:
      case CURLE_COULDNT_RESOLVE_PROXY:
        Fail("name-not-resolved", answer.detail,
             "Look at the host name " + Quote(host) +
                 " and at the device's name servers "
                 "(/etc/resolv.conf): \"getent hosts " +
                 host + "\" must give an address.");
        break;
      case CURLE_COULDNT_CONNECT:
        Fail("connect-failed", Reason(),
             "Look at host and port in the URL, at routes, firewall and proxy of the device.");
        break;
      case CURLE_OPERATION_TIMEDOUT:
        AddSilent();
        break;
      case CURLE_PEER_FAILED_VERIFICATION:
        AddRefusedCertificate();
        break;
      case CURLE_SSL_CACERT_BADFILE:
        Fail(
            "tls-no-store", answer.detail,
            "Install the certificate authorities (package ca-certificates): " + TrustStore() + ".");
        break;
      case CURLE_SSL_CONNECT_ERROR:
        if (answer.verify_error != X509_V_OK) return AddRefusedCertificate(), false;
        Fail("tls-failed", answer.detail,
             "Look whether the port speaks TLS, and TLS 1.2 or later.");
        break;
      default:
        Fail("transfer-failed", answer.detail,
             "Look at the provider, and at what stands between it and the device (proxy, load "
             "balancer).");
    }
    return false;
  }

 private:
  void Fail(const char* id, const std::string& seen, const std::string& remedy) {
    Add(id, destination.grave, seen, destination.library(), remedy);
  }

  void Add(const char* id, Severity severity, const std::string& seen,
           const std::vector<Said>& said, const std::string& remedy) {
    checkup.report.Add({id, severity, destination.subject, seen, said, remedy});
  }

  std::string Reason() const {
    const std::string reason = answer.os_error != 0 ? std::strerror(answer.os_error) : "";
    return answer.detail + (reason.empty() ? "" : " (" + reason + ")");
  }

  // The library is not asked: it would wait.
  void AddSilent() {
    const std::string within = " within " + std::to_string(checkup.options.timeout) + " s";
    const bool encrypted = ParsedUrl(destination.url).scheme() == "https";
    std::string seen = "the server took the request and did not answer it in full" + within;
    if (encrypted && !answer.encrypted)
      seen = "the server did not finish the TLS handshake" + within;
    if (!answer.connected) seen = "no connection to " + host + within;
    Add("server-silent", destination.grave, seen,
        {Said::Does("waits for as long as it takes: it sets no time-out")},
        "Look at the provider and at the firewall; the login program must end a login that takes "
        "too long (--timeout gives more time here).");
  }

  void AddRefusedCertificate() {
    const std::vector<Certificate>& chain = answer.certificates;
    if (answer.verify_error == X509_V_OK) {
      return Fail("tls-wrong-name",
                  "the certificate is not for " + Quote(host) + ": " +
                      (chain.empty() ? answer.detail : Describe(chain[0])),
                  "Use a host name that the certificate stands for, or get the provider a "
                  "certificate for " +
                      Quote(host) + ".");
    }
    const Certificate* const about =
        answer.verify_depth < chain.size() ? &chain[answer.verify_depth] : nullptr;
    const std::string which = about != nullptr ? Describe(*about) : "a certificate";
    if (answer.verify_error == X509_V_ERR_CERT_HAS_EXPIRED && about != nullptr) {
      return Fail("tls-expired", which + ": expired " + Time(about->not_after),
                  "Renew the provider's certificate, if this device's clock is right (" +
                      Time(time(nullptr)) + ").");
    }
    if (answer.verify_error == X509_V_ERR_CERT_NOT_YET_VALID && about != nullptr) {
      return Fail("tls-not-yet-valid", which + ": valid from " + Time(about->not_before),
                  "Set this device's clock (" + Time(time(nullptr)) + "), or wait.");
    }
    const bool gap = answer.verify_error == X509_V_ERR_UNABLE_TO_GET_ISSUER_CERT_LOCALLY ||
                     answer.verify_error == X509_V_ERR_UNABLE_TO_VERIFY_LEAF_SIGNATURE;
    Fail("tls-untrusted", which + ": " + answer.verify_text,
         "Add the certificate authority to " + TrustStore() +
             (gap ? ", or let the server send its intermediate certificates." : "."));
  }

  void AddGood() {
    if (answer.date != 0) {
      checkup.server_times.push_back({host, answer.date, answer.received});
    }
    if (answer.certificates.empty()) {
      checkup.report.Ok("connection", destination.subject, "answers");
      return;
    }
    const Certificate& own = answer.certificates[0];
    const time_t left = own.not_after - time(nullptr);
    if (left < kSoon) {
      Add("tls-expires-soon", Severity::kWarning,
          Describe(own) + ": expires " + Time(own.not_after), {Said::Does("trusts it until then")},
          "Renew the provider's certificate in time.");
      return;
    }
    checkup.report.Ok(
        "connection", destination.subject,
        "answers; certificate " + Describe(own) + ", valid until " + Time(own.not_after));
  }

  Checkup& checkup;
  const Destination& destination;
  const WebAnswer& answer;
  const std::string host;
};

}  // namespace

bool ReportTransfer(Checkup& checkup, const Destination& destination, const WebAnswer& answer) {
  return TransferReport(checkup, destination, answer).Run();
}

}  // namespace doctor
