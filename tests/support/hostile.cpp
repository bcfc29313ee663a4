#include "support/hostile.h"

#include <netinet/in.h>
#include <netinet/tcp.h>
#include <openssl/ssl.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <memory>
#include <new>
#include <stdexcept>

namespace test {

struct HostileProvider::Shared {
  std::atomic<int> round{0};
  std::atomic<int> turns{0};
  std::atomic<int> requests{0};
  std::atomic<int> strays{0};
};

namespace {

constexpr long kSilenceSeconds = 5;

void require(bool good, const char* what) {
  if (!good) throw std::runtime_error(std::string("hostile provider: ") + what);
}

int chooseProtocol(SSL*, const unsigned char** chosen, unsigned char* size, const unsigned char*,
                   unsigned, void* argument) {
  const auto& protocol = *static_cast<const std::string*>(argument);
  *chosen = reinterpret_cast<const unsigned char*>(protocol.data());
  *size = static_cast<unsigned char>(protocol.size());
  return SSL_TLSEXT_ERR_OK;
}

std::shared_ptr<SSL_CTX> contextOf(const Identity& identity, const Dialect& dialect) {
  auto context = serverContext(identity);
  if (!dialect.ciphers.empty())
    require(SSL_CTX_set_cipher_list(context.get(), dialect.ciphers.c_str()) == 1, "ciphers");
  SSL_CTX_set_min_proto_version(context.get(), dialect.oldest);
  SSL_CTX_set_max_proto_version(context.get(), dialect.newest);
  if (!dialect.protocol.empty())
    SSL_CTX_set_alpn_select_cb(context.get(), chooseProtocol,
                               const_cast<std::string*>(&dialect.protocol));
  return context;
}

// The server's first messages in answer to this one of the client.
std::string firstFlight(SSL_CTX* context, const std::string& hello) {
  SSL* ssl = SSL_new(context);
  BIO* in = BIO_new(BIO_s_mem());
  BIO* out = BIO_new(BIO_s_mem());
  SSL_set_bio(ssl, in, out);
  BIO_write(in, hello.data(), static_cast<int>(hello.size()));
  SSL_accept(ssl);
  std::string flight(static_cast<std::size_t>(BIO_pending(out)), '\0');
  if (!flight.empty()) BIO_read(out, &flight[0], static_cast<int>(flight.size()));
  SSL_free(ssl);
  return flight;
}

void sendScript(const Connection& guest, const Script& script) {
  bool going = guest.send(script.bytes, script.piece);
  if (script.filler > 0) {
    std::string fill = script.fill;
    while (fill.size() < (1 << 18)) fill += fill;
    for (std::size_t left = script.filler; going && left > 0;) {
      const std::size_t most = std::min(left, fill.size());
      going = guest.send(most == fill.size() ? fill : fill.substr(0, most));
      left -= most;
    }
  }
  if (going) guest.send(script.tail);
  if (script.silenceMs > 0) usleep(static_cast<useconds_t>(script.silenceMs) * 1000);
}

}  // namespace

HostileProvider::HostileProvider(const Identity& own, const Dialect& spoken)
    : identity(own), dialect(spoken) {
  void* memory =
      mmap(nullptr, sizeof(Shared), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
  require(memory != MAP_FAILED, "memory");
  shared = new (memory) Shared;
}

HostileProvider::~HostileProvider() {
  munmap(shared, sizeof(Shared));
}

void HostileProvider::start(Play script, unsigned seconds) {
  server.start([this, script](int listener) { serve(listener, script); }, seconds);
}

void HostileProvider::serve(int listener, const Play& script) {
  const auto context = contextOf(identity, dialect);
  const int on = 1;
  for (;;) {
    const int socket = accept4(listener, nullptr, nullptr, SOCK_CLOEXEC);
    require(socket >= 0, "accept");
    setsockopt(socket, IPPROTO_TCP, TCP_NODELAY, &on, sizeof on);  // pieces stay pieces
    Connection guest(socket, kSilenceSeconds);
    const int turn = shared->turns++;
    const Script act = script(shared->round, turn);
    std::string heard;
    if (act.stage == Script::Stage::kHello || act.stage == Script::Stage::kFlight) {
      if (!guest.receive(&heard)) continue;
    }
    if (act.stage == Script::Stage::kFlight) {
      const std::string flight = firstFlight(context.get(), heard);
      guest.send(flight.substr(0, flight.size() * act.flight / 1000));
    }
    if (act.stage >= Script::Stage::kHandshake && !guest.shakeHands(context.get())) continue;
    if (act.stage == Script::Stage::kRequest) {
      const std::string request = guest.receiveRequest();
      if (request.empty()) continue;
      ++shared->requests;
      if (request.substr(0, request.find('\r')).find("stray") != std::string::npos)
        ++shared->strays;
    }
    sendScript(guest, act);
    guest.end(act.end);
  }
}

void HostileProvider::play(int round) {
  shared->requests = 0;
  shared->turns = 0;
  shared->round = round;
}

std::string HostileProvider::url(const std::string& path, const std::string& host) const {
  return "https://" + host + ":" + std::to_string(port()) + path;
}

int HostileProvider::turns() const {
  return shared->turns;
}
int HostileProvider::requests() const {
  return shared->requests;
}
int HostileProvider::strays() const {
  return shared->strays;
}

}  // namespace test
