// What the servers of the tests have in common: a socket of 127.0.0.1, and a child process that
// serves it.
#pragma once

#include <sys/types.h>

#include <functional>

namespace test {

// It takes connections from the start; they wait until its process runs.
class Server {
 public:
  explicit Server(int port = 0);  // port 0: any free port
  ~Server();
  Server(const Server&) = delete;
  Server& operator=(const Server&) = delete;

  // Runs `serve`, which does not return, in a child process. This ends with the Server, with the
  // process that started it, or after so many seconds.
  void start(const std::function<void(int listener)>& serve, unsigned seconds);
  void stop();

  bool isStarted() const { return process > 0; }
  int port() const { return number; }

 private:
  int listener;
  int number = 0;
  pid_t process = 0;
};

}  // namespace test
