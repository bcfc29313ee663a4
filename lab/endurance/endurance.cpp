// Many whole logins against a provider on loopback, and what they leave behind in the process.
//
//   endurance azure|websphere LOGINS [tls] [name]    in one process
//   endurance azure|websphere LOGINS processes       each in its own process
//   endurance azure|websphere LOGINS DEFECT          must fail: shows that the check sees it
//   endurance azure|websphere LOGINS processes DEFECT
// DEFECT is what each login leaves behind: leak, open, thread, child; or lose, for valgrind.
//
// The client runs as a login program does: as a user, with root as the saved identity. Another
// process measures it from outside. With "name" the provider is known by a host name that libcurl
// looks up, otherwise by its address. Prints what it measured; exit status 1 if anything grew, was
// left over, or went wrong. Needs a sandbox (scripts/check endurance).
#include <dirent.h>
#include <dlfcn.h>
#include <grp.h>
#include <pthread.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <iostream>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "sso/azuresso.h"
#include "sso/sso.h"
#include "sso/webspheresso.h"
#include "support/ca.h"
#include "support/device.h"
#include "support/server.h"
#include "support/tokens.h"

namespace {

constexpr char kClientID[] = "device-17";
constexpr char kSecret[] = "the secret of device-17";
constexpr char kHost[] = "provider.example";
constexpr unsigned kLongestRun = 24 * 3600;  // seconds
constexpr long kSilenceSeconds = 20;
constexpr int kSamples = 40;
constexpr long kWarmUpSamples = 10;
// What the allocator may still move between two looks; a leak of a byte in each login is more.
constexpr long kToleratedGrowthKb = 64;
// What one process may need more than another, as the addresses fall differently into pages.
constexpr long kToleratedSpreadKb = 512;

std::atomic<long> threadsStarted{0};

void require(bool good, const std::string& what) {
  if (!good) throw std::runtime_error(what);
}

// The provider: fixed answers by path, one connection at a time, in its own process.
class Provider {
 public:
  Provider(bool tls, const test::Ca& authority) {
    if (tls) context = test::serverContext(authority.issue({kHost, "localhost"}));
  }

  std::string url(const std::string& host, const std::string& path) const {
    return std::string(context == nullptr ? "http://" : "https://") + host + ":" +
           std::to_string(server.port()) + path;
  }

  void start(const std::vector<std::pair<std::string, std::string>>& script) {
    for (const auto& [path, body] : script) {
      answers.emplace_back(" " + path + " ", "HTTP/1.1 200 OK\r\nContent-Length: " +
                                                 std::to_string(body.size()) + "\r\n\r\n" + body);
    }
    const auto serveAll = [this](int listener) {
      for (;;) serve(accept(listener, nullptr, nullptr));
    };
    server.start(serveAll, kLongestRun);
  }
  void stop() { server.stop(); }

 private:
  // Answers, and waits for the other side to close.
  void serve(int accepted) const {
    test::Connection connection(accepted, kSilenceSeconds);
    if (context != nullptr && !connection.shakeHands(context.get())) return;
    const std::string request = connection.receiveRequest();
    if (request.empty() || !connection.send(answerTo(request))) return;
    for (std::string rest; connection.receive(&rest);) {
    }
  }

  const std::string& answerTo(const std::string& request) const {
    static const std::string none = "HTTP/1.1 404 Not Found\r\nContent-Length: 0\r\n\r\n";
    for (const auto& [path, text] : answers) {
      if (request.compare(request.find(' '), path.size(), path) == 0) return text;
    }
    return none;
  }

