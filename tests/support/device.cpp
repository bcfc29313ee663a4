#include "support/device.h"

#include <grp.h>
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <fstream>
#include <iostream>
#include <sstream>
#include <stdexcept>

#include "support/memory_file.h"

namespace test {
namespace {

[[noreturn]] void fail(const std::string& what) {
  throw std::runtime_error(what + ": " + std::strerror(errno));
}

void flushAll() {
  std::cout.flush();
  std::fflush(nullptr);
}

void takeIds(Ids user, Ids group) {
  if (setgroups(0, nullptr) != 0 || setresgid(group.real, group.effective, group.saved) != 0 ||
      setresuid(user.real, user.effective, user.saved) != 0) {
    fail("taking the ids");
  }
}

std::string guarded(Ids user, Ids group, const std::function<std::string()>& body) {
  try {
    takeIds(user, group);
    return body();
  } catch (const std::exception& e) {
    ADD_FAILURE() << "in the child process: " << e.what();
  } catch (...) {
    ADD_FAILURE() << "in the child process: an exception of another kind";
  }
  return "";
}

// Ends by exit() where that works, so that coverage counts are kept.
[[noreturn]] void endChild() {
  flushAll();
#if !defined(__SANITIZE_ADDRESS__)
  if (setresuid(0, 0, 0) == 0 && setresgid(0, 0, 0) == 0) exit(0);
#endif
  _exit(0);
}

// Hands back file, line and text of each failure, and then the answer.
[[noreturn]] void runChild(const MemoryFile& report, Ids user, Ids group,
                           const std::function<std::string()>& body) {
  const testing::TestResult& result =
      *testing::UnitTest::GetInstance()->current_test_info()->result();
  const int before = result.total_part_count();
  const std::string answer = guarded(user, group, body);
  for (int i = before; i < result.total_part_count(); ++i) {
    const testing::TestPartResult& part = result.GetTestPartResult(i);
    if (!part.failed()) continue;
    report.putPart(part.file_name() != nullptr ? part.file_name() : "");
    report.putPart(std::to_string(part.line_number()));
    report.putPart(part.message());
  }
  report.putPart(answer);
  endChild();
}

}  // namespace

void requireSandbox() {
  std::ostringstream mounts;
  mounts << std::ifstream("/proc/self/mounts").rdbuf();
  if (mounts.str().find("device-usr /usr ") == std::string::npos) {
    throw std::runtime_error("not in a sandbox: run this through scripts/sandbox");
  }
}

std::string configPath(const std::string& name) {
  return "/usr/qova/etc/ssoclient/" + name;
}

void writeConfig(const std::string& name, const std::string& text, mode_t mode, uid_t owner,
                 gid_t group) {
  requireSandbox();
  const std::string path = configPath(name);
  std::ofstream(path, std::ios::binary | std::ios::trunc) << text;
  if (chown(path.c_str(), owner, group) != 0 || chmod(path.c_str(), mode) != 0) fail(path);
}

void removeConfig(const std::string& name) {
  requireSandbox();
  if (unlink(configPath(name).c_str()) != 0 && errno != ENOENT) fail(name);
}

void coverFile(const std::string& path, const std::string& text) {
  requireSandbox();
  static int count = 0;
  const std::string cover = "/usr/qova/cover-" + std::to_string(++count);
  std::ofstream(cover, std::ios::binary) << text;
  if (mount(cover.c_str(), path.c_str(), "", MS_BIND, nullptr) != 0) fail("cover " + path);
}

void coverFolder(const std::string& path) {
  requireSandbox();
  if (mount("cover", path.c_str(), "tmpfs", 0, "mode=755") != 0) fail("cover " + path);
}

void resolveToLoopback(const std::string& host) {
  std::ostringstream hosts;
  hosts << std::ifstream("/etc/hosts").rdbuf();
  coverFile("/etc/hosts", hosts.str() + "\n127.0.0.1 " + host + "\n");
}

std::string stdoutOf(const std::function<void()>& call) {
  flushAll();
  const int before = dup(1);
  const MemoryFile file;
  dup2(file.descriptor(), 1);
  const auto restore = [&] {
    flushAll();
    dup2(before, 1);
    close(before);
  };
  try {
    call();
  } catch (...) {
    restore();
    throw;
  }
  restore();
  return file.contents();
}

CoutRecorder::CoutRecorder() : before(std::cout.rdbuf(this)) {}
CoutRecorder::~CoutRecorder() {
  std::cout.rdbuf(before);
}

std::streamsize CoutRecorder::xsputn(const char* text, std::streamsize count) {
  writes.emplace_back(text, static_cast<std::size_t>(count));
  return count;
}

CoutRecorder::int_type CoutRecorder::overflow(int_type c) {
  if (c != traits_type::eof()) writes.emplace_back(1, traits_type::to_char_type(c));
  return traits_type::not_eof(c);
}

int CoutRecorder::sync() {
  ++flushes;
  return 0;
}

std::string asProcess(Ids user, Ids group, const std::function<std::string()>& body) {
  requireSandbox();
  flushAll();
  const MemoryFile report;
  const pid_t child = fork();
  if (child < 0) fail("fork");
  if (child == 0) runChild(report, user, group, body);
  int status = 0;
  while (waitpid(child, &status, 0) < 0 && errno == EINTR) {
  }
  if (WIFSIGNALED(status)) {
    ADD_FAILURE() << "the child process was ended by signal " << WTERMSIG(status);
    return "";
  }
  const auto parts = report.parts();
  if (parts.empty()) {
    ADD_FAILURE() << "the child process ended with status " << WEXITSTATUS(status);
    return "";
  }
  for (std::size_t i = 0; i + 3 <= parts.size() - 1; i += 3) {
    ADD_FAILURE_AT(parts[i].c_str(), std::stoi(parts[i + 1])) << parts[i + 2];
  }
  EXPECT_EQ(WEXITSTATUS(status), 0);
  return parts.back();
}

void runAs(Ids user, Ids group, const std::function<void()>& body) {
  asProcess(user, group, [&] {
    body();
    return std::string();
  });
}

void asProcess(Ids both, const std::function<void()>& body) {
  runAs(both, both, body);
}

}  // namespace test
