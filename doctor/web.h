// One HTTP request of the doctor, which records what the library does not report.
#pragma once

#include <curl/curl.h>

#include <ctime>
#include <string>
#include <vector>

namespace doctor {

struct Certificate {
  std::string subject;
  std::string issuer;
  std::vector<std::string> names;  // its DNS names
  time_t not_before = 0;
  time_t not_after = 0;
};

struct WebAnswer {
  CURLcode code = CURLE_OK;
  std::string detail;      // libcurl's own words on the failure
  int os_error = 0;        // errno of a failed connection
  bool encrypted = false;  // the TLS handshake was done

  // The server's certificates as it sent them, its own first, and what OpenSSL said of them:
  // X509_V_OK, or the error and the place of the certificate that it is about.
  std::vector<Certificate> certificates;
  int verify_error = 0;
  std::string verify_text;
  size_t verify_depth = 0;
  bool names_host = true;  // the first certificate is for the host of the URL

  bool connected = false;
  std::string address;  // the IP address of the other end, or those that were tried
  long milliseconds = 0;
  long status = 0;          // HTTP
  std::string location;     // of a redirect
  std::string type;         // Content-Type
  std::string via;          // the headers Via, Server and the like, in one line
  bool asks_login = false;  // WWW-Authenticate
  long connect_status = 0;  // HTTP, of a proxy that was asked for a tunnel
  std::string body;
  time_t date = 0;  // of the header; 0: none
  time_t received = 0;
};

// Gets `url`, or posts `*body` to it as a form, like the library does: no redirects are followed,
// certificates are verified. Takes at most `seconds`; keeps at most 1 MB. With `lenient`, for
// requests to the device itself, a bad certificate is only noted, and no proxy is used.
WebAnswer Fetch(const std::string& url, const std::string* body, int seconds, bool lenient = false);

// The proxy that the environment names for the URL; empty if there is none.
std::string ProxyFor(const std::string& url);

// How long libcurl takes to read the certificate authorities, which it does for each request; in
// milliseconds, of a clock and of the processor.
struct BundleTime {
  double clock = 0;
  double processor = 0;
};
BundleTime ReadBundle();

// The bundle and the folder of certificate authorities that libcurl uses.
std::string TrustStore();

}  // namespace doctor
