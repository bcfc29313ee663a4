// Faults between the device and its provider, and of the device's directory.
#include <sys/prctl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <csignal>
#include <ctime>
#include <fstream>
#include <sstream>

#include "doctor_faults.h"
#include "support/device.h"
#include "support/server.h"

namespace test {
namespace {

using Seed = std::function<void(Site&)>;

constexpr char kDiscovery[] = "/.well-known/openid-configuration";
constexpr char kParseFailed[] = "parse json falied";

Answer page(int status, const std::string& title, std::vector<std::string> headers = {}) {
  Answer answer = failed(status, "<html><head><title>" + title + "</title></head></html>");
  answer.headers = std::move(headers);
  answer.headers.push_back("Content-Type: text/html");
  return answer;
}

// A proxy that answers every request for a tunnel in this way.
std::string proxy(const std::string& answer) {
  auto* const server = new Server;  // it ends with the test
  server->start(
      [answer](int listener) {
        for (;;) {
          char request[1024];
          const int connection = accept(listener, nullptr, nullptr);
          if (read(connection, request, sizeof request) > 0) {
            (void)!write(connection, answer.data(), answer.size());
          }
          close(connection);
        }
      },
      60);
  return "http://127.0.0.1:" + std::to_string(server->port());
}

SeededFault atProxy(const char* name, const std::string& status, const char* action) {
  return {name,
          [status](Site& s) {
            s.environment["https_proxy"] =
                proxy("HTTP/1.1 " + status + "\r\nContent-Length: 0\r\nConnection: close\r\n\r\n");
          },
          "proxy-failed",
          "failure",
          "",
          action,
          1,
          Proof::kNone,
          {0, 0, 0},
          true,
          "The proxy 127.0.0.1"};
}

// Every request to the provider gets this answer.
SeededFault everywhere(const char* name, const Answer& answer, const char* id, const char* action) {
  return {name,
          [answer](Site& s) {
            for (const char* path : {kDiscovery, "/keys", "/token", "/authorize"}) {
              s.answers[path] = answer;
            }
          },
          id,
          "failure",
          kParseFailed,
          action,
          1,
          Proof::kSameWords};
}

SeededFault authorization(const char* name, const Answer& answer, const char* id, const char* grade,
                          const char* action, int status) {
  return {name,   [answer](Site& s) { s.answers["/authorize"] = answer; },
          id,     grade,
          "",     action,
          status, Proof::kNone};
}

Seed signedBy(const char* issuer) {
  return [issuer](Site& s) { s.identity = selfSigned({"localhost"}, issuer); };
}

Seed winbind(const char* state, const std::string& name) {
  return [=](Site& s) {
    s.environment = {{"LD_PRELOAD", WINBIND_STUB},
                     {"WINBIND", state},
                     {"ASAN_OPTIONS", "verify_asan_link_order=0"}};
    s.withDirectory = true;
    if (!name.empty()) s.arguments = {"--name", name};
  };
}

}  // namespace

std::vector<SeededFault> wayFaults() {
  constexpr char kRefused[] =
      "request token uri SSL peer certificate or SSH remote key was not OK.";
  return {
      atProxy("ProxyWantsAPassword", "407 Proxy Authentication Required", "user name and password"),
      atProxy("ProxyForbids", "403 Forbidden", "Allow localhost at the proxy"),
      atProxy("ProxyDoesNotReachIt", "502 Bad Gateway", "can resolve and reach localhost"),
      atProxy("ProxyIsOverloaded", "503 Service Unavailable", "can resolve and reach localhost"),
      everywhere("ProxyAnswers",
                 page(503, "ERROR: The requested URL could not be retrieved",
                      {"Via: 1.1 gateway (squid/5.7)"}),
                 "proxy-failed", "Let the proxy pass requests to localhost"),
      everywhere("FirewallAnswers", page(403, "Web Page Blocked"), "network-blocked",
                 "reach localhost in the firewall"),
      everywhere("WebFilterAnswers", page(200, "FortiGuard Intrusion Prevention"),
                 "network-blocked", "reach localhost in the firewall"),
      everywhere("CaptivePortal", page(200, "Guest network sign-in"), "captive-portal",
                 "without the portal"),
      everywhere("CaptivePortalRedirects", page(302, "", {"Location: http://10.0.0.1/login?url=x"}),
                 "captive-portal", "without the portal"),
      everywhere("NetworkAuthenticationRequired", page(511, "Network"), "captive-portal",
                 "without the portal"),
      authorization("AuthorizationBroken", page(500, "Error 500"), "authorization-error", "failure",
                    "provider and its log", 1),
      authorization("AuthorizationForbidden", page(403, "Nothing"), "authorization-odd", "warning",
                    "in a browser", 0),
      authorization("AuthorizationRefused", page(400, "Bad request"), "authorization-odd",
                    "failure", "in a browser", 1),
      authorization("AuthorizationInJson", failed(400, R"({"error":"invalid_client"})"),
                    "authorization-refused", "failure", "client ID", 1),
      authorization("AuthorizationWithAnUnlistedCode",
                    page(200, "Sorry: AADSTS4711999: something new"), "authorization-refused",
                    "failure", "error?code=4711999", 1),
      authorization("AuthorizationComesBack",
                    page(302, "",
                         {"Location: https://device.example.net/webman/"
                          "login.cgi?error=invalid_scope&state=x"}),
                    "authorization-refused", "failure", "scope", 1),
      {"TlsInspection", signedBy("Example Web Gateway CA"), "tls-intercepted", "failure", kRefused,
       "Exempt localhost from TLS inspection", 1, Proof::kSameWords},
      {"BundleLong",
       [](Site&) {
         std::ostringstream one;
         one << std::ifstream("/etc/ssl/certs/ca-certificates.crt").rdbuf();
         std::string bundle;
         for (int i = 0; i < 20; ++i) bundle += one.str();
         coverFile("/etc/ssl/certs/ca-certificates.crt", bundle);
       },
       "bundle-slow", "warning", "", "bundle with the provider's", 0, Proof::kSucceeds},
      {"WinbindDown", winbind("down", ""), "directory-down", "failure", "", "start winbind", 1,
       Proof::kNone},
      {"UserUnknown", winbind("up", "carol@ad.werk.example.net"), "name-unknown", "warning", "",
       "wbinfo -n", 0, Proof::kNone},
      {"NameOfAGuest",
       [](Site& s) {
         s.arguments = {"--offline", "--name", "bob_other.example.org#EXT#@ad.werk.example.net"};
       },
       "name-guest", "failure", "", "account of the directory", 1, Proof::kNone},
      {"TokenOfAGuest",
       [](Site& s) {
         s.passToken = true;
         s.claims["unique_name"] = "live.com#bob@other.example.org";
       },
       "name-guest", "failure", "", "account of the directory", 1, Proof::kNone},
      {"TokenExpiredByTheClock",
       [](Site& s) {
         s.passToken = true;
         s.clockSkew = -7200;
         s.claims["exp"] = static_cast<Json::Int64>(time(nullptr) - 3600);
       },
       "token-expired",
       "failure",
       "id_token expired.",
       "Set this device's clock",
       1,
       Proof::kSameWords,
       {0, 0, 0},
       true,
       "for this device only, whose clock is 2 h ahead"},
  };
}

}  // namespace test
