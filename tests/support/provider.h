// A scripted provider: an HTTP or HTTPS server on 127.0.0.1 that answers by path and remembers
// every request, byte for byte.
//
//   test::Provider provider;                          // or provider(ca.issue({"localhost"}))
//   provider.answer("/token", test::ok(R"({"a":1})"));
//   provider.start();
//   ... provider.url("/token") ...
//   EXPECT_EQ(provider.requests()[0].body, "code=x");
//
// The server is a child process. It ends with the Provider, with the test, or after 100 seconds.
#pragma once

#include <cstddef>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "support/ca.h"
#include "support/memory_file.h"
#include "support/server.h"

namespace test {

// One answer. Everything but the body has the value of an ordinary, honest server.
struct Answer {
  int status = 200;
  std::string body;
  std::vector<std::string> headers;     // whole lines, "Name: value"
  std::string raw;                      // if not empty: sent instead of all that is above
  bool chunked = false;                 // Transfer-Encoding, one chunk per piece
  std::size_t piece = 0;                // bytes per chunk or write to the socket; 0: all at once
  long long contentLength = -1;         // what Content-Length claims; -1: the truth
  std::size_t cut = std::string::npos;  // the connection ends after so many bytes
  int delayMs = 0;                      // silence before the first byte
};

Answer ok(std::string body);
Answer failed(int status, std::string body);

class Provider {
 public:
  explicit Provider(int port = 0);                       // HTTP; port 0: any free port
  explicit Provider(const Identity& own, int port = 0);  // HTTPS

  // The next request for `path` (without a query) gets this answer. Answers to one path are
  // given in order; the last one is repeated. A path without an answer gets 404 and no body. A
  // path with a method in front ("POST /token") is for requests of that method alone.
  Provider& answer(const std::string& path, Answer answer);
  // From here on requests are answered; no more answers can be added.
  void start();

  int port() const { return server.port(); }
  std::string url(const std::string& path, const std::string& host = "localhost") const;

  // Every request so far, in order. A request is there before its answer is sent.
  std::vector<Request> requests() const;

 private:
  [[noreturn]] void serve(int listener);

  Server server;
  Identity identity;
  bool tls = false;
  MemoryFile received;
  std::map<std::string, std::vector<Answer>> script;
};

// A port of 127.0.0.1 on which nobody listens.
int unusedPort();

}  // namespace test
