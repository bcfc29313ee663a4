// httpGet and httpPost against real servers: what they send, what they hand on, how they fail.
#include <curl/curl.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <ostream>

#include "sso/utils.h"
#include "support/ca.h"
#include "support/log.h"
#include "support/provider.h"
#include "support/throws.h"

namespace {

using namespace QOVA::SSO;

unsigned append(void* data, unsigned size, unsigned count, void* userData) {
  static_cast<std::string*>(userData)->append(static_cast<char*>(data), size * count);
  return size * count;
}

// Both functions, so that one test shows a behaviour of either.
enum class Method { kGet, kPost };

void PrintTo(Method method, std::ostream* out) {
  *out << (method == Method::kGet ? "get" : "post");
}

void request(Method method, const std::string& url, std::string& response, bool verifySSL = true,
             unsigned (*writeFn)(void*, unsigned, unsigned, void*) = append) {
  if (method == Method::kGet) {
    httpGet(url, response, verifySSL, writeFn);
  } else {
    httpPost(url, "x=1", response, verifySSL, writeFn);
  }
}

class Http : public testing::TestWithParam<Method> {
 protected:
  std::string fetch(const std::string& url, bool verifySSL = true) {
    std::string response;
    request(GetParam(), url, response, verifySSL);
    return response;
  }

