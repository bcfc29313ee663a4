#include "doctor/ask.h"

#include <cxxabi.h>
#include <fcntl.h>
#include <grp.h>
#include <poll.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdlib>
#include <exception>
#include <memory>
#include <sstream>
#include <stdexcept>
#include <system_error>
#include <typeinfo>

#include "doctor/json.h"

namespace doctor {

namespace {

using Clock = std::chrono::steady_clock;

constexpr char kLogName[] = "ssoclient-doctor";
constexpr size_t kLongestReply = 4 << 20;

class Pipe {
 public:
  Pipe() {
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0)
      throw std::system_error(errno, std::generic_category(), "pipe");
    read_end = ends[0];
    write_end = ends[1];
  }
  ~Pipe() {
    close(read_end);
    CloseWriting();
  }
  Pipe(const Pipe&) = delete;
  Pipe& operator=(const Pipe&) = delete;

  void CloseWriting() {
    if (write_end >= 0) close(write_end);
    write_end = -1;
  }

  int read_end = -1;
  int write_end = -1;
};

std::string ClassName(const std::exception& e) {
  int status = 0;
  const std::unique_ptr<char, decltype(&std::free)> name(
      abi::__cxa_demangle(typeid(e).name(), nullptr, nullptr, &status), std::free);
  return status == 0 ? name.get() : typeid(e).name();
}

void WriteAll(int descriptor, const std::string& text) {
  for (size_t done = 0; done < text.size();) {
    const ssize_t count = write(descriptor, text.data() + done, text.size() - done);
    if (count <= 0) return;
    done += static_cast<size_t>(count);
  }
}

// The child's half: the log goes to standard error, the answer to `out`.
void AnswerQuestion(const std::function<Json::Value()>& question, const Caller* caller, int out) {
  Json::Value reply(Json::objectValue);
  openlog(kLogName, LOG_PERROR, LOG_USER);
  try {
    if (caller != nullptr) Become(*caller);
    reply["result"] = question();
  } catch (const std::exception& e) {
    reply["class"] = ClassName(e);
    reply["text"] = e.what();
  }
  WriteAll(out, WriteJson(reply, JsonStyle::kCompact));
}

struct Stream {
  int descriptor;
  std::string text;
};

// Reads both streams to their ends; false if that takes longer than until `deadline`.
bool Collect(std::array<Stream, 2>& streams, Clock::time_point deadline) {
  for (;;) {
    struct pollfd polled[2];
    size_t open = 0;
    for (size_t i = 0; i < 2; ++i) {
      polled[i] = {streams[i].descriptor, POLLIN, 0};
      if (streams[i].descriptor >= 0) ++open;
    }
    if (open == 0) return true;
    const auto left =
        std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now()).count();
    if (left <= 0) return false;
    if (poll(polled, 2, static_cast<int>(left)) < 0 && errno != EINTR) return false;
    for (size_t i = 0; i < 2; ++i) {
      if (polled[i].revents == 0) continue;
      char chunk[4096];
      const ssize_t count = read(streams[i].descriptor, chunk, sizeof chunk);
      if (count <= 0 || streams[i].text.size() > kLongestReply) {
        streams[i].descriptor = -1;  // the pipe is closed by its owner
      } else {
        streams[i].text.append(chunk, static_cast<size_t>(count));
      }
    }
  }
}

// "ssoclient-doctor: sso.cpp:96 request token uri ..." as a log line of unit "sso.cpp".
bool ParseLogLine(const std::string& line, Said& said) {
  const std::string prefix = std::string(kLogName) + ": ";
  if (line.compare(0, prefix.size(), prefix) != 0) return false;
  const size_t colon = line.find(':', prefix.size());
  const size_t blank = line.find(' ', prefix.size());
  if (colon == std::string::npos || blank == std::string::npos || blank < colon) return false;
  said = {Said::Kind::kLogs, line.substr(prefix.size(), colon - prefix.size()),
          line.substr(blank + 1)};
  return true;
}

Reply MakeReply(const std::string& log, const std::string& answer) {
  Reply reply;
  std::istringstream lines(log);
  for (std::string line; std::getline(lines, line);) {
    Said said;
    if (ParseLogLine(line, said)) reply.said.push_back(said);
  }
  Json::Value value;
  reply.ended = ParseJson(answer, value) && value.isObject();
  if (!reply.ended) return reply;
  reply.result = value["result"];
  if (value.isMember("class")) {
    reply.said.push_back(
        {Said::Kind::kThrows, value["class"].asString(), value["text"].asString()});
  }
  return reply;
}

}  // namespace

std::string Reply::Thrown() const {
  return !said.empty() && said.back().kind == Said::Kind::kThrows ? said.back().text : "";
}

std::string Reply::ThrownClass() const {
  return !said.empty() && said.back().kind == Said::Kind::kThrows ? said.back().source : "";
}

std::vector<Said> Reply::ErrorLines() const {
  std::vector<Said> lines;
  for (const Said& line : said) {
    if (line.kind == Said::Kind::kLogs && line.text.compare(0, 8, "WARNING:") != 0) {
      lines.push_back(line);
    }
  }
  return lines;
}

void Become(const Caller& caller) {
  const gid_t saved_gid = caller.saved_root ? 0 : caller.gid;
  const uid_t saved_uid = caller.saved_root ? 0 : caller.uid;
  if (setgroups(caller.groups.size(), caller.groups.data()) != 0 ||
      setresgid(caller.gid, caller.gid, saved_gid) != 0 ||
      setresuid(caller.uid, caller.uid, saved_uid) != 0) {
    throw std::system_error(errno, std::generic_category(), "cannot become " + caller.name);
  }
}

Output Capture(const std::function<void(int out)>& body, int seconds) {
  const auto deadline = Clock::now() + std::chrono::seconds(seconds);
  Pipe log;
  Pipe answer;
  const pid_t child = fork();
  if (child < 0) throw std::system_error(errno, std::generic_category(), "fork");
  if (child == 0) {
    setpgid(0, 0);
    dup2(log.write_end, STDERR_FILENO);
    body(answer.write_end);
    _exit(0);
  }
  log.CloseWriting();
  answer.CloseWriting();
  std::array<Stream, 2> streams = {Stream{log.read_end, ""}, Stream{answer.read_end, ""}};
  Output output;
  output.ended = Collect(streams, deadline);
  if (!output.ended) {
    kill(-child, SIGKILL);
    kill(child, SIGKILL);
  }
  while (waitpid(child, &output.status, 0) < 0 && errno == EINTR) {
  }
  output.err = streams[0].text;
  output.out = streams[1].text;
  return output;
}

Reply Ask(const std::function<Json::Value()>& question, int seconds, const Caller* caller) {
  const Output output = Capture([&](int out) { AnswerQuestion(question, caller, out); }, seconds);
  return MakeReply(output.err, output.out);
}

}  // namespace doctor
