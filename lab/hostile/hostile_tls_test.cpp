// Providers that cannot be trusted, speak what no provider should, or send without end, at each of
// the three requests of a login. (hostile_generated_test.cpp has those that break off or lie.)
#include <curl/curl.h>
#include <gtest/gtest.h>
#include <openssl/ssl.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <chrono>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <iostream>
#include <limits>
#include <memory>
#include <string>
#include <vector>

#include "sso/azuresso.h"
#include "sso/sso.h"
#include "support/hostile.h"
#include "support/token_check.h"

namespace {

using test::HostileProvider;
using test::Identity;
using test::Script;
using test::throws;

const char kNoKey[] = "kid does not exist in Azure verified kyes";

std::string http(const std::string& body) {
  return "HTTP/1.1 200 OK\r\nContent-Length: " + std::to_string(body.size()) +
         "\r\nConnection: close\r\n\r\n" + body;
}

constexpr size_t kMegabyte = 1 << 20;
#if defined(__SANITIZE_ADDRESS__)
constexpr bool kSanitized = true;
constexpr size_t kBody = 10 * kMegabyte;
#else
constexpr bool kSanitized = false;
constexpr size_t kBody = 100 * kMegabyte;
#endif

// Megabytes for what a login takes whatever the answers are: libraries, certificates, TLS.
constexpr size_t kOrdinary = 12;

// Whether memory is as the device would see it: checkers keep what is freed, and more beside it.
bool isMeasured() {
  const char* preloaded = std::getenv("LD_PRELOAD");
  return !kSanitized && (preloaded == nullptr || std::strstr(preloaded, "vgpreload") == nullptr);
}

// The most memory that a login took in its own process, in megabytes, less what it had.
size_t memoryOf(const std::function<void()>& login) {
  int ends[2];
  EXPECT_EQ(pipe(ends), 0);
  const pid_t child = fork();
  if (child == 0) {
    // The peak of the process starts anew with the child's own.
    rusage before{};
    rusage after{};
    getrusage(RUSAGE_SELF, &before);
    login();
    getrusage(RUSAGE_SELF, &after);
    const long kilobytes = testing::Test::HasFailure() ? -1 : after.ru_maxrss - before.ru_maxrss;
    _exit(write(ends[1], &kilobytes, sizeof kilobytes) == sizeof kilobytes ? 0 : 1);
  }
  close(ends[1]);
  long kilobytes = -1;
  EXPECT_EQ(read(ends[0], &kilobytes, sizeof kilobytes), static_cast<ssize_t>(sizeof kilobytes));
  close(ends[0]);
  waitpid(child, nullptr, 0);
  EXPECT_GE(kilobytes, 0) << "the login failed otherwise than it should";
  return kilobytes < 0 ? 0 : static_cast<size_t>(kilobytes) / 1024;
}

// A login whose three requests go to separate servers.
class Hostile : public testing::Test {
 protected:
  Hostile() {
    authority.trustAlone();
    test::writeConfig("profile.conf", R"({"sso_enable":true,"sso_profile":"azure"})", 0644);
    servers[0] = honest();
    servers[1] = honest();
    servers[2] = honest();
  }

  std::unique_ptr<HostileProvider> honest() const {
    return std::make_unique<HostileProvider>(authority.issue({"localhost"}));
  }

  // The right answer at each place.
  std::string document(size_t place) const {
    if (place == 0)
      return "{\"id_token\":\"" +
             test::rsaToken(test::anyRsaKey(), R"({"alg":"RS256","kid":"the key"})",
                            test::kCheckBody) +
             "\"}";
    if (place == 1) return "{\"jwks_uri\":\"" + servers[2]->url("/keys") + "\"}";
    return "{\"keys\":[" + test::anyRsaKey().jwk("the key") + "]}";
  }

  // Points the device at the servers and starts them; `bad` follows this script, the others are
  // honest.
  void start(size_t bad, const Script& script) {
    Json::Value file;
    file["azure_token_endpoint"] = servers[0]->url("/token");
    file["azure_wellknown"] = servers[1]->url("/discovery");
    file["azure_client_id"] = "the device";
    file["azure_tenant_id"] = "the tenant";
    file["azure_client_secret"] = "s3cret";
    test::writeConfig("azure.conf", file.toStyledString());
    for (size_t place = 0; place < 3; ++place) {
      Script good;
      good.bytes = http(document(place));
      const Script played = place == bad ? script : good;
      servers[place]->start([played](int, int) { return played; });
    }
    log.clear();
  }
  void start(size_t bad) {
    Script good;
    good.bytes = http(document(bad));
    start(bad, good);
  }

