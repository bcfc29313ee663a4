#include "support/provider.h"

#include <openssl/pem.h>
#include <openssl/ssl.h>
#include <strings.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <stdexcept>

namespace test {
namespace {

constexpr unsigned kLifeSeconds = 100;
constexpr long kSilenceSeconds = 20;

void require(bool good, const char* what) {
  if (!good) throw std::runtime_error(std::string("test provider: ") + what);
}

// One connection, plain or over TLS.
class Connection {
 public:
  Connection(int accepted, SSL_CTX* context) : socket(accepted) {
    const timeval silence{kSilenceSeconds, 0};
    setsockopt(socket, SOL_SOCKET, SO_RCVTIMEO, &silence, sizeof silence);
    setsockopt(socket, SOL_SOCKET, SO_SNDTIMEO, &silence, sizeof silence);
    if (context == nullptr) return;
    ssl = SSL_new(context);
    SSL_set_fd(ssl, socket);
    usable = SSL_accept(ssl) == 1;
  }
  ~Connection() {
    if (ssl != nullptr) SSL_free(ssl);
    close(socket);
  }
  Connection(const Connection&) = delete;
  Connection& operator=(const Connection&) = delete;

  bool isUsable() const { return usable; }

  bool receive(std::string* into) {
    char piece[16384];
    const auto n = ssl != nullptr ? SSL_read(ssl, piece, sizeof piece)
                                  : static_cast<int>(recv(socket, piece, sizeof piece, 0));
    if (n > 0) into->append(piece, static_cast<std::size_t>(n));
    return n > 0;
  }

  bool send(const char* data, std::size_t size) {
    while (size > 0) {
      const int most = static_cast<int>(std::min<std::size_t>(size, 1 << 20));
      const auto n =
          ssl != nullptr
              ? SSL_write(ssl, data, most)
              : static_cast<int>(::send(socket, data, static_cast<std::size_t>(most), 0));
      if (n <= 0) return false;
      data += n;
      size -= static_cast<std::size_t>(n);
    }
    return true;
  }

  void finish() {
    if (ssl != nullptr) SSL_shutdown(ssl);
    shutdown(socket, SHUT_WR);
  }

