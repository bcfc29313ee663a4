#include "support/hostile.h"

#include <netinet/in.h>
#include <netinet/tcp.h>
#include <openssl/pem.h>
#include <openssl/ssl.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <sys/time.h>
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

SSL_CTX* newContext(const Identity& identity, const Dialect& dialect) {
  SSL_CTX* context = SSL_CTX_new(TLS_server_method());
  BIO* certificate = BIO_new_mem_buf(identity.certificate.data(), -1);
  BIO* key = BIO_new_mem_buf(identity.key.data(), -1);
  X509* x = PEM_read_bio_X509(certificate, nullptr, nullptr, nullptr);
  EVP_PKEY* k = PEM_read_bio_PrivateKey(key, nullptr, nullptr, nullptr);
  if (!dialect.ciphers.empty())
    require(SSL_CTX_set_cipher_list(context, dialect.ciphers.c_str()) == 1, "ciphers");
  require(SSL_CTX_use_certificate(context, x) == 1 && SSL_CTX_use_PrivateKey(context, k) == 1,
          "unusable certificate");
  SSL_CTX_set_min_proto_version(context, dialect.oldest);
  SSL_CTX_set_max_proto_version(context, dialect.newest);
  if (!dialect.protocol.empty())
    SSL_CTX_set_alpn_select_cb(context, chooseProtocol,
                               const_cast<std::string*>(&dialect.protocol));
  X509_free(x);
  EVP_PKEY_free(k);
  BIO_free(certificate);
  BIO_free(key);
  return context;
}

// One connection, which is closed as its script says.
class Guest {
 public:
  explicit Guest(int accepted) : socket(accepted) {
    const timeval silence{kSilenceSeconds, 0};
    const int on = 1;
    setsockopt(socket, SOL_SOCKET, SO_RCVTIMEO, &silence, sizeof silence);
    setsockopt(socket, SOL_SOCKET, SO_SNDTIMEO, &silence, sizeof silence);
    setsockopt(socket, IPPROTO_TCP, TCP_NODELAY, &on, sizeof on);
  }
  ~Guest() {
    SSL_free(ssl);
    close(socket);
  }
  Guest(const Guest&) = delete;
  Guest& operator=(const Guest&) = delete;

  // Reads the client's first message, in the clear. False if nothing came.
  bool hear(std::string* message) const {
    char piece[16384];
    const ssize_t n = recv(socket, piece, sizeof piece, 0);
    if (n > 0) message->assign(piece, static_cast<std::size_t>(n));
    return n > 0;
  }

  bool shakeHands(SSL_CTX* context) {
    ssl = SSL_new(context);
    SSL_set_fd(ssl, socket);
    if (SSL_accept(ssl) == 1) return true;
    SSL_free(ssl);
    ssl = nullptr;
    return false;
  }

  // A whole request; an empty text if there is none.
  std::string request() const {
    std::string raw;
    for (std::size_t size = std::string::npos; raw.size() < size;) {
      char piece[16384];
      const int n = SSL_read(ssl, piece, sizeof piece);
      if (n <= 0) return "";
      raw.append(piece, static_cast<std::size_t>(n));
      const std::size_t end = raw.find("\r\n\r\n");
      if (end == std::string::npos) continue;
      const std::size_t length = raw.find("Content-Length: ");
      size = end + 4 + (length < end ? std::stoul(raw.substr(length + 16)) : 0);
    }
    return raw;
  }

  bool send(const std::string& text, std::size_t piece) const {
    if (piece == 0) piece = std::max<std::size_t>(text.size(), 1);
    for (std::size_t at = 0; at < text.size(); at += piece) {
      if (!sendAll(text.data() + at, std::min(piece, text.size() - at))) return false;
    }
    return true;
  }

  void end(Script::End how) const {
    const linger at_once{1, 0};
    if (how == Script::End::kReset) {
      setsockopt(socket, SOL_SOCKET, SO_LINGER, &at_once, sizeof at_once);
      return;
    }
    if (ssl != nullptr && how == Script::End::kClose) SSL_shutdown(ssl);
    shutdown(socket, SHUT_WR);
  }

 private:
  bool sendAll(const char* data, std::size_t size) const {
    while (size > 0) {
      const std::size_t most = std::min<std::size_t>(size, 1 << 20);
      const auto n = ssl != nullptr ? SSL_write(ssl, data, static_cast<int>(most))
                                    : static_cast<int>(::send(socket, data, most, 0));
      if (n <= 0) return false;
      data += n;
      size -= static_cast<std::size_t>(n);
    }
    return true;
  }

  int socket;
  SSL* ssl = nullptr;
};

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

void sendScript(const Guest& guest, const Script& script) {
  bool going = guest.send(script.bytes, script.piece);
  if (script.filler > 0) {
    std::string fill = script.fill;
    while (fill.size() < (1 << 18)) fill += fill;
    for (std::size_t left = script.filler; going && left > 0;) {
      const std::size_t most = std::min(left, fill.size());
      going = guest.send(most == fill.size() ? fill : fill.substr(0, most), 0);
      left -= most;
    }
  }
  if (going) guest.send(script.tail, 0);
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
  SSL_CTX* context = newContext(identity, dialect);
  for (;;) {
    const int socket = accept4(listener, nullptr, nullptr, SOCK_CLOEXEC);
    require(socket >= 0, "accept");
    Guest guest(socket);
    const int turn = shared->turns++;
    const Script act = script(shared->round, turn);
    std::string heard;
    if (act.stage == Script::Stage::kHello || act.stage == Script::Stage::kFlight) {
      if (!guest.hear(&heard)) continue;
    }
    if (act.stage == Script::Stage::kFlight) {
      const std::string flight = firstFlight(context, heard);
      guest.send(flight.substr(0, flight.size() * act.flight / 1000), 0);
    }
    if (act.stage >= Script::Stage::kHandshake && !guest.shakeHands(context)) continue;
    if (act.stage == Script::Stage::kRequest) {
      const std::string request = guest.request();
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
