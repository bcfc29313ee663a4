// Fetching the key set of an Azure tenant: what is asked of libcurl, and what becomes of failures.
#include <curl/curl.h>
#include <gtest/gtest.h>
#include <json/value.h>

#include <cstring>
#include <new>
#include <string>
#include <vector>

#include "sso/azuresso.h"
#include "support/ca.h"
#include "support/curl_spy.h"
#include "support/log.h"
#include "support/provider.h"
#include "support/throws.h"

namespace {

using QOVA::SSO::AzureSSOClient;
using QOVA::SSO::sso_err_resp;
using QOVA::SSO::sso_op_failed;
using test::throws;

const char kAddress[] = "http://localhost/keys";

class AzureKeys : public testing::Test {
 protected:
  // Whether libcurl was told to verify the server, and was cleaned up twice: once by the transfer,
  // once more behind it.
  static void expectCalls(const test::CurlSpy& spy, bool transfer = true) {
    std::vector<std::string> expected = {"global_init 3", "easy_init"};
    if (transfer) {
      expected.insert(expected.end(), {"setopt URL", "setopt WRITEFUNCTION", "setopt WRITEDATA",
                                       "perform", "easy_cleanup"});
    }
    expected.insert(expected.end(), {"global_cleanup", "global_cleanup"});
    EXPECT_EQ(spy.calls, expected);
  }

  // A key set that cannot be used is null, or has no "keys".
  static bool isEmpty(const Json::Value& keys) {
    return keys.isNull() || !keys.isObject() || !keys.isMember("keys");
  }

