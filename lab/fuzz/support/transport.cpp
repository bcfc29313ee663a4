#include "support/transport.h"

// Not the checking macros: these functions are defined here.
#define CURL_DISABLE_TYPECHECK
#include <curl/curl.h>
#undef curl_easy_setopt
#include <dlfcn.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cstdarg>
#include <cstring>
#include <memory>

#include "support/target.h"

namespace fuzz {
namespace {

// The library's own type of the write function: calling it by any other is undefined.
using Write = unsigned (*)(void* data, unsigned size, unsigned count, void* userData);

struct Handle {
  Request request;
  Write write = nullptr;
  void* userData = nullptr;
};

template <typename Function>
Function* real(const char* name) {
  return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

void take(Handle& handle, CURLoption option, void* value) {
  switch (option) {
    case CURLOPT_URL:
      handle.request.url = static_cast<const char*>(value);
      break;
    case CURLOPT_POSTFIELDS:
      handle.request.post = true;
      handle.request.body = static_cast<const char*>(value);
      break;
    case CURLOPT_WRITEFUNCTION:
      std::memcpy(&handle.write, &value, sizeof value);
      break;
    case CURLOPT_WRITEDATA:
      handle.userData = value;
      break;
    case CURLOPT_SSL_VERIFYHOST:
    case CURLOPT_SSL_VERIFYPEER:
      handle.request.verified = value != nullptr;
      break;
    default:
      require(false, "an option that was not asked for");
  }
}

// A chunk lies in memory of exactly its size: nothing may be read behind it.
bool deliver(const Handle& handle, const std::string& chunk) {
  const std::unique_ptr<char[]> memory(new char[chunk.size()]);
  std::memcpy(memory.get(), chunk.data(), chunk.size());
  const unsigned size = static_cast<unsigned>(chunk.size());
  return handle.write(memory.get(), 1, size, handle.userData) == size;
}

CURLcode play(Handle& handle) {
  require(handle.write != nullptr, "a transfer without a write function");
  Transport& all = transport();
  all.requests.push_back(handle.request);
  if (all.requests.size() > all.answers.size()) return CURLE_COULDNT_CONNECT;
  const Answer& answer = all.answers[all.requests.size() - 1];
  for (const std::string& chunk : answer.chunks) {
    // As libcurl does: an empty body means no call.
    if (!chunk.empty() && !deliver(handle, chunk)) return CURLE_WRITE_ERROR;
  }
  return static_cast<CURLcode>(answer.result);
}

// libcurl asks for a socket: it gets one end of a pair whose other end has said all it has to say.
curl_socket_t openSocket(void*, curlsocktype, curl_sockaddr*) {
  int ends[2];
  require(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) == 0, "socketpair");
  const std::string& wire = transport().wire;
  const int room = 1 << 20;
  setsockopt(ends[1], SOL_SOCKET, SO_SNDBUF, &room, sizeof room);
  require(
      send(ends[1], wire.data(), wire.size(), MSG_DONTWAIT) == static_cast<ssize_t>(wire.size()),
      "an answer that does not fit the socket");
  shutdown(ends[1], SHUT_WR);
  transport().requests.emplace_back();
  // Kept open, so that libcurl can send its request; closed with the next one and at the end.
  static int kept = -1;
  if (kept >= 0) close(kept);
  kept = ends[1];
  return ends[0];
}

CURLcode performReal(CURL* handle) {
  static auto* const set = real<CURLcode(CURL*, CURLoption, ...)>("curl_easy_setopt");
  static auto* const perform = real<CURLcode(CURL*)>("curl_easy_perform");
  set(handle, CURLOPT_OPENSOCKETFUNCTION, openSocket);
  return perform(handle);
}

}  // namespace

Answer inChunks(const std::string& body, std::size_t size) {
  Answer answer;
  if (size == 0) size = std::max<std::size_t>(body.size(), 1);
  for (std::size_t at = 0; at < body.size(); at += size) {
    answer.chunks.push_back(body.substr(at, size));
  }
  return answer;
}

std::string received(const Answer& answer) {
  std::string body;
  for (const std::string& chunk : answer.chunks) body += chunk.c_str();
  return body;
}

Transport& transport() {
  static Transport one;
  return one;
}

void Transport::reset() {
  answers.clear();
  requests.clear();
  real = false;
  wire.clear();
  handles = 0;
}

}  // namespace fuzz

using fuzz::Handle;
using fuzz::transport;

extern "C" {

CURLcode curl_global_init(long flags) {
  static auto* const next = fuzz::real<CURLcode(long)>("curl_global_init");
  return transport().real ? next(flags) : CURLE_OK;
}

void curl_global_cleanup(void) {
  static auto* const next = fuzz::real<void()>("curl_global_cleanup");
  if (transport().real) next();
}

CURL* curl_easy_init(void) {
  static auto* const next = fuzz::real<CURL*()>("curl_easy_init");
  if (transport().real) return next();
  ++transport().handles;
  return new Handle;
}

void curl_easy_cleanup(CURL* handle) {
  static auto* const next = fuzz::real<void(CURL*)>("curl_easy_cleanup");
  if (transport().real) return next(handle);
  --transport().handles;
  delete static_cast<Handle*>(handle);
}

// The last named parameter is an enumeration, as libcurl has it.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wvarargs"
CURLcode curl_easy_setopt(CURL* handle, CURLoption option, ...) {
  static auto* const next = fuzz::real<CURLcode(CURL*, CURLoption, ...)>("curl_easy_setopt");
  va_list arguments;
  va_start(arguments, option);
  void* const value = va_arg(arguments, void*);
  va_end(arguments);
  if (transport().real) return next(handle, option, value);
  fuzz::take(*static_cast<Handle*>(handle), option, value);
  return CURLE_OK;
}
#pragma GCC diagnostic pop

CURLcode curl_easy_perform(CURL* handle) {
  return transport().real ? fuzz::performReal(handle) : fuzz::play(*static_cast<Handle*>(handle));
}

// The pair is connected already; nothing else of this program connects to anything.
int connect(int, const sockaddr*, socklen_t) {
  return 0;
}

}  // extern "C"
