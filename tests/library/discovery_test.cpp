// RequestWellknownInfo and RequestTokenEndpoint: what they ask, what they leave behind, and the
// lines they write instead of failing.
#include <gtest/gtest.h>
#include <json/reader.h>

#include <cstring>
#include <new>
#include <stdexcept>

#include "sso/sso.h"
#include "support/ca.h"
#include "support/curl_spy.h"
#include "support/log.h"
#include "support/provider.h"
#include "support/throws.h"

namespace {

using namespace QOVA::SSO;

struct Client : SSOClient {
  Client(const std::string& wellknownURL, const std::string& tokenURL) {
    wellknownEndpoint = wellknownURL;
    tokenEndpoint = tokenURL;
  }
};

class Discovery : public testing::Test {
 protected:
  void discover(const test::Answer& answer) {
    provider.answer("/wellknown", answer).start();
    discover();
  }
  void discover() {
    Client client(provider.url("/wellknown"), "");
    client.RequestWellknownInfo(doc);
  }
  void exchange(const test::Answer& answer, const std::string& params = "a=1") {
    provider.answer("/token", answer).start();
    exchange(params);
  }
  void exchange(const std::string& params = "a=1") {
    Client client("", provider.url("/token"));
    client.RequestTokenEndpoint(response, params);
  }

  // What jsoncpp makes of a text, good or bad.
  static Json::Value readAs(const std::string& text) {
    Json::Value value;
    std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    reader->parse(text.data(), text.data() + text.size(), &value, nullptr);
    return value;
  }

