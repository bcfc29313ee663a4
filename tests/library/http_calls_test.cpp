// httpGet and httpPost as libcurl sees them: which calls, in which order, with which arguments.
#include <gtest/gtest.h>

#include <algorithm>
#include <new>
#include <ostream>
#include <stdexcept>

#include "sso/utils.h"
#include "support/curl_spy.h"
#include "support/log.h"
#include "support/memory_spy.h"
#include "support/provider.h"
#include "support/throws.h"

namespace {

using namespace QOVA::SSO;
using Calls = std::vector<std::string>;

unsigned append(void* data, unsigned size, unsigned count, void* userData) {
  static_cast<std::string*>(userData)->append(static_cast<char*>(data), size * count);
  return size * count;
}

const Calls kGet = {"global_init 3",    "easy_init", "setopt URL",   "setopt WRITEFUNCTION",
                    "setopt WRITEDATA", "perform",   "easy_cleanup", "global_cleanup"};
const Calls kGetUnverified = {"global_init 3",         "easy_init",        "setopt URL",
                              "setopt WRITEFUNCTION",  "setopt WRITEDATA", "setopt SSL_VERIFYHOST",
                              "setopt SSL_VERIFYPEER", "perform",          "easy_cleanup",
                              "global_cleanup"};
const Calls kPost = {"global_init 3",        "easy_init",        "setopt URL", "setopt POSTFIELDS",
                     "setopt WRITEFUNCTION", "setopt WRITEDATA", "perform",    "easy_cleanup",
                     "global_cleanup"};
const Calls kPostUnverified = {"global_init 3",
                               "easy_init",
                               "setopt URL",
                               "setopt POSTFIELDS",
                               "setopt WRITEFUNCTION",
                               "setopt WRITEDATA",
                               "setopt SSL_VERIFYHOST",
                               "setopt SSL_VERIFYPEER",
                               "perform",
                               "easy_cleanup",
                               "global_cleanup"};

struct Way {
  const char* name;
  bool post;
  bool verifySSL;
  Calls calls;
};

void PrintTo(const Way& way, std::ostream* out) {
  *out << way.name;
}

class HttpCalls : public testing::TestWithParam<Way> {
 protected:
  HttpCalls() { provider.answer("/", test::ok("body")).start(); }

  void request() {
    if (GetParam().post) {
      httpPost(url, body, response, GetParam().verifySSL, append);
    } else {
      httpGet(url, response, GetParam().verifySSL, append);
    }
  }

