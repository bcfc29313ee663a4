// The launcher: gives the login program its root identity where that program is not to be set-id
// itself. Installed set-user-id root in the login program's place; the web server starts it, and it
// starts the one program that was named when it was built.
//
// A saved id does not survive exec, a real one does: root becomes the real identity, the web
// server's stays the effective one, and the login program turns root into its saved identity.
#include <signal.h>
#include <syslog.h>
#include <unistd.h>

#include <cstdlib>
#include <iostream>
#include <stdexcept>
#include <string>
#include <vector>

#include "environment.h"

namespace {

constexpr char kProgram[] = SSOCLIENT_LOGIN_PROGRAM;
static_assert(kProgram[0] == '/', "the path of the login program is absolute");

// What the login program reads. Nothing else of the web server's environment gets to it: the rest
// comes from its settings file.
std::vector<std::string> Environment() {
  std::vector<std::string> kept = {std::string("PATH=") + kPath};
  for (const char* name : kRequestVariables) {
    if (const char* value = std::getenv(name)) kept.push_back(std::string(name) + "=" + value);
  }
  return kept;
}

void TakeIdentity() {
  const uid_t uid = getuid();
  const gid_t gid = getgid();
  if (geteuid() != 0) throw std::runtime_error("launcher is not installed set-id root");
  if (uid == 0) throw std::runtime_error("web server runs as root");
  // The group first: without the effective user root it could not be changed any more.
  if (setresgid(0, gid, gid) != 0 || setresuid(0, uid, uid) != 0) {
    throw std::runtime_error("launcher cannot set the identities");
  }
}

// Whoever starts the launcher chooses its signal mask. A full system log must not hold it for ever.
void SetDeadline() {
  sigset_t none;
  sigemptyset(&none);
  sigprocmask(SIG_SETMASK, &none, nullptr);
  signal(SIGALRM, SIG_DFL);
  alarm(30);  // the login program sets its own
}

[[noreturn]] void Launch() {
  std::vector<std::string> kept = Environment();
  std::vector<char*> environment;
  for (std::string& pair : kept) environment.push_back(&pair[0]);
  environment.push_back(nullptr);
  std::string name = kProgram;
  char* arguments[] = {&name[0], nullptr};
  TakeIdentity();
  execve(kProgram, arguments, environment.data());
  throw std::runtime_error("login program does not start");
}

}  // namespace

int main() {
  try {
    SetDeadline();
    Launch();
  } catch (const std::exception& error) {
    syslog(LOG_ERR, "sign-in failed: %s", error.what());
    std::cout << "Status: 302 Found\nCache-Control: no-store\n"
                 "Location: /webman/ssoclient/relay.html#success=false\n\n";
  }
}
