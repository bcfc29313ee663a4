// Providers that cannot be trusted, speak what nobody should, or send without end, at each of the
// three requests of a login. (hostile_generated_test.cpp has those that break off or lie.)
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
#include <memory>
#include <string>
#include <vector>

#include "sso/azuresso.h"
#include "sso/sso.h"
#include "support/bench.h"
#include "support/hostile.h"

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

// A login whose three requests go to servers of their own.
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
                            test::kBenchBody) +
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

  // The login fails at this place, with a line in the log that begins so.
  void expectLost(size_t place, const std::string& text) {
    std::string user = "before";
    EXPECT_TRUE(throws<std::invalid_argument>(place == 0 ? "parse json falied" : kNoKey,
                                              [&] { QOVA::SSO::OIDCLogin("the code", user); }));
    EXPECT_EQ(user, "before");
    const std::array<std::string, 3> starts = {"request token uri ", "", "request wellknown uri "};
    ASSERT_FALSE(log.lines().empty());
    EXPECT_NE(log.lines()[0].text.find(" " + starts[place] + text), std::string::npos)
        << log.lines()[0].text;
  }

  // The server at this place is of this kind: nothing is sent to it, and nobody signed in.
  void expectRefused(const Identity& identity, const test::Dialect& dialect, CURLcode code,
                     const std::string& what) {
    for (size_t place = 0; place < 3; ++place) {
      SCOPED_TRACE(what + " at request " + std::to_string(place));
      for (auto& server : servers) server = honest();
      servers[place] = std::make_unique<HostileProvider>(identity, dialect);
      start(place);
      expectLost(place, curl_easy_strerror(code));
      EXPECT_EQ(servers[place]->turns(), 1);
      EXPECT_EQ(servers[place]->requests(), 0) << "neither code nor secret was sent";
      for (size_t before = 0; before < place; ++before) EXPECT_EQ(servers[before]->requests(), 1);
    }
  }

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

// What Debian's OpenSSL is set to refuse: all before TLS 1.2, and whatever encrypts or proves
// nothing.
TEST_F(Hostile, OldAndEmptyTlsIsRefused) {
  const Identity good = authority.issue({"localhost"});
  const std::string all = "ALL:COMPLEMENTOFALL:@SECLEVEL=0";
  const CURLcode refused = CURLE_SSL_CONNECT_ERROR;
  expectRefused(good, {TLS1_VERSION, TLS1_VERSION, all, ""}, refused, "TLS 1.0");
  expectRefused(good, {TLS1_1_VERSION, TLS1_1_VERSION, all, ""}, refused, "TLS 1.1");
  const int last = TLS1_2_VERSION;
  expectRefused(good, {last, last, "eNULL:@SECLEVEL=0", ""}, refused, "no encryption");
  expectRefused(good, {last, last, "aNULL:@SECLEVEL=0", ""}, refused, "no proof");
}

// A server that chooses HTTP/2 and does not speak it.
TEST_F(Hostile, JunkInHttp2EndsTheRequest) {
  for (size_t place = 0; place < 3; ++place) {
    for (const std::string& junk :
         {http(document(place)), std::string("\0\0\0\4\0\0\0\0\0", 9) + std::string(200, '\xff'),
          std::string("\xff\xff\xff\0\0\0\0\0\1", 9) + std::string(1000, 'x'), std::string()}) {
      for (auto& server : servers) server = honest();
      servers[place] = std::make_unique<HostileProvider>(authority.issue({"localhost"}),
                                                         test::Dialect{0, 0, "", "h2"});
      Script script;
      script.stage = Script::Stage::kHandshake;
      script.bytes = junk;
      start(place, script);
      expectLost(place, "");
    }
  }
}

// There are no time-outs: a silent provider holds a login for as long as it likes, and no longer.
TEST_F(Hostile, SilenceLastsAsLongAsTheProviderLikes) {
  for (const Script::Stage stage :
       {Script::Stage::kAccept, Script::Stage::kHello, Script::Stage::kRequest}) {
    for (auto& server : servers) server = honest();
    Script silent;
    silent.stage = stage;
    silent.silenceMs = 400;
    silent.end = Script::End::kCut;
    start(0, silent);
    const auto begin = std::chrono::steady_clock::now();
    expectLost(0, "");
    EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::milliseconds(400));
  }
}

constexpr size_t kMegabyte = 1 << 20;
#if defined(__SANITIZE_ADDRESS__)
constexpr bool kSanitized = true;
constexpr size_t kBody = 10 * kMegabyte;
#else
constexpr bool kSanitized = false;
constexpr size_t kBody = 100 * kMegabyte;
#endif

// Whether memory is as the device would see it: checkers keep what is freed, and more beside it.
bool isMeasured() {
  const char* preloaded = std::getenv("LD_PRELOAD");
  return !kSanitized && (preloaded == nullptr || std::strstr(preloaded, "vgpreload") == nullptr);
}

// The most memory that a login took in a process of its own, in megabytes, less what it had.
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

// A body of 100 MB is held as a whole, since there is no limit; what it takes stays in proportion.
TEST_F(Hostile, BodiesOfAHundredMegabytesTakeMemoryInProportion) {
  struct Body {
    size_t place;
    const char* start;
    const char* fill;
    const char* tail;
    const char* message;  // of the code exchange
    size_t size = kBody;
    size_t most = 450;  // megabytes
  };
  const std::vector<Body> bodies = {
      {0, "{\"id_token\":\"", "x", "\"}", "bad jwt format!"},
      {0, "", " ", "", "parse json falied"},
      {1, "{\"jwks_uri\":\"https:", "<html>", "", "parse json falied"},
      {2, "", "[", "", "parse json falied"},
      // Every value costs some fifty times its two bytes.
      {2, "{\"keys\":[", "0,", "0]}", "", 2 * kMegabyte, 200},
  };
  for (const Body& body : bodies) {
    for (auto& server : servers) server = honest();
    Script script;
    script.bytes = std::string("HTTP/1.0 200 OK\r\n\r\n") + body.start;
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
    EXPECT_LE(megabytes, body.most);
  }
}

}  // namespace