  test::Server server;
  std::shared_ptr<SSL_CTX> context;
  std::vector<std::pair<std::string, std::string>> answers;
};

// The device's files, and the answers that make a login of this client succeed.
std::vector<std::pair<std::string, std::string>> setUp(const std::string& client,
                                                       const Provider& provider,
                                                       const std::string& host) {
  const std::string exp = R"("exp":4102444800,"aud":")" + std::string(kClientID) + "\"";
  const std::string common =
      "\"" + client + "_client_id\":\"" + kClientID + "\",\"" + client + "_client_secret\":\"" +
      kSecret + "\",\"" + client + "_redirect_uri\":\"https://device.example/login\",\"" + client +
      "_authorization_endpoint\":\"" + provider.url(host, "/authorize") + "\",\"" + client +
      "_token_endpoint\":\"" + provider.url(host, "/token") + "\"";
  test::writeConfig("profile.conf", R"({"sso_enable":true,"sso_profile":")" + client + "\"}", 0644);
  if (client == "websphere") {
    test::writeConfig("websphere.conf", "{" + common + "}");
    const std::string token =
        test::hmacToken(kSecret, R"({"alg":"HS256"})", "{\"sub\":\"alice\"," + exp + "}");
    return {{"/token", R"({"id_token":")" + token + "\"}"}};
  }
  test::writeConfig("azure.conf",
                    "{" + common + R"(,"azure_sso_enable":true,"azure_tenant_id":"t",)" +
                        "\"azure_logout_endpoint\":\"" + provider.url(host, "/logout") +
                        "\",\"azure_wellknown\":\"" + provider.url(host, "/discovery") + "\"}");
  const test::RsaKey& key = test::anyRsaKey();
  const std::string token =
      test::rsaToken(key, R"({"alg":"RS256","kid":"key-1"})",
                     R"({"unique_name":"alice@corp.example","tid":"t",)" + exp + "}");
  return {{"/token", R"({"id_token":")" + token + "\"}"},
          {"/discovery", R"({"jwks_uri":")" + provider.url(host, "/keys") + "\"}"},
          {"/keys", R"({"keys":[)" + key.jwk("key-1") + "]}"}};
}

// All that a login program asks of the library for one user, from the redirect to the logout.
template <typename Client>
void loginWith(const std::string& expected) {
  Json::Value parameters;
  parameters["origin"] = "https://device.example/desktop";
  const std::string url = Client().GetAccessTokenReqURI(parameters);
  std::string state = url.substr(url.find("&state=") + 7);
  for (std::size_t at; (at = state.find("%3D")) != std::string::npos;) state.replace(at, 3, "=");
  for (std::size_t at; (at = state.find("%2B")) != std::string::npos;) state.replace(at, 3, "+");
  for (std::size_t at; (at = state.find("%2F")) != std::string::npos;) state.replace(at, 3, "/");

  std::string user;
  QOVA::SSO::OIDCLogin("the code", user);
  require(user == expected, "another user: " + user);
  require(QOVA::SSO::GetSSORelayURL(true, state, "") ==
              "ssoclient/relay.html#origin=https%3A%2F%2Fdevice.example%2Fdesktop&success=true",
          "another relay URL");
  require(!QOVA::SSO::GetSSORelayURL(false, state, "why").empty(), "no relay URL");
  (void)QOVA::SSO::GetAzureSSOLogoutURL("https://device.example/index.cgi");
}

void login(const std::string& client) {
  if (client == "azure") {
    loginWith<QOVA::SSO::AzureSSOClient>("CORP.EXAMPLE\\alice");
  } else {
    loginWith<QOVA::SSO::WebSphereSSOClient>("alice");
  }
}

// As the login program runs: a user's effective ids, root's saved.
void becomeLoginProgram() {
  require(
      setgroups(0, nullptr) == 0 && setresgid(1000, 1000, 0) == 0 && setresuid(1000, 1000, 0) == 0,
      "cannot change ids");
}

int entries(const std::string& folder) {
  int count = 0;
  DIR* const open = opendir(folder.c_str());
  require(open != nullptr, "cannot look into " + folder);
  while (const dirent* entry = readdir(open)) count += entry->d_name[0] != '.';
  closedir(open);
  return count;
}

// What the client process holds, seen from outside.
struct Sample {
  long logins;
  long rssKb;
  int descriptors;
  int tasks;
  int children;
  long threads;
};

