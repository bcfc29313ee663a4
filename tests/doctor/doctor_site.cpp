#include "doctor_site.h"

#include <cxxabi.h>
#include <fcntl.h>
#include <grp.h>
#include <json/reader.h>
#include <json/writer.h>
#include <pty.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <stdexcept>
#include <typeinfo>

#include "sso/profile.h"
#include "sso/sso.h"
#include "support/log.h"
#include "support/memory_file.h"
#include "support/tokens.h"

namespace test {
namespace {

namespace fs = std::filesystem;

constexpr unsigned kLongestRun = 60;  // seconds

void require(bool good, const char* what) {
  if (!good) throw std::runtime_error(std::string("doctor's test: ") + what);
}

Json::Value parsed(const std::string& text) {
  Json::Value value;
  std::string errors;
  const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
  require(reader->parse(text.data(), text.data() + text.size(), &value, &errors), "not JSON");
  return value;
}

std::string httpDate(long long skew) {
  const time_t now = time(nullptr) + static_cast<time_t>(skew);
  struct tm fields = {};
  char text[64];
  gmtime_r(&now, &fields);
  std::strftime(text, sizeof text, "Date: %a, %d %b %Y %H:%M:%S GMT", &fields);
  return text;
}

// Installs the tool and a library where any user can start it.
void install(const std::string& library) {
  requireSandbox();
  fs::create_directories("/usr/qova/bin");
  fs::create_directories("/usr/qova/lib");
  const auto over = fs::copy_options::overwrite_existing;
  fs::copy_file(DOCTOR, "/usr/qova/bin/ssoclient-doctor", over);
  fs::copy_file(library, "/usr/qova/lib/libssoclient.so.1", over);
}

[[noreturn]] void execDoctor(const Site& site, const std::vector<std::string>& arguments) {
  for (const auto& [name, value] : site.environment) setenv(name.c_str(), value.c_str(), 1);
  setenv("LD_LIBRARY_PATH", "/usr/qova/lib", 1);
  std::vector<char*> words;
  for (const std::string& argument : arguments)
    words.push_back(const_cast<char*>(argument.c_str()));
  words.push_back(nullptr);
  const Ids& ids = site.user;
  if (ids.saved != 0 && setgroups(0, nullptr) != 0) _exit(126);
  if (setresgid(ids.real, ids.effective, ids.saved) != 0) _exit(126);
  if (setresuid(ids.real, ids.effective, ids.saved) != 0) _exit(126);
  if (site.openFiles > 0) {
    const struct rlimit limit = {site.openFiles, site.openFiles};
    if (close_range(3, ~0U, 0) != 0 || setrlimit(RLIMIT_NOFILE, &limit) != 0) _exit(126);
  }
  alarm(kLongestRun);
  execv("/usr/qova/bin/ssoclient-doctor", words.data());
  _exit(127);
}

}  // namespace

std::string compact(const Json::Value& value) {
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "";
  return Json::writeString(builder, value);
}

Site::Site(bool forAzure) : azure(forAzure) {
  const std::string prefix = azure ? "azure_" : "websphere_";
  const std::string base = kProvider;
  profile["sso_enable"] = true;
  profile["sso_profile"] = azure ? "azure" : "websphere";
  if (azure) settings["azure_sso_enable"] = true;
  if (azure) settings["azure_tenant_id"] = kTenant;
  settings[prefix + "client_id"] = kClient;
  settings[prefix + "client_secret"] = kSecret;
  settings[prefix + "wellknown"] = base + "/.well-known/openid-configuration";
  settings[prefix + "authorization_endpoint"] = base + "/authorize";
  settings[prefix + "token_endpoint"] = base + "/token";
  settings[prefix + "logout_endpoint"] = base + "/logout";
  settings[prefix + "redirect_uri"] = "https://device.example.net/webman/login.cgi";

  discovery["issuer"] = base + (azure ? "/" + std::string(kTenant) + "/v2.0" : "");
  discovery["jwks_uri"] = base + "/keys";
  discovery["authorization_endpoint"] = base + "/authorize";
  discovery["token_endpoint"] = base + "/token";
  discovery["end_session_endpoint"] = base + "/logout";
  discovery["id_token_signing_alg_values_supported"].append(azure ? "RS256" : "HS256");
  if (azure) keys["keys"].append(parsed(anyRsaKey().jwk("key-1")));

  header["alg"] = azure ? "RS256" : "HS256";
  if (azure) header["kid"] = "key-1";
  claims["iss"] = discovery["issuer"];
  claims["aud"] = kClient;
  claims["exp"] = static_cast<Json::Int64>(time(nullptr) + 600);
  if (azure) claims["tid"] = kTenant;
  if (azure) claims["email"] = "alice@ad.werk.example.net";
  claims["sub"] = "alice";

  loginProgram = failed(302, "login program");
  loginProgram.headers = {"Location: /webman/ssoclient/relay.html#success=false"};
}

std::string Site::resolved(std::string text) const {
  for (std::size_t at; (at = text.find(kProvider)) != std::string::npos;) {
    text.replace(at, sizeof kProvider - 1, address);
  }
  return text;
}

Answer Site::json(const Json::Value& value) const {
  return ok(resolved(compact(value)));
}

std::string Site::idToken() const {
  if (token) return *token;
  const std::string secret = azure ? "" : settings["websphere_client_secret"].asString();
  const std::string head = compact(header);
  const std::string body = resolved(compact(claims));
  return azure ? rsaToken(anyRsaKey(), head, body) : hmacToken(secret, head, body);
}

void Site::writeFiles() {
  const std::string own = azure ? "azure.conf" : "websphere.conf";
  if (!profileMissing) {
    writeConfig("profile.conf", profileText.value_or(compact(profile)), profileMode, 0,
                profileGroup);
  }
  if (!settingsMissing) {
    writeConfig(own, resolved(settingsText.value_or(compact(settings))), settingsMode,
                settingsOwner);
  }
}

void Site::deploy(bool forLogin) {
  if (trusted && !trustedNow) ca.trust();
  trustedNow = true;
  server.reset();
  Answer page = ok("<!DOCTYPE html><title>Sign in</title><form><input type=password></form>");
  page.headers = {"Content-Type: text/html; charset=utf-8"};
  server = tls ? std::make_unique<Provider>(identity.value_or(ca.issue({"localhost"})))
               : std::make_unique<Provider>();
  address = server->url("", host);
  Json::Value given(Json::objectValue);
  given["id_token"] = idToken();
  std::map<std::string, Answer> script = {
      {"/.well-known/openid-configuration", json(discovery)},
      {"/keys", json(keys)},
      {"/authorize", page},
      {"/token", forLogin ? json(given) : failed(400, R"({"error":"invalid_request"})")}};
  for (const auto& [path, answer] : answers) script[path] = answer;
  if (!forLogin) {
    for (const auto& [path, answer] : probeAnswers) script[path] = answer;
  }
  for (auto& [path, answer] : script) {
    answer.headers.push_back(httpDate(clockSkew));
    server->answer(path, answer);
  }
  if (secretAnswer && !forLogin) server->answer("/token", *secretAnswer);
  server->start();
  startDevice();
  writeFiles();
}

void Site::deployAt(const std::string& url) {
  if (trusted && !trustedNow) ca.trust();
  trustedNow = true;
  address = url;
  startDevice();
  writeFiles();
}

// Its certificate is of an authority that the device need not know.
void Site::startDevice() {
  if (device != nullptr || deviceNames.empty()) return;
  resolveToLoopback("device.example.net");
  device = std::make_unique<Provider>(Ca().issue(deviceNames), 443);
  device->answer("/webman/login.cgi", loginProgram);
  device->start();
}

std::vector<Json::Value> Outcome::findings(const std::string& id) const {
  std::vector<Json::Value> found;
  for (const Json::Value& finding : document["findings"]) {
    if (finding["id"].asString() == id) found.push_back(finding);
  }
  return found;
}

// The output of the tool on a terminal, both streams together.
class Terminal {
 public:
  explicit Terminal(unsigned short columns) {
    struct winsize size = {};
    size.ws_col = columns;
    size.ws_row = 24;
    require(openpty(&master, &slave, nullptr, nullptr, &size) == 0, "openpty");
  }
  ~Terminal() {
    close(master);
    if (slave >= 0) close(slave);
  }
  Terminal(const Terminal&) = delete;
  Terminal& operator=(const Terminal&) = delete;

