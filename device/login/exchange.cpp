#include "exchange.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <exception>

#include "failure.h"
#include "process.h"
#include "signin.h"
#include "utf8.h"

namespace {

// The child's answer is a few lines: "user", the name and the ID token, or the number of the
// failure's code, its text and what the provider says. It fits into one write to a pipe, so there
// is no half of it.
constexpr char kUser[] = "user";
constexpr size_t kLongestAnswer = 4096;
constexpr size_t kLongestLine = 1000;
constexpr size_t kLongestToken = 3500;

std::string Lines(const Failure& failure) {
  std::string lines = std::to_string(static_cast<int>(failure.code)) + "\n";
  for (const std::string& text :
       {std::string(failure.what()), failure.provider.error, failure.provider.description}) {
    lines += OneLine(text, kLongestLine) + "\n";
  }
  return lines;
}

// The child's work. The library's constructors are part of it, so they are in the try block too.
std::string Answer(const SignIn& work) {
  try {
    const SignedIn result = Run(work);
    const bool fits = result.token.size() <= kLongestToken && !HasControl(result.token);
    return std::string(kUser) + "\n" + result.user + "\n" + (fits ? result.token : "") + "\n";
  } catch (const Failure& failure) {
    return Lines(failure);
  } catch (const std::exception& error) {
    return Lines(Failure(FailureCode::kInternal, error.what()));
  }
}

[[noreturn]] void RunChild(int pipe, const SignIn& work) {
  process::Answered();  // the parent does that
  // The web server waits until nobody holds its pipe any more.
  const int null = open("/dev/null", O_RDWR | O_CLOEXEC);
  dup2(null, STDIN_FILENO);
  dup2(null, STDOUT_FILENO);
  process::Confine(work.parent, work.settings.deadline);
  const std::string answer = Answer(work);
  const bool written =
      write(pipe, answer.data(), answer.size()) == static_cast<ssize_t>(answer.size());
  _exit(written ? 0 : 1);
}

// Reads until the child closes its end; false at the deadline.
bool ReadAll(int fd, int seconds, std::string& out) {
  using Clock = std::chrono::steady_clock;
  const Clock::time_point end = Clock::now() + std::chrono::seconds(seconds);
  while (out.size() <= kLongestAnswer) {
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
  return true;
}

// The lines of an answer; without a line feed at its end, the last one is missing.
std::vector<std::string> Split(const std::string& answer) {
  std::vector<std::string> lines;
  size_t begin = 0;
  for (size_t end; (end = answer.find('\n', begin)) != std::string::npos; begin = end + 1) {
    lines.push_back(answer.substr(begin, end - begin));
  }
  return lines;
}

SignedIn ResultOf(const std::vector<std::string>& lines) {
  if (lines.size() == 3 && lines[0] == kUser) return {lines[1], lines[2]};
  if (lines.size() == 4) {
    const FailureCode code = static_cast<FailureCode>(std::stoi(lines[0]));
    throw Failure(code, lines[1], {lines[2], lines[3]});
  }
  throw Failure(FailureCode::kInternal, "sign-in process gave no answer");
}

// Why a child that was not ended here has no answer.
std::string Describe(int status) {
  if (!WIFSIGNALED(status)) return "sign-in process ended without an answer";
  return std::string("sign-in process ended by a signal: ") + strsignal(WTERMSIG(status));
}

}  // namespace

SignedIn Exchange(const std::string& code, const Json::Value& state, const std::string& profile,
                  const Settings& settings) {
  const SignIn work{code, state, profile, settings, getpid()};
  int ends[2];
  if (pipe2(ends, O_CLOEXEC) != 0) throw Failure(FailureCode::kInternal, "no pipe");
  const pid_t child = fork();
  if (child == 0) RunChild(ends[1], work);
  close(ends[1]);
  std::string answer;
  const bool ended = child > 0 && ReadAll(ends[0], settings.deadline, answer);
  close(ends[0]);
  if (child < 0) throw Failure(FailureCode::kInternal, "no child process");
  if (!ended) kill(child, SIGKILL);
  int status = 0;
  while (waitpid(child, &status, 0) < 0 && errno == EINTR) {
  }
  if (!ended) throw Failure(FailureCode::kTimeout, "provider did not answer in time");
  if (status != 0) throw Failure(FailureCode::kInternal, Describe(status));
  return ResultOf(Split(answer));
}