Sample look(pid_t client, long logins, long threads) {
  const std::string folder = "/proc/" + std::to_string(client) + "/";
  Sample sample{logins, 0, entries(folder + "fd"), entries(folder + "task"), 0, threads};
  std::ifstream status(folder + "status");
  for (std::string line; std::getline(status, line);) {
    if (line.rfind("VmRSS:", 0) == 0) sample.rssKb = std::stol(line.substr(6));
  }
  std::ifstream children(folder + "task/" + std::to_string(client) + "/children");
  require(children.is_open(), "the kernel does not list the children of a process");
  for (pid_t child; children >> child;) ++sample.children;
  return sample;
}

long median(std::vector<Sample>::const_iterator begin, std::vector<Sample>::const_iterator end) {
  std::vector<long> values;
  for (; begin != end; ++begin) values.push_back(begin->rssKb);
  std::sort(values.begin(), values.end());
  return values[values.size() / 2];
}

// The windows after the warm-up: none may hold more than the first. Threads: as many as libcurl
// starts to look up the host's name, once for each request.
bool isFlat(const std::vector<Sample>& samples, long lookups) {
  const auto late = samples.begin() + kWarmUpSamples;
  const auto half = late + (samples.end() - late) / 2;
  const long before = median(late, half);
  const long after = median(half, samples.end());
  bool good = after - before <= kToleratedGrowthKb;
  std::printf("  memory: %ld KB in the earlier window, %ld KB in the later\n", before, after);
  for (const Sample& sample : samples) {
    good = good && sample.descriptors == samples.front().descriptors && sample.tasks == 1 &&
           sample.children == 0 && sample.threads == sample.logins * lookups;
  }
  std::printf(
      "  descriptors: %d; threads in the process: %d; started so far: %ld%s; children: %d\n",
      samples.back().descriptors, samples.back().tasks, samples.back().threads,
      lookups > 0 ? " (libcurl's look-ups of the name)" : "", samples.back().children);
  return good;
}

// What a login must not leave behind.
void leave(const std::string& defect) {
  static std::vector<std::unique_ptr<std::string>> leaked;
  if (defect == "leak") leaked.push_back(std::make_unique<std::string>(512, 'x'));
  if (defect == "lose") new std::string(512, 'x');
  if (defect == "open") require(dup(0) >= 0, "dup");
  if (defect == "child" && fork() == 0) _exit(0);
  pthread_t thread{};
  const auto nothing = [](void*) -> void* { return nullptr; };
  if (defect == "thread") pthread_create(&thread, nullptr, nothing, nullptr);
}

struct Report {
  long logins;
  long threads;
};

// The client's side: logs in, reports, and waits to be looked at.
[[noreturn]] void logInAndReport(const std::string& client, long logins, const std::string& defect,
                                 int out, int in) {
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  int status = 0;
  try {
    becomeLoginProgram();
    for (long done = 1; done <= logins; ++done) {
      login(client);
      leave(defect);
      if (done % (logins / kSamples) != 0) continue;
      const Report report{done, threadsStarted};
      char seen = 0;
      require(write(out, &report, sizeof report) == sizeof report && read(in, &seen, 1) == 1,
              "the other side is gone");
    }
  } catch (const std::exception& e) {
    std::fprintf(stderr, "endurance: %s\n", e.what());
    status = 1;
  }
  _exit(status);
}

bool inOneProcess(const std::string& client, long logins, const std::string& defect, long lookups) {
  int reports[2];
  int answers[2];
  require(pipe(reports) == 0 && pipe(answers) == 0, "no pipe");
  std::fflush(stdout);
  const pid_t child = fork();
  if (child == 0) logInAndReport(client, logins, defect, reports[1], answers[0]);
  close(reports[1]);
  close(answers[0]);

  std::vector<Sample> samples;
  for (Report report{}; read(reports[0], &report, sizeof report) == sizeof report;) {
    samples.push_back(look(child, report.logins, report.threads));
    require(write(answers[1], "", 1) == 1, "the client is gone");
  }
  int status = 0;
  require(waitpid(child, &status, 0) == child, "no client");
  if (status != 0 || samples.size() != kSamples) {
    std::printf("  ended with status %d after %zu of %d looks\n", status, samples.size(), kSamples);
    return false;
  }
  return isFlat(samples, lookups);
}

