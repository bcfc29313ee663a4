#include "twin_site.h"

#include <curl/curl.h>
#include <fcntl.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <fstream>
#include <memory>
#include <regex>
#include <stdexcept>

#include "sso/azuresso.h"
#include "sso/webspheresso.h"

namespace test {
namespace {

constexpr char kPassword[] = "of-the-user";

// The browser: it follows redirects, keeps cookies and trusts everything.
class Browser {
 public:
  Browser() : handle(curl_easy_init(), curl_easy_cleanup) {
    curl_easy_setopt(handle.get(), CURLOPT_COOKIEFILE, "");
    curl_easy_setopt(handle.get(), CURLOPT_SSL_VERIFYPEER, 0L);
    curl_easy_setopt(handle.get(), CURLOPT_SSL_VERIFYHOST, 0L);
    curl_easy_setopt(handle.get(), CURLOPT_TIMEOUT, 20L);
    curl_easy_setopt(handle.get(), CURLOPT_WRITEFUNCTION, keep);
    curl_easy_setopt(handle.get(), CURLOPT_WRITEDATA, &page);
  }

  // Goes to `next` and follows redirects, up to one that leads to `end`.
  void go(std::string next, const std::string& end, const std::string* form = nullptr) {
    for (int i = 0; i < 10 && !next.empty(); ++i) {
      url = next;
      page.clear();
      if (next.compare(0, end.size(), end) == 0) return;
      curl_easy_setopt(handle.get(), CURLOPT_URL, next.c_str());
      if (form != nullptr) curl_easy_setopt(handle.get(), CURLOPT_COPYPOSTFIELDS, form->c_str());
      if (form == nullptr) curl_easy_setopt(handle.get(), CURLOPT_HTTPGET, 1L);
      form = nullptr;
      if (curl_easy_perform(handle.get()) != CURLE_OK) return;
      char* there = nullptr;
      curl_easy_getinfo(handle.get(), CURLINFO_REDIRECT_URL, &there);
      next = there != nullptr ? there : "";
    }
  }

  std::string url;
  std::string page;

 private:
  static size_t keep(char* data, size_t size, size_t count, void* user) {
    static_cast<std::string*>(user)->append(data, size * count);
    return size * count;
  }

  const std::unique_ptr<CURL, decltype(&curl_easy_cleanup)> handle;
};

std::string group(const std::string& text, const std::string& pattern) {
  std::smatch match;
  return std::regex_search(text, match, std::regex(pattern)) ? match[1].str() : "";
}

std::string plain(std::string text) {
  for (std::size_t at; (at = text.find("&amp;")) != std::string::npos;) text.replace(at, 5, "&");
  return text;
}

}  // namespace

TwinSite::TwinSite(Twin which) : Site(which != Twin::kLiberty), kind(which) {
  settings = Json::Value(Json::objectValue);
  const std::string prefix = azure ? "azure_" : "websphere_";
  const std::string redirect = "https://device.example.net/webman/login.cgi";
  const std::string base =
      kProvider + (azure ? "/" + std::string(kTwinTenant) : "/oidc/endpoint/OP");
  const std::string path = kind == Twin::kEntra1   ? "/oauth2"
                           : kind == Twin::kEntra2 ? "/oauth2/v2.0"
                                                   : "";
  if (azure) settings["azure_sso_enable"] = true;
  if (azure) settings["azure_tenant_id"] = kTwinTenant;
  settings[prefix + "client_id"] = azure ? kTwinClient : "device";
  settings[prefix + "client_secret"] = kTwinSecret;
  settings[prefix + "redirect_uri"] = redirect;
  settings[prefix + "authorization_endpoint"] = base + path + "/authorize";
  settings[prefix + "token_endpoint"] = base + path + "/token";
  settings[prefix + "logout_endpoint"] = base + path + (azure ? "/logout" : "/end_session");
  settings[prefix + "wellknown"] =
      base + (kind == Twin::kEntra2 ? "/v2.0" : "") + "/.well-known/openid-configuration";

  twin["client_secret"] = kTwinSecret;
  twin["redirect_uris"].append(redirect);
  twin["password"] = kPassword;
  if (azure) twin["email_claim"] = true;
  if (azure) twin["keys"] = 1;  // more take longer to make
  withDirectory = false;
}

TwinSite::~TwinSite() {
  if (process <= 0) return;
  kill(process, SIGTERM);
  waitpid(process, nullptr, 0);
}

void TwinSite::replace(const char* key, const std::string& from, const std::string& to) {
  std::string value = settings[key].asString();
  const std::size_t at = value.find(from);
  if (at == std::string::npos) throw std::runtime_error("nothing to replace in " + value);
  settings[key] = value.replace(at, from.size(), to);
}

void TwinSite::deploy() {
  const Identity own = authority().issue({"localhost"});
  std::ofstream("/usr/qova/twin.pem") << own.certificate;
  std::ofstream("/usr/qova/twin.key") << own.key;
  int ends[2];
  if (pipe(ends) != 0) throw std::runtime_error("pipe");
  process = fork();
  if (process == 0) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    dup2(ends[1], STDOUT_FILENO);
    const std::string program =
        std::string(PROVIDERS) + (kind == Twin::kLiberty ? "/liberty.py" : "/entra.py");
    execlp("python3", "python3", "-B", program.c_str(), "--certificate", "/usr/qova/twin.pem",
           "--key", "/usr/qova/twin.key", "--settings", compact(twin).c_str(), nullptr);
    _exit(127);
  }
  close(ends[1]);
  std::string url;
  for (char c; read(ends[0], &c, 1) == 1 && c != '\n';) url += c;
  close(ends[0]);
  if (url.empty()) throw std::runtime_error("the twin did not start");
  deployAt(url);
}

std::string TwinSite::signIn() {
  const Json::Value state(Json::objectValue);
  const std::string start = azure ? QOVA::SSO::AzureSSOClient().GetAccessTokenReqURI(state)
                                  : QOVA::SSO::WebSphereSSOClient().GetAccessTokenReqURI(state);
  const std::string redirect =
      settings[azure ? "azure_redirect_uri" : "websphere_redirect_uri"].asString();
  const std::string origin = group(start, "^(https?://[^/]+)");
  Browser browser;
  browser.go(start, redirect);
  const std::string action = plain(group(browser.page, "action=\"([^\"]*)\""));
  if (!action.empty()) {
    const std::string form = azure
                                 ? "loginfmt=alice@ad.example.net&passwd=" + std::string(kPassword)
                                 : "j_username=alice&j_password=" + std::string(kPassword);
    browser.go(origin + action, redirect, &form);
  }
  const std::string code = group(browser.url, "[?&]code=([^&]+)");
  if (code.empty()) return "no code: " + browser.url + " " + browser.page;
  if (loginProgram.body.find("login program") == std::string::npos) return "no login program";
  const Login login = logIn({0, 0, 0}, code);
  return login.thrown.empty() && !login.user.empty() ? "" : "OIDCLogin: " + login.thrown;
}

}  // namespace test