  test::Provider provider;
  const std::string url = provider.url("/");
  const std::string body = "x=1";
  std::string response;
};
INSTANTIATE_TEST_SUITE_P(, HttpCalls,
                         testing::Values(Way{"get", false, true, kGet},
                                         Way{"getUnverified", false, false, kGetUnverified},
                                         Way{"post", true, true, kPost},
                                         Way{"postUnverified", true, false, kPostUnverified}),
                         [](const auto& each) { return std::string(each.param.name); });

TEST_P(HttpCalls, SetTheStatedOptionsInTheStatedOrderAndNoOthers) {
  test::CurlSpy spy;
  request();
  EXPECT_EQ(spy.calls, GetParam().calls);
  EXPECT_EQ(response, "body");
}

// libcurl gets the caller's function and the response's address themselves.
TEST_P(HttpCalls, HandTheCallersOwnArgumentsOn) {
  test::CurlSpy spy;
  spy.onPerform = [](CURL*) { return CURLE_OK; };
  request();
  EXPECT_STREQ(static_cast<const char*>(spy.pointers[CURLOPT_URL]), url.c_str());
  EXPECT_EQ(spy.pointers[CURLOPT_WRITEFUNCTION], reinterpret_cast<const void*>(append));
  EXPECT_EQ(spy.pointers[CURLOPT_WRITEDATA], &response);
  if (GetParam().post) {
    EXPECT_EQ(spy.pointers[CURLOPT_POSTFIELDS], body.data());
  }
  EXPECT_EQ(spy.numbers.size(), GetParam().verifySSL ? 0u : 2u);
  for (const auto& [option, number] : spy.numbers) EXPECT_EQ(number, 0) << option;
}

TEST_P(HttpCalls, SetUpAndTearDownInEveryCall) {
  test::CurlSpy spy;
  request();
  request();
  Calls twice = GetParam().calls;
  twice.insert(twice.end(), GetParam().calls.begin(), GetParam().calls.end());
  EXPECT_EQ(spy.calls, twice);
  EXPECT_EQ(response, "bodybody");
}

TEST_P(HttpCalls, DoNotLookAtTheResultsOfSettingUp) {
  test::CurlSpy spy;
  spy.globalInitResult = CURLE_FAILED_INIT;
  spy.setoptResult = CURLE_UNKNOWN_OPTION;
  request();
  EXPECT_EQ(spy.calls, GetParam().calls);
  EXPECT_EQ(response, "body");
}

TEST_P(HttpCalls, WithoutAHandleMemoryIsExhausted) {
  test::CurlSpy spy;
  spy.noHandle = true;
  test::Log log;
  EXPECT_TRUE(test::throws<std::bad_alloc>(std::bad_alloc().what(), [&] { request(); }));
  EXPECT_EQ(spy.calls, (Calls{"global_init 3", "easy_init", "global_cleanup"}));
  EXPECT_TRUE(log.isEmpty());
}

TEST_P(HttpCalls, AFailedTransferThrowsTheTextOfItsCode) {
  for (const CURLcode code :
       {CURLE_OPERATION_TIMEDOUT, CURLE_SSL_CONNECT_ERROR, CURLE_RECV_ERROR, CURLE_OUT_OF_MEMORY}) {
    test::CurlSpy spy;
    test::Log log;
    spy.onPerform = [&](CURL*) { return code; };
    EXPECT_TRUE(test::throws<sso_err_resp>(curl_easy_strerror(code), [&] { request(); }));
    EXPECT_EQ(spy.calls, GetParam().calls);
    EXPECT_TRUE(log.isEmpty());
  }
}

// Whichever allocation fails, the handle and the global state are released.
TEST_P(HttpCalls, ExhaustedMemoryLeavesNothingBehind) {
  test::CurlSpy spy;
  spy.onPerform = [](CURL*) { return CURLE_COULDNT_CONNECT; };
  std::size_t thrown = 0;
  bool failed = true;
  for (std::size_t nth = 1; nth <= 50 && failed; ++nth) {
    spy.calls.clear();
    test::failNew(nth);
    try {
      request();
    } catch (const std::bad_alloc&) {
      ++thrown;
    } catch (const sso_err_resp&) {
    }
    failed = test::newFailed();
    test::failNew(0);
    const auto count = [&](const char* call) {
      return std::count(spy.calls.begin(), spy.calls.end(), call);
    };
    EXPECT_EQ(count("easy_init"), count("easy_cleanup"));
    ASSERT_FALSE(spy.calls.empty());
    EXPECT_EQ(spy.calls.front(), "global_init 3");
    EXPECT_EQ(spy.calls.back(), "global_cleanup");
  }
  EXPECT_FALSE(failed);
  EXPECT_GT(thrown, 0u);
}

TEST_P(HttpCalls, AnyExceptionPassesAndLeavesNothingBehind) {
  test::CurlSpy spy;
  spy.onPerform = [](CURL*) -> CURLcode { throw std::out_of_range("from below"); };
  EXPECT_TRUE(test::throws<std::out_of_range>("from below", [&] { request(); }));
  EXPECT_EQ(spy.calls, GetParam().calls);

  spy.calls.clear();
  spy.onPerform = [](CURL*) -> CURLcode { throw 7; };
  EXPECT_THROW(request(), int);
  EXPECT_EQ(spy.calls, GetParam().calls);
}

}  // namespace