  int end() const { return slave; }

  std::string contents() {
    close(slave);
    slave = -1;
    std::string text;
    char chunk[4096];
    // Ends with EIO when the tool has ended.
    for (ssize_t count; (count = read(master, chunk, sizeof chunk)) > 0;) {
      text.append(chunk, static_cast<size_t>(count));
    }
    text.erase(std::remove(text.begin(), text.end(), '\r'), text.end());
    return text;
  }

 private:
  int master = -1;
  int slave = -1;
};

Outcome runDoctor(const Site& site, bool text) {
  install(site.withDirectory ? DIRECTORY_LIBRARY : STAGED_LIBRARY);
  std::vector<std::string> arguments = {"ssoclient-doctor"};
  if (!text) arguments.push_back("--json");
  if (site.passToken) arguments.push_back("--token");
  arguments.insert(arguments.end(), site.arguments.begin(), site.arguments.end());
  const MemoryFile in;
  const MemoryFile out;
  const MemoryFile err;
  if (site.passToken) in.put(site.idToken() + "\n");
  lseek(in.descriptor(), 0, SEEK_SET);  // for the tool to read from the start
  std::optional<Terminal> terminal;
  if (site.columns > 0) terminal.emplace(site.columns);
  const pid_t child = fork();
  require(child >= 0, "fork");
  if (child == 0) {
    dup2(in.descriptor(), STDIN_FILENO);
    dup2(terminal ? terminal->end() : out.descriptor(), STDOUT_FILENO);
    dup2(terminal ? terminal->end() : err.descriptor(), STDERR_FILENO);
    execDoctor(site, arguments);
  }
  Outcome run;
  const std::string shown = terminal ? terminal->contents() : "";
  int status = 0;
  while (waitpid(child, &status, 0) < 0 && errno == EINTR) {
  }
  run.status = WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
  run.out = terminal ? shown : out.contents();
  run.err = err.contents();
  const bool json = !text && !run.out.empty() && run.out[0] == '{';
  if (json) run.document = parsed(run.out);
  return run;
}

Login logIn(Ids ids, const std::string& code) {
  const std::string answer = asProcess(ids, ids, [&code] {
    const Log log;
    Json::Value result(Json::objectValue);
    std::string user;
    try {
      QOVA::SSO::SSOProfile profile;
      QOVA::SSO::OIDCLogin(code, user);
    } catch (const std::exception& e) {
      int status = 0;
      char* const name = abi::__cxa_demangle(typeid(e).name(), nullptr, nullptr, &status);
      result["type"] = name != nullptr ? name : typeid(e).name();
      std::free(name);
      result["thrown"] = e.what();
    }
    result["user"] = user;
    for (const LogLine& line : log.lines()) {
      result["logs"].append(line.text.substr(line.text.find(' ') + 1));
    }
    return compact(result);
  });
  const Json::Value result = parsed(answer);
  Login login{
      result["user"].asString(), result["thrown"].asString(), result["type"].asString(), {}};
  for (const Json::Value& line : result["logs"]) login.logs.push_back(line.asString());
  return login;
}

}  // namespace test
