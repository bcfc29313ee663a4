// What the servers of the tests have in common: a socket of 127.0.0.1 and a child process that
// serves it, TLS, and the reading of requests.
#pragma once

#include <openssl/types.h>
#include <sys/types.h>

#include <cstddef>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "support/ca.h"

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

// The server's side of TLS.
std::shared_ptr<SSL_CTX> serverContext(const Identity& identity);

// A connection that was accepted: in the clear, or over TLS as soon as hands are shaken.
class Connection {
 public:
  enum class End {
    kClose,  // as TLS wants it
    kCut,    // the connection is closed, TLS is not
    kReset,
  };

  Connection(int accepted, long silence);  // the seconds for which the client may be silent
  ~Connection();
  Connection(const Connection&) = delete;
  Connection& operator=(const Connection&) = delete;

  bool shakeHands(SSL_CTX* context);
  // Adds what comes next. False if nothing does.
  bool receive(std::string* into) const;
  // A whole request, header and body; an empty text if there is none.
  std::string receiveRequest() const;
  bool send(const std::string& text, std::size_t piece = 0) const;  // bytes per write; 0: all
  void end(End how = End::kClose) const;

 private:
  bool sendAll(const char* data, std::size_t size) const;

  int socket;
  SSL* ssl = nullptr;
};

struct Request {
  std::string raw;     // as received, header and body
  std::string method;  // "GET"
  std::string target;  // path and query, as received
  std::string body;
  std::vector<std::string> headers;  // whole lines, in order

  // The value of a header, empty if there is none; the name's case does not matter.
  std::string header(const std::string& name) const;
};
Request parseRequest(const std::string& raw);

}  // namespace test
