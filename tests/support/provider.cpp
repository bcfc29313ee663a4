#include "support/provider.h"

#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <stdexcept>

namespace test {
namespace {

constexpr unsigned kLifeSeconds = 100;
constexpr long kSilenceSeconds = 20;

void require(bool good, const char* what) {
  if (!good) throw std::runtime_error(std::string("test provider: ") + what);
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

void sendAnswer(const Connection& connection, const Answer& answer) {
  if (answer.delayMs > 0) usleep(static_cast<useconds_t>(answer.delayMs) * 1000);
  const std::string text = bytesOf(answer).substr(0, answer.cut);
  // Chunks go out at once: one that is cut on its way would arrive as two.
  const std::size_t piece = answer.chunked ? 0 : answer.piece;
  if (connection.send(text, piece) && answer.cut == std::string::npos) connection.end();
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

Provider::Provider(int port) : server(port) {}

Provider::Provider(const Identity& own, int port) : Provider(port) {
  identity = own;
  tls = true;
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
  const std::shared_ptr<SSL_CTX> context = tls ? serverContext(identity) : nullptr;
  std::map<std::string, std::size_t> given;
  for (;;) {
    const int socket = accept(listener, nullptr, nullptr);
    require(socket >= 0, "accept");
    Connection connection(socket, kSilenceSeconds);
    if (tls && !connection.shakeHands(context.get())) continue;
    const std::string raw = connection.receiveRequest();
    if (raw.empty()) continue;
    received.putPart(raw);
    const Request request = parseRequest(raw);
    const std::string path = request.target.substr(0, request.target.find('?'));
    auto found = script.find(request.method + " " + path);
    if (found == script.end()) found = script.find(path);
    if (found == script.end()) {
      sendAnswer(connection, failed(404, ""));
      continue;
    }
    const std::size_t turn = std::min(given[found->first]++, found->second.size() - 1);
    sendAnswer(connection, found->second[turn]);
  }
}

std::string Provider::url(const std::string& path, const std::string& host) const {
  return (tls ? "https://" : "http://") + host + ":" + std::to_string(port()) + path;
}

std::vector<Request> Provider::requests() const {
  std::vector<Request> all;
  for (const std::string& raw : received.parts()) all.push_back(parseRequest(raw));
  return all;
}

int unusedPort() {
  return Server().port();
}

}  // namespace test
