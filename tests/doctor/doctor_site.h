// A device and its provider, all in order, which a test then spoils; and the doctor that looks
// at it, as installed, in its own process.
#pragma once

#include <json/value.h>

#include <map>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "support/ca.h"
#include "support/device.h"
#include "support/provider.h"

namespace test {

// What stands for the provider's address until it is known.
constexpr char kProvider[] = "https://PROVIDER";

constexpr char kTenant[] = "0d3f6b1c-6f0a-4d7e-9b1e-5a2c7d8e9f00";
constexpr char kClient[] = "7c1b2a3d-4e5f-4a6b-8c7d-9e0f1a2b3c4d";
constexpr char kSecret[] = "kept between provider and device +/=";

class Site {
 public:
  explicit Site(bool azure);

  bool azure;

  // Configuration: the members of the two files, or a text instead.
  Json::Value profile;
  Json::Value settings;
  std::optional<std::string> profileText;
  std::optional<std::string> settingsText;
  bool profileMissing = false;
  bool settingsMissing = false;
  mode_t profileMode = 0644;
  mode_t settingsMode = 0600;
  uid_t settingsOwner = 0;
  gid_t profileGroup = 0;

  // The provider. `answers` go for the paths of its documents; `probeAnswers` for the doctor alone,
  // and `secretAnswer` for its second request to the token endpoint, with the secret.
  Json::Value discovery;
  Json::Value keys;
  std::map<std::string, Answer> answers;
  std::map<std::string, Answer> probeAnswers;
  std::optional<Answer> secretAnswer;
  std::string host = "localhost";
  std::optional<Identity> identity;  // empty: one of the trusted authority
  bool tls = true;
  bool trusted = true;
  long long clockSkew = 0;  // of the provider's clock

  // The ID token.
  Json::Value header;
  Json::Value claims;
  std::optional<std::string> token;

  // The doctor.
  std::vector<std::string> arguments;
  bool passToken = false;  // on standard input
  std::map<std::string, std::string> environment;
  Ids user = {0, 0, 0};
  unsigned openFiles = 0;      // the limit; 0: as it is
  unsigned short columns = 0;  // of a terminal for its output; 0: none
  bool withDirectory = false;  // the library with the platform of support/platform_directory.c

  // The device's own web server, at the redirect URI.
  Answer loginProgram;
  std::vector<std::string> deviceNames = {"device.example.net"};  // of its certificate; none: down

  // Writes the files and starts the provider. For a login it gives out the token; for the doctor
  // it refuses the empty request.
  void deploy(bool forLogin);
  // The same with a provider that runs already, at this URL.
  void deployAt(const std::string& url);
  Provider& provider() { return *server; }
  const Ca& authority() const { return ca; }
  std::string idToken() const;

 private:
  std::string resolved(std::string text) const;
  Answer json(const Json::Value& value) const;
  void writeFiles();
  void startDevice();

  Ca ca;
  bool trustedNow = false;
  std::string address;  // what kProvider stands for
  std::unique_ptr<Provider> server;
  std::unique_ptr<Provider> device;
};

std::string compact(const Json::Value& value);

struct Outcome {
  int status = -1;
  std::string out;
  std::string err;
  Json::Value document;  // of --json

  // The findings with this id.
  std::vector<Json::Value> findings(const std::string& id) const;
};

// Runs the installed tool on the site, in JSON unless `text`.
Outcome runDoctor(const Site& site, bool text = false);

// What the library itself does on the site: OIDCLogin, and SSOProfile before it.
struct Login {
  std::string user;
  std::string thrown;             // what()
  std::string type;               // the exception's class
  std::vector<std::string> logs;  // without "unit:line "
};
Login logIn(Ids ids, const std::string& code = "code");

}  // namespace test