  // All that the log has of a login whose request at this place ended so.
  static std::vector<test::Expected> linesOf(size_t place, CURLcode code) {
    const std::string text = curl_easy_strerror(code);
    if (place == 0) return {{LOG_ERR, "sso.cpp", "request token uri " + text + "."}};
    const auto keys = [](const std::string& reason) {
      return test::Expected{LOG_ERR, "azuresso.cpp", "request wellknown uri " + reason + "."};
    };
    if (place == 2) return {keys(text)};
    return {{LOG_ERR, "sso.cpp", text}, keys(curl_easy_strerror(CURLE_URL_MALFORMAT))};
  }

  // The login fails since the request at this place ends in one of these errors.
  void expectLost(size_t place, const std::vector<CURLcode>& codes) {
    std::string user = "before";
    EXPECT_TRUE(throws<std::invalid_argument>(place == 0 ? "parse json falied" : kNoKey,
                                              [&] { QOVA::SSO::OIDCLogin("the code", user); }));
    EXPECT_EQ(user, "before");
    testing::AssertionResult known = testing::AssertionFailure();
    for (const CURLcode code : codes) {
      if (!known) known = log.is(linesOf(place, code));
    }
    EXPECT_TRUE(known);
  }

  // The server at this place is of this kind: nothing is sent to it, and no user is signed in.
  void expectRefused(const Identity& identity, const test::Dialect& dialect, CURLcode code,
                     const std::string& what) {
    for (size_t place = 0; place < 3; ++place) {
      SCOPED_TRACE(what + " at request " + std::to_string(place));
      for (auto& server : servers) server = honest();
      servers[place] = std::make_unique<HostileProvider>(identity, dialect);
      start(place);
      expectLost(place, {code});
      EXPECT_EQ(servers[place]->turns(), 1);
      EXPECT_EQ(servers[place]->requests(), 0) << "neither code nor secret was sent";
      for (size_t before = 0; before < place; ++before) EXPECT_EQ(servers[before]->requests(), 1);
    }
  }

  void expectLostWithin(size_t most, size_t place, const Script& script, CURLcode code);

