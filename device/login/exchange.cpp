#include "exchange.h"

#include <poll.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <exception>
#include <stdexcept>

#include "reason.h"
#include "sso/azuresso.h"
#include "sso/profile.h"
#include "sso/sso.h"
#include "sso/utils.h"
#include "sso/webspheresso.h"
#include "state.h"

using namespace QOVA::SSO;

namespace {

constexpr char kUser = '+';
constexpr char kFailure = '-';
constexpr size_t kLongestAnswer = 4096;

// What OIDCLogin does, and the check of the nonce that it leaves to its caller: the ID token
// must be the answer to the very request whose state came back.
template <class Client>
std::string CheckedLogin(const std::string& code, const Json::Value& state) {
  Client client;
  std::string user;
  client.OpenIDConnectLogin(code, user);
  Json::Value claims;
  client.GetUserInfo(claims);
  const std::string digest = MD5Digest(Member(claims, "nonce"));
  if (digest.empty() || digest != Member(state, "nonce")) {
    throw std::runtime_error("nonce does not belong to this login");
  }
  return user;
}

std::string Login(const std::string& code, const Json::Value& state, const std::string& profile,
                  bool plain) {
  if (plain) {
    std::string user;
    OIDCLogin(code, user);
    return user;
  }
  if (profile == "azure") return CheckedLogin<AzureSSOClient>(code, state);
  if (profile == "websphere") return CheckedLogin<WebSphereSSOClient>(code, state);
  throw std::runtime_error("profile not support.");
}

// The child's work; its answer is a mark and a text.
std::string Answer(const std::string& code, const Json::Value& state, bool plain) {
  SSOProfile profile;
  try {
    if (!profile.SSOIsEnable()) throw std::runtime_error("sso does not enable.");
    return kUser + Login(code, state, profile.GetSSOProfile(), plain);
  } catch (const std::exception& error) {
    return kFailure + Redact(error.what(), {code, profile.GetSSOClient()->GetClientSecret()});
  }
}

void WriteAll(int fd, const std::string& text) {
  for (size_t done = 0; done < text.size();) {
    const ssize_t size = write(fd, text.data() + done, text.size() - done);
    if (size < 0 && errno == EINTR) continue;
    if (size <= 0) return;
    done += static_cast<size_t>(size);
  }
}

// Reads until the child closes its end; false at the deadline.
bool ReadAll(int fd, int seconds, std::string& out) {
  using Clock = std::chrono::steady_clock;
  const Clock::time_point end = Clock::now() + std::chrono::seconds(seconds);
  for (;;) {
    const auto left =
        std::chrono::duration_cast<std::chrono::milliseconds>(end - Clock::now()).count();
    if (left <= 0) return false;
    pollfd ready{fd, POLLIN, 0};
    if (poll(&ready, 1, static_cast<int>(left)) <= 0) continue;
    char buffer[kLongestAnswer];
    const ssize_t size = read(fd, buffer, sizeof buffer);
    if (size < 0 && errno == EINTR) continue;
    if (size <= 0) return true;
    out.append(buffer, static_cast<size_t>(size));
  }
}

[[noreturn]] void RunChild(int fd, const std::string& code, const Json::Value& state,
                           const Settings& settings) {
  // Should the web server end the parent, the child must not wait on for ever.
  alarm(static_cast<unsigned>(settings.deadline) * 2);
  WriteAll(fd, Answer(code, state, settings.plain).substr(0, kLongestAnswer));
  _exit(0);
}

}  // namespace

std::string Exchange(const std::string& code, const Json::Value& state, const Settings& settings) {
  int ends[2];
  if (pipe(ends) != 0) throw std::runtime_error("no pipe");
  const pid_t child = fork();
  if (child == 0) RunChild(ends[1], code, state, settings);
  close(ends[1]);
  std::string answer;
  const bool ended = child > 0 && ReadAll(ends[0], settings.deadline, answer);
  close(ends[0]);
  if (child < 0) throw std::runtime_error("no child process");
  if (!ended) kill(child, SIGKILL);
  while (waitpid(child, nullptr, 0) < 0 && errno == EINTR) {
  }
  if (!ended) throw std::runtime_error("provider did not answer in time");
  if (answer.empty()) throw std::runtime_error("sign-in process ended without an answer");
  if (answer[0] != kUser) throw std::runtime_error(answer.substr(1));
  return answer.substr(1);
}