  test::Provider provider;
  test::Log log;
  Json::Value doc;
  std::string response;
};

using Wellknown = Discovery;
using TokenEndpoint = Discovery;

const std::string kLibcurlConnect = curl_easy_strerror(CURLE_COULDNT_CONNECT);

TEST_F(Wellknown, DocumentIsFetchedAndParsed) {
  discover(test::ok(R"({"jwks_uri":"https://provider/keys","nested":{"a":[1,2]}})"));
  EXPECT_EQ(doc["jwks_uri"].asString(), "https://provider/keys");
  EXPECT_EQ(doc["nested"]["a"].size(), 2u);
  EXPECT_TRUE(log.isEmpty());
  ASSERT_EQ(provider.requests().size(), 1u);
  EXPECT_EQ(provider.requests()[0].method, "GET");
  EXPECT_EQ(provider.requests()[0].target, "/wellknown");
}

TEST_F(Wellknown, DocumentReplacesWhatWasThere) {
  doc["old"] = 1;
  discover(test::ok(R"({"new":2})"));
  EXPECT_FALSE(doc.isMember("old"));
  EXPECT_EQ(doc["new"].asInt(), 2);
}

TEST_F(Wellknown, DocumentOfAnErrorStatusIsParsedAllTheSame) {
  discover(test::failed(503, R"({"error":"later"})"));
  EXPECT_EQ(doc["error"].asString(), "later");
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(Wellknown, CommentsAreCollected) {
  discover(test::ok("// from the provider\n{\"a\":1}\n"));
  EXPECT_EQ(doc["a"].asInt(), 1);
  EXPECT_TRUE(doc.hasComment(Json::commentBefore));
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(Wellknown, NonObjectsAreJsonToo) {
  discover(test::ok("502 Bad Gateway"));
  EXPECT_EQ(doc.asInt(), 502);
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(Wellknown, LargeDocumentArrivesWhole) {
  Json::Value keys;
  for (int i = 0; i < 200000; ++i) keys.append(i);
  test::Answer large = test::ok("{\"keys\":" + std::string() + "[0");
  for (int i = 1; i < 200000; ++i) large.body += "," + std::to_string(i);
  large.body += "]}";
  discover(large);
  EXPECT_TRUE(doc["keys"] == keys);
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(Wellknown, HtmlGivesOneLineAndANormalReturn) {
  discover(test::ok("<html><body>Service unavailable</body></html>"));
  EXPECT_TRUE(log.is({{LOG_ERR, "sso.cpp", "bad wellknown json format."}}));
}

TEST_F(Wellknown, EmptyAnswerGivesTheSameLine) {
  discover(test::ok(""));
  EXPECT_TRUE(log.is({{LOG_ERR, "sso.cpp", "bad wellknown json format."}}));
}

// jsoncpp has its own exception for this; it counts as a failed parse.
TEST_F(Wellknown, NestingThatIsTooDeepGivesTheSameLine) {
  discover(test::ok(R"({"a":)" + std::string(5000, '[') + std::string(5000, ']') + "}"));
  EXPECT_TRUE(log.is({{LOG_ERR, "sso.cpp", "bad wellknown json format."}}));
}

// The part of the document that the reader understood stays.
TEST_F(Wellknown, CutOffDocumentLeavesWhatTheReaderLeft) {
  const std::string text = R"({"jwks_uri":"https://provider/keys","issuer":"iss)";
  discover(test::ok(text));
  EXPECT_EQ(doc["jwks_uri"].asString(), "https://provider/keys");
  EXPECT_TRUE(doc == readAs(text));
  EXPECT_TRUE(log.is({{LOG_ERR, "sso.cpp", "bad wellknown json format."}}));
}

TEST_F(Wellknown, UnreachableProviderGivesOneLineAndLeavesTheDocument) {
  doc["old"] = 1;
  Client client("http://127.0.0.1:" + std::to_string(test::unusedPort()) + "/", "");
  client.RequestWellknownInfo(doc);
  EXPECT_TRUE(log.is({{LOG_ERR, "sso.cpp", kLibcurlConnect}}));
  EXPECT_EQ(doc["old"].asInt(), 1);
}

TEST_F(Wellknown, EmptyEndpointGivesOneLineAndLeavesTheDocument) {
  doc["old"] = 1;
  Client client("", "");
  client.RequestWellknownInfo(doc);
  EXPECT_TRUE(log.is({{LOG_ERR, "sso.cpp", curl_easy_strerror(CURLE_URL_MALFORMAT)}}));
  EXPECT_EQ(doc["old"].asInt(), 1);
}

TEST_F(Wellknown, TransferThatBreaksOffLeavesTheDocumentEvenIfItWasWhole) {
  doc["old"] = 1;
  test::Answer broken = test::ok(R"({"new":2})");
  broken.contentLength = 1000;
  discover(broken);
  EXPECT_TRUE(log.is({{LOG_ERR, "sso.cpp", curl_easy_strerror(CURLE_PARTIAL_FILE)}}));
  EXPECT_EQ(doc["old"].asInt(), 1);
  EXPECT_FALSE(doc.isMember("new"));
}

TEST_F(TokenEndpoint, BodyIsPostedAsItIs) {
  exchange(test::ok("{}"), "client_id=a%20b&code=c");
  ASSERT_EQ(provider.requests().size(), 1u);
  EXPECT_EQ(provider.requests()[0].raw,
            "POST /token HTTP/1.1\r\nHost: localhost:" + std::to_string(provider.port()) +
                "\r\nAccept: */*\r\nContent-Length: 22\r\n"
                "Content-Type: application/x-www-form-urlencoded\r\n"
                "\r\nclient_id=a%20b&code=c");
  EXPECT_EQ(response, "{}");
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(TokenEndpoint, AnswerIsAppended) {
  response = "before ";
  exchange(test::ok("after"));
  EXPECT_EQ(response, "before after");
}

TEST_F(TokenEndpoint, ErrorAnswerIsReturnedLikeASuccess) {
  exchange(test::failed(400, R"({"error":"invalid_grant"})"));
  EXPECT_EQ(response, R"({"error":"invalid_grant"})");
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(TokenEndpoint, LargeAnswerArrivesWhole) {
  std::string body;
  for (int i = 0; body.size() < (4u << 20); ++i) body += std::to_string(i);
  exchange(test::ok(body));
  EXPECT_TRUE(response == body);
}

// A chunk is read as a text: what follows a zero byte is lost, and the transfer goes on.
TEST_F(TokenEndpoint, AChunkEndsAtItsFirstZeroByte) {
  test::Answer chunks = test::ok(std::string("ab\0cdefg\0\0ijkl\0\0", 16));
  chunks.chunked = true;
  chunks.piece = 4;
  exchange(chunks);
  EXPECT_EQ(response, "abdefgkl");
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(TokenEndpoint, ABodyEndsAtItsFirstZeroByte) {
  exchange(test::ok(std::string("{}\0more", 7)));
  EXPECT_EQ(response, "{}");
}

TEST_F(TokenEndpoint, FailureGivesOneLineWithLibcurlsText) {
  response = "before";
  Client client("", "http://127.0.0.1:" + std::to_string(test::unusedPort()) + "/");
  client.RequestTokenEndpoint(response, "a=1");
  EXPECT_TRUE(log.is({{LOG_ERR, "sso.cpp", "request token uri " + kLibcurlConnect + "."}}));
  EXPECT_EQ(response, "before");
}

TEST_F(TokenEndpoint, FailureKeepsWhatHadArrived) {
  test::Answer broken = test::ok("part");
  broken.contentLength = 1000;
  exchange(broken);
  EXPECT_EQ(response, "part");
  EXPECT_TRUE(
      log.is({{LOG_ERR, "sso.cpp",
               std::string("request token uri ") + curl_easy_strerror(CURLE_PARTIAL_FILE) + "."}}));
}

// Both insist on a certificate that libcurl trusts.
class DiscoveryOverTls : public testing::Test {
 protected:
  static Json::Value documentOf(const test::Provider& provider) {
    Json::Value doc;
    Client(provider.url("/"), "").RequestWellknownInfo(doc);
    return doc;
  }
  static std::string answerOf(const test::Provider& provider) {
    std::string response;
    Client("", provider.url("/")).RequestTokenEndpoint(response, "secret");
    return response;
  }
};

TEST_F(DiscoveryOverTls, WorksUnderATrustedAuthority) {
  test::Ca ca;
  ca.trust();
  test::Provider provider(ca.issue({"localhost"}));
  provider.answer("/", test::ok(R"({"a":1})")).start();
  test::Log log;
  EXPECT_EQ(documentOf(provider)["a"].asInt(), 1);
  EXPECT_EQ(answerOf(provider), R"({"a":1})");
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(DiscoveryOverTls, SendsNothingToAStranger) {
  test::Provider provider(test::selfSigned({"localhost"}));
  provider.answer("/", test::ok(R"({"a":1})")).start();
  const std::string text = curl_easy_strerror(CURLE_PEER_FAILED_VERIFICATION);
  test::Log log;
  EXPECT_TRUE(documentOf(provider).isNull());
  EXPECT_EQ(answerOf(provider), "");
  EXPECT_TRUE(log.is(
      {{LOG_ERR, "sso.cpp", text}, {LOG_ERR, "sso.cpp", "request token uri " + text + "."}}));
  EXPECT_TRUE(provider.requests().empty());
}

// What is caught, and what passes: exceptions that come up from the transport.
class DiscoveryHandlers : public testing::Test {
 protected:
  void discover() { Client("http://localhost/", "").RequestWellknownInfo(doc); }
  void exchange() { Client("", "http://localhost/").RequestTokenEndpoint(response, "a=1"); }

  test::CurlSpy spy;
  test::Log log;
  Json::Value doc = "before";
  std::string response = "before";
};

TEST_F(DiscoveryHandlers, ExhaustedMemoryIsLoggedWithErrno) {
  spy.noHandle = true;
  discover();
  exchange();
  ASSERT_EQ(log.lines().size(), 2u);
  const std::string text =
      std::string("bad_alloc. ") + std::strerror(log.lines()[0].error);  // the text of %m
  EXPECT_TRUE(log.is({{LOG_ERR, "sso.cpp", text}, {LOG_ERR, "sso.cpp", text}}));
  EXPECT_EQ(log.lines()[0].error, ENOMEM);
  EXPECT_EQ(doc.asString(), "before");
  EXPECT_EQ(response, "before");
}

TEST_F(DiscoveryHandlers, InvalidArgumentIsLoggedWithItsText) {
  spy.onPerform = [](CURL*) -> CURLcode { throw std::invalid_argument("some argument"); };
  discover();
  exchange();
  EXPECT_TRUE(
      log.is({{LOG_ERR, "sso.cpp", "some argument"}, {LOG_ERR, "sso.cpp", "some argument"}}));
  EXPECT_EQ(doc.asString(), "before");
}

TEST_F(DiscoveryHandlers, SubclassesOfTheThreeAreCaughtToo) {
  struct Special : sso_err_resp {
    Special() : sso_err_resp("special") {}
  };
  spy.onPerform = [](CURL*) -> CURLcode { throw Special(); };
  discover();
  exchange();
  EXPECT_TRUE(log.is(
      {{LOG_ERR, "sso.cpp", "special"}, {LOG_ERR, "sso.cpp", "request token uri special."}}));
}

TEST_F(DiscoveryHandlers, OtherExceptionsPass) {
  spy.onPerform = [](CURL*) -> CURLcode { throw sso_op_failed("not mine"); };
  EXPECT_TRUE(test::throws<sso_op_failed>("not mine", [&] { discover(); }));
  EXPECT_TRUE(test::throws<sso_op_failed>("not mine", [&] { exchange(); }));
  spy.onPerform = [](CURL*) -> CURLcode { throw sso_exception("not mine"); };
  EXPECT_TRUE(test::throws<sso_exception>("not mine", [&] { discover(); }));
  EXPECT_TRUE(test::throws<sso_exception>("not mine", [&] { exchange(); }));
  spy.onPerform = [](CURL*) -> CURLcode { throw std::logic_error("not mine"); };
  EXPECT_TRUE(test::throws<std::logic_error>("not mine", [&] { discover(); }));
  EXPECT_TRUE(test::throws<std::logic_error>("not mine", [&] { exchange(); }));
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(DiscoveryHandlers, VerificationIsNeverSwitchedOff) {
  spy.onPerform = [](CURL*) { return CURLE_OK; };
  discover();
  exchange();
  EXPECT_TRUE(spy.numbers.empty());
}

// The write function with which both collect an answer, taken from libcurl's side.
class CollectAnswer : public testing::TestWithParam<int> {
 protected:
  void SetUp() override {
    test::CurlSpy spy;
    spy.onPerform = [](CURL*) { return CURLE_OK; };
    Client client("http://localhost/", "http://localhost/");
    Json::Value doc;
    if (GetParam() == 0) {
      client.RequestWellknownInfo(doc);
    } else {
      client.RequestTokenEndpoint(collected, "a=1");
    }
    collect = reinterpret_cast<Collect>(const_cast<void*>(spy.pointers[CURLOPT_WRITEFUNCTION]));
  }

  // Hands `bytes` over in its own block: nothing behind them may be read.
  unsigned give(const std::string& bytes, unsigned size, unsigned count) {
    std::vector<char> block(bytes.begin(), bytes.end());
    block.reserve(1);  // nothing has an address, too
    return collect(block.data(), size, count, &collected);
  }

  using Collect = unsigned (*)(void*, unsigned, unsigned, void*);
  Collect collect = nullptr;
  std::string collected = "";
};
INSTANTIATE_TEST_SUITE_P(, CollectAnswer, testing::Values(0, 1), [](const auto& each) {
  return std::string(each.param == 0 ? "wellknown" : "token");
});

TEST_P(CollectAnswer, AppendsAChunkThatNoZeroEnds) {
  EXPECT_EQ(give("abcdef", 1, 6), 6u);
  EXPECT_EQ(give("ghi", 3, 1), 3u);
  EXPECT_EQ(collected, "abcdefghi");
}

TEST_P(CollectAnswer, TakesSizeTimesCountBytes) {
  EXPECT_EQ(give("abcdef", 2, 3), 6u);
  EXPECT_EQ(collected, "abcdef");
  EXPECT_EQ(give("abcdef", 2, 2), 4u);
  EXPECT_EQ(collected, "abcdefabcd");
  EXPECT_EQ(give("", 1, 0), 0u);
  EXPECT_EQ(give("", 0, 1), 0u);
  EXPECT_EQ(collected, "abcdefabcd");
}

// Deliberate: the rest of the chunk is lost, and the whole of it counts as taken.
TEST_P(CollectAnswer, CutsAChunkAtAZeroByteAndReportsAllOfIt) {
  EXPECT_EQ(give(std::string("ab\0cd", 5), 1, 5), 5u);
  EXPECT_EQ(give(std::string("\0xyz", 4), 1, 4), 4u);
  EXPECT_EQ(give("ef", 1, 2), 2u);
  EXPECT_EQ(collected, "abef");
}

}  // namespace