  test::Ca authority;
  std::array<std::unique_ptr<HostileProvider>, 3> servers;
  test::Log log;
};

TEST_F(Hostile, ProvidersSignInWhenTheyAreNot) {
  start(0);
  std::string user;
  QOVA::SSO::OIDCLogin("the code", user);
  EXPECT_EQ(user, "CORP.EXAMPLE.COM\\Alice");
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(Hostile, CertificatesAreSeenThrough) {
  using test::Validity;
  const test::Ca stranger;
  const CURLcode refused = CURLE_PEER_FAILED_VERIFICATION;
  expectRefused(authority.issue({"localhost"}, Validity::kExpired), {}, refused, "expired");
  expectRefused(authority.issue({"localhost"}, Validity::kNotYet), {}, refused, "not yet valid");
  expectRefused(authority.issue({"another.example.com"}), {}, refused, "of another name");
  expectRefused(authority.issue({"*"}), {}, refused, "of every name");
  expectRefused(authority.issue({"localhost.example.com", "xlocalhost"}), {}, refused,
                "of like names");
  expectRefused(authority.issue({std::string("127.0.0.1")}), {}, refused, "of the address");
  expectRefused(stranger.issue({"localhost"}), {}, refused, "of an unknown authority");
  expectRefused(test::selfSigned({"localhost"}), {}, refused, "of its own");
}

// What a client hears that proves nothing and takes whatever TLS it is offered.
struct Heard {
  std::string version;
  bool encrypted = true;
  bool proven = true;
  std::string answer;
};

Heard heardCarelessly(int port, const test::Dialect& dialect) {
  const std::shared_ptr<SSL_CTX> context(SSL_CTX_new(TLS_client_method()), SSL_CTX_free);
  SSL_CTX_set_cipher_list(context.get(), dialect.ciphers.c_str());
  SSL_CTX_set_min_proto_version(context.get(), dialect.oldest);
  SSL_CTX_set_max_proto_version(context.get(), dialect.newest);
  const std::unique_ptr<BIO, decltype(&BIO_free_all)> bio(BIO_new_ssl_connect(context.get()),
                                                          BIO_free_all);
  BIO_set_conn_hostname(bio.get(), ("127.0.0.1:" + std::to_string(port)).c_str());
  Heard heard;
  if (BIO_do_connect(bio.get()) != 1) return heard;
  SSL* ssl = nullptr;
  BIO_get_ssl(bio.get(), &ssl);
  const SSL_CIPHER* cipher = SSL_get_current_cipher(ssl);
  heard.version = SSL_get_version(ssl);
  heard.encrypted = SSL_CIPHER_get_cipher_nid(cipher) != NID_undef;
  heard.proven = SSL_CIPHER_get_auth_nid(cipher) != NID_auth_null;
  const std::string request = "GET / HTTP/1.0\r\n\r\n";
  BIO_write(bio.get(), request.data(), static_cast<int>(request.size()));
  char part[1000];
  for (int size; (size = BIO_read(bio.get(), part, sizeof part)) > 0;)
    heard.answer.append(part, static_cast<size_t>(size));
  return heard;
}

// A server of this kind does speak, to whoever does not mind.
Heard heardFrom(const Identity& identity, const test::Dialect& dialect) {
  HostileProvider server(identity, dialect);
  Script script;
  script.bytes = http("heard");
  server.start([script](int, int) { return script; });
  Heard heard = heardCarelessly(server.port(), dialect);
  EXPECT_EQ(heard.answer, script.bytes) << "the server is at fault";
  return heard;
}

// What Debian's OpenSSL is set to refuse: all before TLS 1.2, and whatever encrypts or proves
// nothing.
TEST_F(Hostile, OldAndEmptyTlsIsRefused) {
  const Identity good = authority.issue({"localhost"});
  const std::string all = "ALL:COMPLEMENTOFALL:@SECLEVEL=0";
  const CURLcode refused = CURLE_SSL_CONNECT_ERROR;
  const test::Dialect first = {TLS1_VERSION, TLS1_VERSION, all, ""};
  EXPECT_EQ(heardFrom(good, first).version, "TLSv1");
  expectRefused(good, first, refused, "TLS 1.0");
  const test::Dialect second = {TLS1_1_VERSION, TLS1_1_VERSION, all, ""};
  EXPECT_EQ(heardFrom(good, second).version, "TLSv1.1");
  expectRefused(good, second, refused, "TLS 1.1");
  const int last = TLS1_2_VERSION;
  const test::Dialect open = {last, last, "eNULL:@SECLEVEL=0", ""};
  EXPECT_FALSE(heardFrom(good, open).encrypted);
  expectRefused(good, open, refused, "no encryption");
  const test::Dialect nobody = {last, last, "aNULL:@SECLEVEL=0", ""};
  EXPECT_FALSE(heardFrom(good, nobody).proven);
  expectRefused(good, nobody, refused, "no proof");
}

// A server that chooses HTTP/2 and does not speak it. (The first junk is a right answer in
// HTTP/1.1.)
TEST_F(Hostile, JunkInHttp2EndsTheRequest) {
  for (size_t place = 0; place < 3; ++place) {
    for (const std::string& junk :
         {http(document(place)), std::string("\0\0\0\4\0\0\0\0\0", 9) + std::string(200, '\xff'),
          std::string("\xff\xff\xff\0\0\0\0\0\1", 9) + std::string(1000, 'x'), std::string()}) {
      for (auto& server : servers) server = honest();
      servers[place] = std::make_unique<HostileProvider>(authority.issue({"localhost"}),
                                                         test::Dialect{0, 0, "", "h2"});
      Script script;
      script.bytes = junk;
      script.silenceMs = 100;  // for the client to read it before the connection is gone
      start(place, script);
      expectLost(place, {junk.empty() ? CURLE_PARTIAL_FILE : CURLE_GOT_NOTHING, CURLE_SEND_ERROR,
                         CURLE_RECV_ERROR});
      EXPECT_EQ(servers[place]->turns(), 1);
    }
  }
}

// There are no time-outs: a silent provider holds a login for as long as it likes, and no longer.
TEST_F(Hostile, SilenceLastsAsLongAsTheProviderLikes) {
  for (size_t place = 0; place < 3; ++place) {
    for (const Script::Stage stage :
         {Script::Stage::kAccept, Script::Stage::kHello, Script::Stage::kRequest}) {
      for (auto& server : servers) server = honest();
      Script silent;
      silent.stage = stage;
      silent.silenceMs = 300;
      silent.end = Script::End::kCut;
      start(place, silent);
      const auto begin = std::chrono::steady_clock::now();
      const bool asked = stage == Script::Stage::kRequest;
      expectLost(place, {asked ? CURLE_GOT_NOTHING : CURLE_SSL_CONNECT_ERROR});
      EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::milliseconds(300));
      EXPECT_EQ(servers[place]->turns(), 1);
    }
  }
}

// The login fails at this place, and takes so many megabytes at most.
void Hostile::expectLostWithin(size_t most, size_t place, const Script& script, CURLcode code) {
  for (auto& server : servers) server = honest();
  start(place, script);
  const size_t megabytes = memoryOf([&] { expectLost(place, {code}); });
  if (isMeasured()) {
    EXPECT_LE(megabytes, most);
  }
}

// Headers that never end: libcurl takes 300 KB of them, 100 KB in one line, and ends the request.
TEST_F(Hostile, EndlessHeadersEndTheRequest) {
  const std::string ok = "HTTP/1.1 200 OK\r\n";
  const struct {
    std::string start;
    std::string fill;
    CURLcode code;
  } floods[] = {
      {ok, "X-Filler: " + std::string(100, 'x') + "\r\n", CURLE_RECV_ERROR},
      {ok, "X: y\r\n", CURLE_RECV_ERROR},
      {ok, "Set-Cookie: a=b\r\n", CURLE_RECV_ERROR},
      {"", "HTTP/1.1 100 Continue\r\n\r\n", CURLE_RECV_ERROR},
      {"", "HTTP/1.1 103 Early Hints\r\nLink: x\r\n\r\n", CURLE_RECV_ERROR},
      {ok + "X-Filler: ", "y", CURLE_OUT_OF_MEMORY},
      {"HTTP/1.1 200 ", "K", CURLE_OUT_OF_MEMORY},
      {ok + "Transfer-Encoding: chunked\r\n\r\n0\r\nX: ", "y", CURLE_RECV_ERROR},
      {ok + "Transfer-Encoding: chunked\r\n\r\n", "0", CURLE_RECV_ERROR},
  };
  for (size_t place = 0; place < 3; ++place) {
    for (const auto& flood : floods) {
      SCOPED_TRACE(flood.start + flood.fill + " at request " + std::to_string(place));
      Script script;
      script.bytes = flood.start;
      script.fill = flood.fill;
      script.filler = std::numeric_limits<size_t>::max();
      expectLostWithin(kOrdinary, place, script, flood.code);
    }
  }
}

// Behind the last chunk libcurl reads on for as long as something comes, with no limit: it keeps
// each of the trailers. Behind the size of a chunk too, where it keeps nothing.
TEST_F(Hostile, TrailersTakeMemoryInProportion) {
  const std::string start = "HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n";
  for (size_t place = 0; place < 3; ++place) {
    SCOPED_TRACE("request " + std::to_string(place));
    Script script;
    script.bytes = start + "0\r\n";
    script.fill = "a:\r\n";  // what takes most
    script.filler = 2 * kMegabyte;
    expectLostWithin(kOrdinary + 2 * 20, place, script, CURLE_PARTIAL_FILE);
    script.bytes = start + "1;";
    script.fill = "y";
    script.filler = 20 * kMegabyte;
    expectLostWithin(kOrdinary, place, script, CURLE_PARTIAL_FILE);
  }
}

// A body of 100 MB is held as a whole, since there is no limit; what it takes stays in proportion:
// three times its size, and JSON a hundred times its text. (What an ordinary login takes comes on
// top.)
TEST_F(Hostile, BodiesOfAHundredMegabytesTakeMemoryInProportion) {
  struct Body {
    size_t place;
    std::string start;
    std::string fill;
    std::string tail;
    const char* message;  // of the code exchange
    size_t times;         // its size at most
    size_t size = kBody;
  };
  const size_t text = 2 * kMegabyte;
  const std::string nested = std::string(900, '[') + std::string(900, ']') + ',';
  const std::vector<Body> bodies = {
      {0, "{\"id_token\":\"", "x", "\"}", "bad jwt format!", 3},
      {0, "", " ", "", "parse json falied", 3},
      {1, "{\"jwks_uri\":\"https:", "<html>", "", "", 3},
      {2, "", "[", "", "", 3},
      {2, "{\"keys\":[", "0,", "0]}", "", 100, text},
      {2, "{\"keys\":[", "[],", "0]}", "", 100, text - text % 3},
      {2, "{\"keys\":[", nested, "0]}", "", 100, text - text % nested.size()},
      {2, "{\"keys\":[", "{\"\":0},", "0]}", "", 100, text - text % 7},
  };
  for (const Body& body : bodies) {
    for (auto& server : servers) server = honest();
    Script script;
    script.bytes = "HTTP/1.0 200 OK\r\n\r\n" + body.start;
    script.fill = body.fill;
    script.filler = body.size;
    script.tail = body.tail;
    start(body.place, script);
    const size_t megabytes = memoryOf([&] {
      std::string user = "before";
      EXPECT_TRUE(throws<std::invalid_argument>(body.place == 0 ? body.message : kNoKey,
                                                [&] { QOVA::SSO::OIDCLogin("the code", user); }));
    });
    std::cout << body.size / kMegabyte << " MB at request " << body.place << ": " << megabytes
              << " MB\n";
    if (!isMeasured()) continue;
    EXPECT_GE(megabytes, body.size / kMegabyte * 9 / 10) << "it arrived";
    EXPECT_LE(megabytes, kOrdinary + body.times * body.size / kMegabyte);
  }
}

}  // namespace