  // Ends in an error of libcurl with this code, and says nothing in the log.
  testing::AssertionResult failsWith(CURLcode code, const std::string& url, bool verifySSL = true) {
    test::Log log;
    const auto result =
        test::throws<sso_err_resp>(curl_easy_strerror(code), [&] { fetch(url, verifySSL); });
    return result ? log.isEmpty() : result;
  }
};
INSTANTIATE_TEST_SUITE_P(, Http, testing::Values(Method::kGet, Method::kPost),
                         [](const auto& each) -> std::string {
                           return each.param == Method::kGet ? "get" : "post";
                         });

// No user agent, no cookies, no encodings: libcurl's defaults and nothing else.
TEST(HttpRequest, GetSendsLibcurlsDefaultsAlone) {
  test::Provider provider;
  provider.answer("/a", test::ok("")).start();
  std::string response;
  httpGet(provider.url("/a?b=c&d=%20;e"), response, true, append);
  ASSERT_EQ(provider.requests().size(), 1u);
  EXPECT_EQ(provider.requests()[0].raw,
            "GET /a?b=c&d=%20;e HTTP/1.1\r\nHost: localhost:" + std::to_string(provider.port()) +
                "\r\nAccept: */*\r\n\r\n");
}

TEST(HttpRequest, UrlIsTakenAsLibcurlReadsIt) {
  test::Provider provider;
  provider.answer("/a", test::ok("body")).start();
  std::string response;
  httpGet(provider.url("/a#fragment"), response, true, append);
  httpGet(provider.url("/a") + std::string("\0/b", 3), response, true, append);
  httpGet("localhost:" + std::to_string(provider.port()) + "/a", response, true, append);
  EXPECT_EQ(response, "bodybodybody");
  for (const auto& each : provider.requests()) EXPECT_EQ(each.target, "/a");
}

TEST(HttpRequest, PostSendsTheBodyAsAForm) {
  test::Provider provider;
  provider.answer("/token", test::ok("")).start();
  std::string response;
  httpPost(provider.url("/token"), "client_id=a%20b&code=%2B\n", response, true, append);
  const auto requests = provider.requests();
  ASSERT_EQ(requests.size(), 1u);
  EXPECT_EQ(requests[0].raw,
            "POST /token HTTP/1.1\r\nHost: localhost:" + std::to_string(provider.port()) +
                "\r\nAccept: */*\r\nContent-Length: 25\r\n"
                "Content-Type: application/x-www-form-urlencoded\r\n\r\n"
                "client_id=a%20b&code=%2B\n");
}

TEST(HttpRequest, PostOfAnEmptyBodyIsStillAPost) {
  test::Provider provider;
  provider.answer("/token", test::ok("done")).start();
  std::string response;
  httpPost(provider.url("/token"), "", response, true, append);
  EXPECT_EQ(response, "done");
  ASSERT_EQ(provider.requests().size(), 1u);
  EXPECT_EQ(provider.requests()[0].method, "POST");
  EXPECT_EQ(provider.requests()[0].header("Content-Length"), "0");
}

TEST(HttpRequest, PostBodyOfSeveralMegabytesArrivesWhole) {
  test::Provider provider;
  provider.answer("/token", test::ok("done")).start();
  std::string body;
  for (int i = 0; i < 500000; ++i) body += std::to_string(i);
  std::string response;
  httpPost(provider.url("/token"), body, response, true, append);
  EXPECT_EQ(response, "done");
  ASSERT_EQ(provider.requests().size(), 1u);
  EXPECT_TRUE(provider.requests()[0].body == body);
}

// The body is handed to libcurl as a text, without a length.
TEST(HttpRequest, PostBodyEndsAtItsFirstZeroByte) {
  test::Provider provider;
  provider.answer("/token", test::ok("")).start();
  std::string response;
  httpPost(provider.url("/token"), std::string("a=1\0&b=2", 8), response, true, append);
  ASSERT_EQ(provider.requests().size(), 1u);
  EXPECT_EQ(provider.requests()[0].body, "a=1");
}

TEST_P(Http, DeliversTheBodyOfAnErrorStatus) {
  for (const int status : {400, 401, 404, 500, 503}) {
    test::Provider provider;
    provider.answer("/", test::failed(status, R"({"error":"invalid_grant"})")).start();
    EXPECT_EQ(fetch(provider.url("/")), R"({"error":"invalid_grant"})") << status;
  }
}

TEST_P(Http, AppendsToWhatTheResponseHolds) {
  test::Provider provider;
  provider.answer("/", test::ok("body")).start();
  std::string response = "before ";
  request(GetParam(), provider.url("/"), response);
  request(GetParam(), provider.url("/"), response);
  EXPECT_EQ(response, "before bodybody");
}

TEST_P(Http, ReturnsNormallyWithoutABody) {
  test::Provider provider;
  provider.answer("/", test::failed(204, "")).start();
  EXPECT_EQ(fetch(provider.url("/")), "");
}

TEST_P(Http, DoesNotFollowRedirects) {
  test::Provider provider;
  test::Answer moved = test::failed(302, "moved");
  moved.headers = {"Location: " + provider.url("/elsewhere")};
  provider.answer("/", moved).answer("/elsewhere", test::ok("elsewhere")).start();
  EXPECT_EQ(fetch(provider.url("/")), "moved");
  EXPECT_EQ(provider.requests().size(), 1u);
}

TEST_P(Http, PutsAnAnswerInPiecesTogether) {
  std::string body;
  for (int i = 0; i < 2000; ++i) body += std::to_string(i);
  test::Answer pieces = test::ok(body);
  pieces.piece = 97;
  test::Answer chunks = pieces;
  chunks.chunked = true;
  test::Provider provider;
  provider.answer("/pieces", pieces).answer("/chunks", chunks).start();
  EXPECT_EQ(fetch(provider.url("/pieces")), body);
  EXPECT_EQ(fetch(provider.url("/chunks")), body);
}

// Chunks carry any bytes; what becomes of a zero byte is the write function's business.
TEST_P(Http, HandsZeroBytesToTheWriteFunction) {
  const std::string body("a\0b\0\0c", 6);
  test::Provider provider;
  provider.answer("/", test::ok(body)).start();
  EXPECT_EQ(fetch(provider.url("/")), body);
}

struct Received {
  std::string text;
  std::size_t calls = 0;
  std::size_t largest = 0;
  bool sizeIsOne = true;
} received;
const void* expectedUserData;

unsigned collect(void* data, unsigned size, unsigned count, void* userData) {
  EXPECT_EQ(userData, expectedUserData);
  received.text.append(static_cast<char*>(data), size * count);
  received.largest = std::max<std::size_t>(received.largest, size * count);
  received.sizeIsOne = received.sizeIsOne && size == 1;
  ++received.calls;
  return size * count;
}

// The write function's type is narrower than libcurl's; both meet in every one of these calls.
TEST_P(Http, MovesSeveralMegabytesThroughTheCallersWriteFunction) {
  std::string body;
  for (int i = 0; body.size() < (6u << 20); ++i) body += std::to_string(i) + '\0';
  test::Provider provider;
  provider.answer("/", test::ok(body)).start();
  std::string response = "untouched";
  expectedUserData = &response;
  received = Received();
  request(GetParam(), provider.url("/"), response, true, collect);
  EXPECT_TRUE(received.text == body);
  EXPECT_GT(received.calls, 100u);
  EXPECT_LE(received.largest, static_cast<std::size_t>(CURL_MAX_WRITE_SIZE));
  EXPECT_TRUE(received.sizeIsOne);
  EXPECT_EQ(response, "untouched");
}

unsigned takeNothing(void*, unsigned, unsigned, void*) {
  return 0;
}
unsigned takeOneLess(void*, unsigned size, unsigned count, void*) {
  return size * count - 1;
}
unsigned takeOneMore(void*, unsigned size, unsigned count, void*) {
  return size * count + 1;
}

TEST_P(Http, EndsWhenTheWriteFunctionTakesAnotherCount) {
  test::Provider provider;
  provider.answer("/", test::ok("body")).start();
  for (const auto writeFn : {takeNothing, takeOneLess, takeOneMore}) {
    std::string response;
    EXPECT_TRUE(test::throws<sso_err_resp>(curl_easy_strerror(CURLE_WRITE_ERROR), [&] {
      request(GetParam(), provider.url("/"), response, true, writeFn);
    }));
  }
}

TEST_P(Http, TransportFailuresCarryLibcurlsText) {
  const std::string port = std::to_string(test::unusedPort());
  EXPECT_TRUE(failsWith(CURLE_COULDNT_CONNECT, "http://127.0.0.1:" + port + "/"));
  EXPECT_TRUE(failsWith(CURLE_COULDNT_RESOLVE_HOST, "http://no-such-host.invalid/"));
  EXPECT_TRUE(failsWith(CURLE_URL_MALFORMAT, ""));
  EXPECT_TRUE(failsWith(CURLE_URL_MALFORMAT, "http://"));
  EXPECT_TRUE(failsWith(CURLE_UNSUPPORTED_PROTOCOL, "gopherish://localhost/"));
}

TEST_P(Http, BrokenAnswersCarryLibcurlsText) {
  test::Provider provider;
  test::Answer silent;
  silent.cut = 0;
  test::Answer shortBody = test::ok("part");
  shortBody.contentLength = 100;
  test::Answer shortChunk = test::ok("a whole chunk");
  shortChunk.chunked = true;
  shortChunk.cut = 90;
  provider.answer("/silent", silent)
      .answer("/body", shortBody)
      .answer("/chunk", shortChunk)
      .start();
  EXPECT_TRUE(failsWith(CURLE_GOT_NOTHING, provider.url("/silent")));
  EXPECT_TRUE(failsWith(CURLE_PARTIAL_FILE, provider.url("/body")));
  EXPECT_TRUE(failsWith(CURLE_PARTIAL_FILE, provider.url("/chunk")));
}

TEST_P(Http, KeepsWhatArrivedBeforeAFailure) {
  test::Provider provider;
  test::Answer shortBody = test::ok("part");
  shortBody.contentLength = 100;
  provider.answer("/", shortBody).start();
  std::string response;
  EXPECT_THROW(request(GetParam(), provider.url("/"), response), sso_err_resp);
  EXPECT_EQ(response, "part");
}

TEST_P(Http, WorksAgainAfterAFailure) {
  test::Provider provider;
  provider.answer("/", test::ok("body")).start();
  EXPECT_THROW(fetch("http://"), sso_err_resp);
  EXPECT_EQ(fetch(provider.url("/")), "body");
  EXPECT_EQ(fetch(provider.url("/")), "body");
}

TEST_P(Http, LeavesProxyVariablesToLibcurl) {
  test::Provider proxy;
  proxy.answer("http://provider.invalid/a", test::ok("through the proxy")).start();
  setenv("http_proxy", proxy.url("").c_str(), 1);
  EXPECT_EQ(fetch("http://provider.invalid/a"), "through the proxy");
  unsetenv("http_proxy");
}

TEST_P(Http, TrustsACertificateOfAKnownAuthority) {
  test::Ca ca;
  ca.trust();
  test::Provider provider(ca.issue({"localhost"}));
  provider.answer("/", test::ok("body")).start();
  EXPECT_EQ(fetch(provider.url("/")), "body");
}

// Each of them is refused with verification on, before anything is sent, and taken with it off.
TEST_P(Http, VerificationDecidesAboutDoubtfulCertificates) {
  test::Ca ca;
  ca.trust();
  const test::Ca stranger;
  const struct {
    const char* what;
    test::Identity identity;
  } doubtful[] = {
      {"its own issuer", test::selfSigned({"localhost"})},
      {"of an unknown authority", stranger.issue({"localhost"})},
      {"for another host", ca.issue({"elsewhere.example"})},
      {"expired", ca.issue({"localhost"}, test::Validity::kExpired)},
      {"not valid yet", ca.issue({"localhost"}, test::Validity::kNotYet)},
  };
  for (const auto& each : doubtful) {
    SCOPED_TRACE(each.what);
    test::Provider provider(each.identity);
    provider.answer("/", test::ok("body")).start();
    EXPECT_TRUE(failsWith(CURLE_PEER_FAILED_VERIFICATION, provider.url("/")));
    EXPECT_TRUE(provider.requests().empty());
    EXPECT_EQ(fetch(provider.url("/"), false), "body");
  }
}

TEST_P(Http, VerificationComparesTheHostName) {
  test::Ca ca;
  ca.trust();
  test::Provider provider(ca.issue({"localhost"}));
  provider.answer("/", test::ok("body")).start();
  EXPECT_TRUE(failsWith(CURLE_PEER_FAILED_VERIFICATION, provider.url("/", "127.0.0.1")));
  EXPECT_EQ(fetch(provider.url("/", "127.0.0.1"), false), "body");
}

TEST_P(Http, PlainTextWhereTlsIsExpectedFails) {
  test::Provider provider;
  provider.answer("/", test::ok("body")).start();
  const std::string url = "https://localhost:" + std::to_string(provider.port()) + "/";
  EXPECT_TRUE(failsWith(CURLE_SSL_CONNECT_ERROR, url));
  EXPECT_TRUE(failsWith(CURLE_SSL_CONNECT_ERROR, url, false));
}

}  // namespace