  AzureSSOClient client;
  Json::Value keys;
  test::Log log;
};

TEST_F(AzureKeys, AreTheDocumentAtTheAddress) {
  const test::Ca authority;
  authority.trust();
  test::Provider provider(authority.issue({"localhost"}));
  provider.answer("/keys", test::ok(R"(/* why */ {"keys":[{"kid":"a"}], "more":1})")).start();
  test::CurlSpy spy;
  client.RequestKeysInfo(provider.url("/keys"), keys);
  EXPECT_EQ(keys["keys"][0]["kid"], "a");
  EXPECT_EQ(keys["more"], 1);
  EXPECT_EQ(keys.getComment(Json::commentBefore), "/* why */");
  EXPECT_TRUE(log.isEmpty());
  expectCalls(spy);
}

TEST_F(AzureKeys, AreNotTakenFromAServerThatCannotBeTrusted) {
  test::Provider provider(test::selfSigned({"localhost"}));
  provider.answer("/keys", test::ok(R"({"keys":[]})")).start();
  test::CurlSpy spy;
  client.RequestKeysInfo(provider.url("/keys"), keys);
  EXPECT_TRUE(isEmpty(keys));
  EXPECT_TRUE(provider.requests().empty());
  EXPECT_TRUE(log.is({{LOG_ERR, "azuresso.cpp",
                       std::string("request wellknown uri ") +
                           curl_easy_strerror(CURLE_PEER_FAILED_VERIFICATION) + "."}}));
  expectCalls(spy);
}

TEST_F(AzureKeys, AreMissingWithALineForEachFailureOfTheTransfer) {
  for (CURLcode code : {CURLE_COULDNT_RESOLVE_HOST, CURLE_COULDNT_CONNECT, CURLE_GOT_NOTHING,
                        CURLE_WRITE_ERROR, CURLE_OUT_OF_MEMORY}) {
    log.clear();
    test::CurlSpy spy;
    spy.onPerform = [code](CURL*) { return code; };
    client.RequestKeysInfo(kAddress, keys);
    EXPECT_TRUE(isEmpty(keys));
    EXPECT_TRUE(log.is({{LOG_ERR, "azuresso.cpp",
                         std::string("request wellknown uri ") + curl_easy_strerror(code) + "."}}));
    expectCalls(spy);
  }
}

TEST_F(AzureKeys, AreMissingWithoutATransferHandle) {
  test::CurlSpy spy;
  spy.noHandle = true;
  client.RequestKeysInfo(kAddress, keys);
  EXPECT_TRUE(isEmpty(keys));
  ASSERT_EQ(log.lines().size(), 1u);
  EXPECT_TRUE(
      log.is({{LOG_ERR, "azuresso.cpp",
               std::string("curl_easy_init failed. ") + std::strerror(log.lines()[0].error)}}));
  expectCalls(spy, false);
}

struct Thrown {
  const char* name;
  void (*now)();
  const char* line;
};

TEST_F(AzureKeys, AreMissingAfterTheThreeExceptionsThatEndHere) {
  const Thrown cases[] = {
      {"invalid", [] { throw std::invalid_argument("from below"); }, "from below"},
      {"response", [] { throw sso_err_resp("from below"); }, "request wellknown uri from below."}};
  for (const Thrown& c : cases) {
    log.clear();
    test::CurlSpy spy;
    spy.onPerform = [&c](CURL*) {
      c.now();
      return CURLE_OK;
    };
    client.RequestKeysInfo(kAddress, keys);
    EXPECT_TRUE(isEmpty(keys));
    EXPECT_TRUE(log.is({{LOG_ERR, "azuresso.cpp", c.line}})) << c.name;
    expectCalls(spy);
  }
  log.clear();
  test::CurlSpy spy;
  spy.onPerform = [](CURL*) -> CURLcode { throw std::bad_alloc(); };
  client.RequestKeysInfo(kAddress, keys);
  ASSERT_EQ(log.lines().size(), 1u);
  EXPECT_EQ(log.lines()[0].priority, LOG_ERR);
  EXPECT_NE(log.lines()[0].text.find(" curl_easy_init failed. "), std::string::npos);
  expectCalls(spy);
}

TEST_F(AzureKeys, LetOtherExceptionsPass) {
  const auto request = [&] { client.RequestKeysInfo(kAddress, keys); };
  {
    test::CurlSpy spy;
    spy.onPerform = [](CURL*) -> CURLcode { throw std::out_of_range("from below"); };
    EXPECT_TRUE(throws<std::out_of_range>("from below", request));
    EXPECT_EQ(spy.calls.back(), "global_cleanup");
    EXPECT_EQ(spy.calls[spy.calls.size() - 2], "easy_cleanup") << "cleaned up once";
  }
  test::CurlSpy spy;
  spy.onPerform = [](CURL*) -> CURLcode { throw sso_op_failed("from below"); };
  EXPECT_TRUE(throws<sso_op_failed>("from below", request));
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(AzureKeys, AreMissingInWhatIsNotAKeySet) {
  const std::string deep = "{\"keys\":[],\"x\":" + std::string(2000, '[');
  const std::vector<std::pair<std::string, std::string>> cases = {
      {"", "request wellknown uri bad wellknown json format.."},
      {"<html>", "request wellknown uri bad wellknown json format.."},
      {R"({"keys":[{"kid":"a"}],)", "request wellknown uri bad wellknown json format.."},
      {deep, "request wellknown uri bad wellknown json format.."},
      {"{}", "no kyes information"},
      {R"({"Keys":[]})", "no kyes information"},
      {"[]", "no kyes information"},
      {"null", "no kyes information"},
      {"502 Bad Gateway", "no kyes information"},
      {"\"keys\"", "no kyes information"}};
  for (const auto& [text, line] : cases) {
    SCOPED_TRACE(text.substr(0, 40));
    log.clear();
    keys = Json::Value();
    test::Provider provider;
    provider.answer("/keys", test::ok(text)).start();
    test::CurlSpy spy;
    client.RequestKeysInfo(provider.url("/keys"), keys);
    EXPECT_TRUE(isEmpty(keys)) << keys.toStyledString();
    EXPECT_TRUE(log.is({{LOG_ERR, "azuresso.cpp", line}}));
    expectCalls(spy);
  }
}

TEST_F(AzureKeys, NeedNotBeAnArray) {
  for (const char* value : {"null", "5", "{}", "\"a\""}) {
    test::Provider provider;
    provider.answer("/keys", test::ok(std::string("{\"keys\":") + value + "}")).start();
    client.RequestKeysInfo(provider.url("/keys"), keys);
    EXPECT_TRUE(keys.isMember("keys")) << value;
    EXPECT_TRUE(log.isEmpty());
  }
}

}  // namespace
