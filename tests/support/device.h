// The device as the library meets it: its configuration files, its standard output, and the
// process identities of its programs. All of it stays inside the sandbox.
#pragma once

#include <sys/types.h>

#include <functional>
#include <streambuf>
#include <string>
#include <vector>

namespace test {

// Throws unless this process runs in a sandbox (scripts/sandbox).
void requireSandbox();

// Writes /usr/qova/etc/ssoclient/NAME, with any mode and owner.
void writeConfig(const std::string& name, const std::string& text, mode_t mode = 0600,
                 uid_t owner = 0, gid_t group = 0);
void removeConfig(const std::string& name);
std::string configPath(const std::string& name);

// Covers the file at `path` with `text`, for this sandbox alone; the file must exist.
void coverFile(const std::string& path, const std::string& text);
// Covers the folder at `path` with an empty one, for this sandbox alone.
void coverFolder(const std::string& path);
// Makes a host name lead to 127.0.0.1, in this sandbox alone.
void resolveToLoopback(const std::string& host);

// The bytes that reach file descriptor 1 during `call`, after a flush.
std::string stdoutOf(const std::function<void()>& call);

// Replaces the buffer of std::cout and records each write and each flush.
class CoutRecorder : public std::streambuf {
 public:
  CoutRecorder();
  ~CoutRecorder() override;

  std::vector<std::string> writes;
  int flushes = 0;

 protected:
  std::streamsize xsputn(const char* text, std::streamsize count) override;
  int_type overflow(int_type c) override;
  int sync() override;

 private:
  std::streambuf* before;
};

struct Ids {
  uid_t real;
  uid_t effective;
  uid_t saved;
};
// Runs `body` in a child process with these user and group ids (no further groups). Failures of
// assertions in there become failures of this test; what `body` returns is returned.
std::string asProcess(Ids user, Ids group, const std::function<std::string()>& body);
// The same with nothing to return, and for user and group alike.
void runAs(Ids user, Ids group, const std::function<void()>& body);
void asProcess(Ids both, const std::function<void()>& body);

}  // namespace test
