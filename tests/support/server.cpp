#include "support/server.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <cstdint>
#include <cstdio>
#include <stdexcept>
#include <string>

namespace test {
namespace {

void require(bool good, const char* what) {
  if (!good) throw std::runtime_error(std::string("test server: ") + what);
}

}  // namespace

Server::Server(int port) : listener(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
  const int on = 1;
  setsockopt(listener, SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  address.sin_port = htons(static_cast<std::uint16_t>(port));
  socklen_t size = sizeof address;
  require(listener >= 0 && bind(listener, reinterpret_cast<sockaddr*>(&address), size) == 0 &&
              listen(listener, 16) == 0 &&
              getsockname(listener, reinterpret_cast<sockaddr*>(&address), &size) == 0,
          "cannot listen");
  number = ntohs(address.sin_port);
}

Server::~Server() {
  stop();
  if (listener >= 0) close(listener);
}

void Server::start(const std::function<void(int listener)>& serve, unsigned seconds) {
  require(listener >= 0, "started twice");
  const pid_t parent = getpid();
  process = fork();
  require(process >= 0, "fork");
  if (process != 0) {
    close(listener);
    listener = -1;
    return;
  }
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  if (getppid() != parent) _exit(1);
  alarm(seconds);
  signal(SIGPIPE, SIG_IGN);
  try {
    serve(listener);
  } catch (const std::exception& e) {
    std::fprintf(stderr, "%s\n", e.what());
  }
  _exit(1);
}

void Server::stop() {
  if (process <= 0) return;
  kill(process, SIGKILL);
  waitpid(process, nullptr, 0);
  process = 0;
}

}  // namespace test
