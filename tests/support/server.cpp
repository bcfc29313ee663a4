#include "support/server.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <openssl/pem.h>
#include <openssl/ssl.h>
#include <strings.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdint>
#include <cstdio>
#include <stdexcept>

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

std::shared_ptr<SSL_CTX> serverContext(const Identity& identity) {
  std::shared_ptr<SSL_CTX> context(SSL_CTX_new(TLS_server_method()), SSL_CTX_free);
  BIO* certificate = BIO_new_mem_buf(identity.certificate.data(), -1);
  BIO* key = BIO_new_mem_buf(identity.key.data(), -1);
  X509* x = PEM_read_bio_X509(certificate, nullptr, nullptr, nullptr);
  EVP_PKEY* k = PEM_read_bio_PrivateKey(key, nullptr, nullptr, nullptr);
  const bool usable = SSL_CTX_use_certificate(context.get(), x) == 1 &&
                      SSL_CTX_use_PrivateKey(context.get(), k) == 1;
  X509_free(x);
  EVP_PKEY_free(k);
  BIO_free(certificate);
  BIO_free(key);
  require(usable, "unusable certificate");
  return context;
}

Connection::Connection(int accepted, long silence) : socket(accepted) {
  const timeval most{silence, 0};
  setsockopt(socket, SOL_SOCKET, SO_RCVTIMEO, &most, sizeof most);
  setsockopt(socket, SOL_SOCKET, SO_SNDTIMEO, &most, sizeof most);
}

Connection::~Connection() {
  SSL_free(ssl);
  close(socket);
}

bool Connection::shakeHands(SSL_CTX* context) {
  ssl = SSL_new(context);
  SSL_set_fd(ssl, socket);
  return SSL_accept(ssl) == 1;
}

bool Connection::receive(std::string* into) const {
  char piece[16384];
  const auto n = ssl != nullptr ? SSL_read(ssl, piece, sizeof piece)
                                : static_cast<int>(recv(socket, piece, sizeof piece, 0));
  if (n > 0) into->append(piece, static_cast<std::size_t>(n));
  return n > 0;
}

std::string Connection::receiveRequest() const {
  std::string raw;
  std::size_t end;
  while ((end = raw.find("\r\n\r\n")) == std::string::npos) {
    if (!receive(&raw) || raw[0] < 'A' || raw[0] > 'Z') return "";  // not HTTP
  }
  const Request request = parseRequest(raw);
  const std::string length = request.header("Content-Length");
  const std::size_t size = end + 4 + (length.empty() ? 0 : std::stoul(length));
  if (!request.header("Expect").empty()) send("HTTP/1.1 100 Continue\r\n\r\n");
  while (raw.size() < size) {
    if (!receive(&raw)) return "";
  }
  return raw;
}

bool Connection::send(const std::string& text, std::size_t piece) const {
  if (piece == 0) piece = std::max<std::size_t>(text.size(), 1);
  for (std::size_t at = 0; at < text.size(); at += piece) {
    if (!sendAll(text.data() + at, std::min(piece, text.size() - at))) return false;
  }
  return true;
}

bool Connection::sendAll(const char* data, std::size_t size) const {
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

void Connection::end(End how) const {
  const linger at_once{1, 0};
  if (how == End::kReset) {
    setsockopt(socket, SOL_SOCKET, SO_LINGER, &at_once, sizeof at_once);
    return;
  }
  if (ssl != nullptr && how == End::kClose) SSL_shutdown(ssl);
  shutdown(socket, SHUT_WR);
}

std::string Request::header(const std::string& name) const {
  for (const std::string& line : headers) {
    if (line.size() <= name.size() || line[name.size()] != ':' ||
        strncasecmp(line.c_str(), name.c_str(), name.size()) != 0) {
      continue;
    }
    const std::size_t value = line.find_first_not_of(' ', name.size() + 1);
    return value == std::string::npos ? "" : line.substr(value);
  }
  return "";
}

Request parseRequest(const std::string& raw) {
  Request request;
  request.raw = raw;
  const std::size_t end = raw.find("\r\n\r\n");
  std::size_t at = raw.find("\r\n");
  const std::string first = raw.substr(0, at);
  request.method = first.substr(0, first.find(' '));
  request.target =
      first.substr(request.method.size() + 1, first.rfind(' ') - request.method.size() - 1);
  while (at < end) {
    const std::size_t next = raw.find("\r\n", at + 2);
    request.headers.push_back(raw.substr(at + 2, next - at - 2));
    at = next;
  }
  request.body = raw.substr(end + 4);
  return request;
}

}  // namespace test