// Each login in its own process, four at a time.
bool inManyProcesses(const std::string& client, long logins, const std::string& defect) {
  std::vector<long> sizes;
  long failed = 0;
  long running = 0;
  for (long started = 0; started < logins || running > 0;) {
    if (started < logins && running < 4) {
      ++started;
      ++running;
      if (fork() != 0) continue;
      int status = 0;
      try {
        becomeLoginProgram();
        const int before = entries("/proc/self/fd");
        login(client);
        leave(defect);
        require(threadsStarted == 0, "a thread was started");
        require(entries("/proc/self/fd") == before, "a descriptor is left");
      } catch (const std::exception& e) {
        std::fprintf(stderr, "endurance: %s\n", e.what());
        status = 1;
      }
      _exit(status);
    }
    rusage usage{};
    int status = 0;
    if (wait4(-1, &status, 0, &usage) <= 0) break;
    --running;
    failed += status != 0;
    sizes.push_back(usage.ru_maxrss);
  }
  const auto [least, most] = std::minmax_element(sizes.begin(), sizes.end());
  std::printf("  %zu processes, %ld failed; %ld to %ld KB each\n", sizes.size(), failed, *least,
              *most);
  return failed == 0 && static_cast<long>(sizes.size()) == logins &&
         *most - *least <= kToleratedSpreadKb;
}

int run(const std::vector<std::string>& arguments) {
  const auto has = [&](const char* word) {
    return std::find(arguments.begin(), arguments.end(), word) != arguments.end();
  };
  require(arguments.size() >= 2 && (has("azure") || has("websphere")),
          "usage: endurance azure|websphere LOGINS [tls] [name] | [processes] [DEFECT]");
  const std::string& client = arguments[0];
  const long logins = std::stol(arguments[1]);
  require(has("processes") || logins >= kSamples, "too few logins to measure");
  test::requireSandbox();

  const test::Ca authority;
  if (has("tls")) authority.trust();
  if (has("name")) test::resolveToLoopback(kHost);
  Provider provider(has("tls"), authority);
  const std::string host = has("name") ? kHost : has("tls") ? "localhost" : "127.0.0.1";
  provider.start(setUp(client, provider, host));
  std::printf("%s, %ld logins%s\n", client.c_str(), logins,
              has("processes") ? " in processes" : "");
  std::string defect;
  for (const char* const word : {"leak", "lose", "open", "thread", "child"}) {
    if (has(word)) defect = word;
  }
  const long requests = client == "azure" ? 3 : 1;
  const long lookups = has("name") ? requests : 0;
  const bool good = has("processes") ? inManyProcesses(client, logins, defect)
                                     : inOneProcess(client, logins, defect, lookups);
  provider.stop();
  require(waitpid(-1, nullptr, WNOHANG) == -1, "a process was left behind");
  return good ? 0 : 1;
}

}  // namespace

// Counts the threads that anyone in this process starts.
extern "C" int pthread_create(pthread_t* thread, const pthread_attr_t* attributes,
                              void* (*start)(void*), void* argument) {
  using Create = int(pthread_t*, const pthread_attr_t*, void* (*)(void*), void*);
  static auto* const next = reinterpret_cast<Create*>(dlsym(RTLD_NEXT, "pthread_create"));
  ++threadsStarted;
  return next(thread, attributes, start, argument);
}

int main(int argc, char** argv) {
  try {
    return run({argv + 1, argv + argc});
  } catch (const std::exception& e) {
    std::fprintf(stderr, "endurance: %s\n", e.what());
    return 1;
  }
}
