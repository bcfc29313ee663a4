// A provider that goes wrong on purpose: an HTTPS server on 127.0.0.1 that follows a script for
// each connection, from the first byte of the handshake to the way it ends.
//
//   test::HostileProvider provider(ca.issue({"localhost"}));
//   provider.start([](int round, int turn) { return test::Script{...}; });
//   provider.play(7);  // the connections from here on are turns 0, 1, 2 ... of round 7
//
// The scripts are made in the server, a child process.
#pragma once

#include <cstddef>
#include <functional>
#include <string>

#include "support/ca.h"
#include "support/server.h"

namespace test {

// What happens on one connection.
struct Script {
  // How far the server goes like an honest one, before it sends its bytes and ends.
  enum class Stage {
    kAccept,     // nothing is read; bytes in the clear
    kHello,      // the client's first message is read; bytes in the clear
    kFlight,     // of the server's own first messages it sends `flight` per mille
    kHandshake,  // the request is not read
    kRequest,    // the whole request is read
  };
  using End = Connection::End;

  Stage stage = Stage::kRequest;
  unsigned flight = 0;
  std::string bytes;
  std::size_t piece = 0;   // bytes per write; 0: all at once
  std::string fill;        // sent again and again behind `bytes`,
  std::size_t filler = 0;  // so many bytes of it in all,
  std::string tail;        // and then this
  int silenceMs = 0;       // before the end
  End end = End::kClose;
};

// What the server speaks; the values are those of OpenSSL.
struct Dialect {
  int oldest = 0;
  int newest = 0;
  std::string ciphers;
  std::string protocol;  // that it chooses by ALPN, if not empty
};

class HostileProvider {
 public:
  using Play = std::function<Script(int round, int turn)>;

  explicit HostileProvider(const Identity& own, const Dialect& dialect = {});
  ~HostileProvider();
  HostileProvider(const HostileProvider&) = delete;
  HostileProvider& operator=(const HostileProvider&) = delete;

  // Starts the server; it lives so many seconds at most.
  void start(Play play, unsigned seconds = 100);
  void play(int round);

  std::string url(const std::string& path, const std::string& host = "localhost") const;
  int port() const { return server.port(); }

  // Of this round: connections, and requests that were read to their end.
  int turns() const;
  int requests() const;
  // Of all rounds: requests for a path that holds "stray".
  int strays() const;

 private:
  struct Shared;

  [[noreturn]] void serve(int listener, const Play& play);

  Identity identity;
  Dialect dialect;
  Shared* shared;
  Server server;
};

}  // namespace test