 private:
  int socket;
  SSL* ssl = nullptr;
  bool usable = true;
};

SSL_CTX* newContext(const Identity& identity) {
  SSL_CTX* context = SSL_CTX_new(TLS_server_method());
  BIO* certificate = BIO_new_mem_buf(identity.certificate.data(), -1);
  BIO* key = BIO_new_mem_buf(identity.key.data(), -1);
  X509* x = PEM_read_bio_X509(certificate, nullptr, nullptr, nullptr);
  EVP_PKEY* k = PEM_read_bio_PrivateKey(key, nullptr, nullptr, nullptr);
  require(SSL_CTX_use_certificate(context, x) == 1 && SSL_CTX_use_PrivateKey(context, k) == 1,
          "unusable certificate");
  X509_free(x);
  EVP_PKEY_free(k);
  BIO_free(certificate);
  BIO_free(key);
  return context;
}

Request parsed(const std::string& raw) {
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

// A whole request, or an empty text.
std::string receiveRequest(Connection& connection) {
  std::string raw;
  std::size_t end;
  while ((end = raw.find("\r\n\r\n")) == std::string::npos) {
    if (!connection.receive(&raw) || raw[0] < 'A' || raw[0] > 'Z') return "";  // not HTTP
  }
  const Request request = parsed(raw);
  const std::string length = request.header("Content-Length");
  const std::size_t size = end + 4 + (length.empty() ? 0 : std::stoul(length));
  static const std::string kContinue = "HTTP/1.1 100 Continue\r\n\r\n";
  if (!request.header("Expect").empty()) connection.send(kContinue.data(), kContinue.size());
  while (raw.size() < size) {
    if (!connection.receive(&raw)) return "";
  }
  return raw;
}

std::string hex(std::size_t n) {
  char text[32];
  std::snprintf(text, sizeof text, "%zx", n);
  return text;
}

std::string inChunks(const std::string& body, std::size_t piece) {
  std::string text;
  for (std::size_t at = 0; at < body.size();) {
    const std::size_t n = std::min(piece == 0 ? body.size() : piece, body.size() - at);
    text += hex(n) + "\r\n" + body.substr(at, n) + "\r\n";
    at += n;
  }
  return text + "0\r\n\r\n";
}

std::string bytesOf(const Answer& answer) {
  if (!answer.raw.empty()) return answer.raw;
  std::string text = "HTTP/1.1 " + std::to_string(answer.status) + " Answer\r\n";
  for (const std::string& header : answer.headers) text += header + "\r\n";
  text += "Connection: close\r\n";
  if (answer.chunked) {
    return text + "Transfer-Encoding: chunked\r\n\r\n" + inChunks(answer.body, answer.piece);
  }
  const long long length =
      answer.contentLength >= 0 ? answer.contentLength : static_cast<long long>(answer.body.size());
  return text + "Content-Length: " + std::to_string(length) + "\r\n\r\n" + answer.body;
}

void sendAnswer(Connection& connection, const Answer& answer) {
  if (answer.delayMs > 0) usleep(static_cast<useconds_t>(answer.delayMs) * 1000);
  const std::string text = bytesOf(answer).substr(0, answer.cut);
  // Chunks go out at once: one that is cut on its way would arrive as two.
  const std::size_t piece = answer.piece == 0 || answer.chunked ? text.size() : answer.piece;
  for (std::size_t at = 0; at < text.size(); at += piece) {
    if (!connection.send(text.data() + at, std::min(piece, text.size() - at))) return;
  }
  if (answer.cut == std::string::npos) connection.finish();
}

void record(int file, const std::string& raw) {
  const std::string text = std::to_string(raw.size()) + "\n" + raw;
  require(write(file, text.data(), text.size()) == static_cast<ssize_t>(text.size()), "record");
}

}  // namespace

Answer ok(std::string body) {
  return failed(200, std::move(body));
}

Answer failed(int status, std::string body) {
  Answer answer;
  answer.status = status;
  answer.body = std::move(body);
  return answer;
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

Provider::Provider(int port) : server(port), records(memfd_create("requests", MFD_CLOEXEC)) {}

Provider::Provider(const Identity& own, int port) : Provider(port) {
  identity = own;
  tls = true;
}

Provider::~Provider() {
  close(records);
}

Provider& Provider::answer(const std::string& path, Answer answer) {
  require(!server.isStarted(), "an answer after the start");
  script[path].push_back(std::move(answer));
  return *this;
}

void Provider::start() {
  server.start([this](int listener) { serve(listener); }, kLifeSeconds);
}

void Provider::serve(int listener) {
  SSL_CTX* context = tls ? newContext(identity) : nullptr;
  std::map<std::string, std::size_t> given;
  for (;;) {
    const int socket = accept(listener, nullptr, nullptr);
    require(socket >= 0, "accept");
    Connection connection(socket, context);
    const std::string raw = connection.isUsable() ? receiveRequest(connection) : "";
    if (raw.empty()) continue;
    record(records, raw);
    const std::string target = parsed(raw).target;
    const std::string path = target.substr(0, target.find('?'));
    const auto found = script.find(path);
    if (found == script.end()) {
      sendAnswer(connection, failed(404, ""));
      continue;
    }
    const std::size_t turn = std::min(given[path]++, found->second.size() - 1);
    sendAnswer(connection, found->second[turn]);
  }
}

std::string Provider::url(const std::string& path, const std::string& host) const {
  return (tls ? "https://" : "http://") + host + ":" + std::to_string(port()) + path;
}

std::vector<Request> Provider::requests() const {
  std::string text;
  char piece[65536];
  for (ssize_t n; (n = pread(records, piece, sizeof piece, static_cast<off_t>(text.size()))) > 0;) {
    text.append(piece, static_cast<std::size_t>(n));
  }
  std::vector<Request> all;
  for (std::size_t at = 0; at < text.size();) {
    const std::size_t line = text.find('\n', at);
    const std::size_t size = std::stoul(text.substr(at, line - at));
    all.push_back(parsed(text.substr(line + 1, size)));
    at = line + 1 + size;
  }
  return all;
}

int unusedPort() {
  return Server().port();
}

}  // namespace test
