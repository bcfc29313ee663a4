// Replaces the network. The fuzz program defines libcurl's functions itself: either they
// hand out the scripted answers, or (`real`) libcurl runs, on a socket that holds the answer
// already. Either way the library's own code handles every byte.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

namespace fuzz {

// One answer as the library's write function gets it.
struct Answer {
  std::vector<std::string> chunks;
  int result = 0;  // a CURLcode, after the chunks
};
// A body in chunks of `size` bytes; 0 is one chunk.
Answer inChunks(const std::string& body, std::size_t size = 0);
// The body that is left of it: each chunk ends at its first zero byte.
std::string received(const Answer& answer);

struct Request {
  std::string url;
  bool post = false;
  std::string body;
  bool verified = true;  // neither check of the server's certificate was switched off
};

struct Transport {
  // Given in this order; then no server listens any more.
  std::vector<Answer> answers;
  std::vector<Request> requests;

  // The whole answer of a server that libcurl itself is to read; empty: libcurl is not called.
  bool real = false;
  std::string wire;

  void reset();
  std::size_t openHandles() const { return handles; }

  std::size_t handles = 0;
};

Transport& transport();

}  // namespace fuzz
