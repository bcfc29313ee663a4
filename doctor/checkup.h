// The checks of the doctor, one function per topic, in the order in which main runs them. Each
// adds its findings to the report and leaves what later ones need in the checkup.
#pragma once

#include <ctime>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "doctor/library.h"
#include "doctor/options.h"
#include "doctor/report.h"
#include "doctor/url.h"

namespace doctor {

struct Checkup {
  Checkup(const Options& given, Report& findings)
      : options(given), report(findings), library(given.timeout) {}

  const Options& options;
  Report& report;
  Library library;

  std::optional<Caller> caller;         // the login program's identity, if it was named
  Provider provider = Provider::kNone;  // of the profile file, whether sign-on is on or not
  bool settings_read = false;           // the provider's file could be read and used
  std::string settings_file;
  Settings settings;
  std::set<std::string> bad_urls;  // not worth a request: there is a finding
  std::set<std::string> bad_keys;  // the same for keys of the settings file
  bool reference_program = false;  // the login program is the reference's
  int login_deadline = 20;         // its, in seconds
  std::string tenant;              // the library has no accessor for it
  std::string network_obstacle;    // the finding that kept the key set away
  Json::Value discovery;           // the document; null: there is none
  std::string issuer;              // of the discovery document
  Json::Value key_set;
  long transfer_milliseconds = 0;  // of all requests

  bool azure() const { return provider == Provider::kAzure; }
  // True if the URLs have the form of Entra ID's: then its rules are known.
  bool entra() const {
    return azure() && (ShapeOf(settings.authorization_endpoint).version > 0 ||
                       ShapeOf(settings.token_endpoint).version > 0);
  }
  // The settings key with the provider's prefix, and where it is.
  std::string Key(const std::string& name) const {
    return (azure() ? "azure_" : "websphere_") + name;
  }
  // False if there is a finding about the URL already.
  bool IsWorthRequest(const std::string& url) const {
    return !url.empty() && bad_urls.count(url) == 0;
  }
  Place At(const std::string& name) const { return {settings_file, Key(name)}; }

  // The URL that the discovery document has in place of a configured one; empty: none or the same.
  std::string Documented(const std::string& name, const std::string& configured) const;
  // What to do about a URL of an endpoint that leads nowhere: the action of a finding.
  std::string Fix(const std::string& name, const std::string& configured) const;

  struct ServerTime {
    std::string server;
    time_t theirs;
    time_t ours;
  };
  std::vector<ServerTime> server_times;
};

// identity.cpp: who the login program is, and that the guard can raise its ids.
void FindCaller(Checkup& checkup);
void CheckIdentity(Checkup& checkup);

// program.cpp: the login program, which is run with a request that changes nothing. False if it
// does not get root.
bool CheckProgram(Checkup& checkup, Caller caller);

// login.cpp: what the reference login program keeps beside the library: its settings and its
// store; and its deadline, once the provider has answered.
void CheckLoginSettings(Checkup& checkup);
void CheckStore(Checkup& checkup);
void CheckDeadline(Checkup& checkup);

// files.cpp: the three files and their keys.
void CheckFiles(Checkup& checkup);

// settings.cpp: the values of the chosen provider's settings.
void CheckSettings(Checkup& checkup);

// consistency.cpp: that the URLs are those of the endpoints, of one tenant and of one version.
void CheckConsistency(Checkup& checkup);

// endpoints.cpp: discovery document, authorization and token endpoint, and key set.
void CheckEndpoints(Checkup& checkup);

// authorization.cpp: what a browser gets at the authorization endpoint.
void CheckAuthorization(Checkup& checkup);

// redirect.cpp: that the browser comes back to the login program.
void CheckRedirect(Checkup& checkup);

// clock.cpp: this device's clock against the servers'.
void CheckClock(Checkup& checkup);

// name.cpp: the directory service, and the conversion of one user name.
void CheckName(Checkup& checkup);
// True, and in the report, if the name is that of a guest in a tenant of Entra ID.
bool AddIfGuest(Checkup& checkup, const std::string& name, const Place& place,
                const std::vector<Said>& said);

// token.cpp: a token from standard input, check by check.
void CheckToken(Checkup& checkup);

}  // namespace doctor
