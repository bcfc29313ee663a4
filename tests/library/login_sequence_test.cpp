// OpenIDConnectLogin: the order of the hooks, what each receives, and where a failure ends it.
#include <gtest/gtest.h>

#include <stdexcept>

#include "sso/sso.h"
#include "support/log.h"
#include "support/provider.h"
#include "support/throws.h"

namespace {

using namespace QOVA::SSO;
using Calls = std::vector<std::string>;

// A provider client that records its calls and can be told where to fail.
class Recorder : public SSOClient {
 public:
  void SetCode(std::string given) override { note("SetCode " + given, "SetCode"); }
  std::string GetIDTokenReqParams() override {
    note("GetIDTokenReqParams", "GetIDTokenReqParams");
    return "params";
  }
  void RequestTokenEndpoint(std::string& response, const std::string& params) override {
    note("RequestTokenEndpoint '" + response + "' " + params, "RequestTokenEndpoint");
    response += "answer";
  }
  void ProcessTokenResponse(std::string response) override {
    note("ProcessTokenResponse " + response, "ProcessTokenResponse");
    response += " changed in the hook's own copy";
  }
  void VerifyIDToken() override { note("VerifyIDToken", "VerifyIDToken"); }
  void GetUserName(std::string& user) override {
    note("GetUserName '" + user + "'", "GetUserName");
    user = "alice";
  }

  Calls calls;
  std::string failing;

 private:
  void note(const std::string& call, const std::string& name) {
    calls.push_back(call);
    if (name == failing) throw std::domain_error(name);
  }
};

const Calls kWhole = {"SetCode the code",
                      "GetIDTokenReqParams",
                      "RequestTokenEndpoint '' params",
                      "ProcessTokenResponse answer",
                      "VerifyIDToken",
                      "GetUserName 'before'"};

TEST(LoginSequence, CallsTheHooksInOrder) {
  Recorder client;
  std::string user = "before";
  test::Log log;
  client.OpenIDConnectLogin("the code", user);
  EXPECT_EQ(client.calls, kWhole);
  EXPECT_EQ(user, "alice");
  EXPECT_TRUE(log.isEmpty());
}

TEST(LoginSequence, StartsAfreshEachTime) {
  Recorder client;
  std::string user = "before";
  client.OpenIDConnectLogin("the code", user);
  client.calls.clear();
  user = "before";
  client.OpenIDConnectLogin("the code", user);
  EXPECT_EQ(client.calls, kWhole);
}

TEST(LoginSequence, TheFailureOfAHookEndsItUnchanged) {
  const char* const hooks[] = {
      "SetCode",       "GetIDTokenReqParams", "RequestTokenEndpoint", "ProcessTokenResponse",
      "VerifyIDToken", "GetUserName"};
  for (std::size_t i = 0; i < std::size(hooks); ++i) {
    SCOPED_TRACE(hooks[i]);
    Recorder client;
    client.failing = hooks[i];
    std::string user = "before";
    EXPECT_TRUE(test::throws<std::domain_error>(
        hooks[i], [&] { client.OpenIDConnectLogin("the code", user); }));
    EXPECT_EQ(client.calls, Calls(kWhole.begin(), kWhole.begin() + static_cast<long>(i) + 1));
    EXPECT_EQ(user, "before");
  }
}

TEST(LoginSequence, PassesAnEmptyCodeOn) {
  Recorder client;
  std::string user;
  client.OpenIDConnectLogin("", user);
  EXPECT_EQ(client.calls.at(0), "SetCode ");
}

// Hooks that are left to the base, one after the other.
struct Unfinished : SSOClient {
  using SSOClient::code;
};
struct WithParams : Unfinished {
  WithParams() { tokenEndpoint = "http://"; }
  std::string GetIDTokenReqParams() override { return "params"; }
};
struct WithProcessing : WithParams {
  void ProcessTokenResponse(std::string) override {}
};
struct WithVerification : WithProcessing {
  void VerifyIDToken() override {}
};

template <typename Client>
testing::AssertionResult stopsAt(const std::string& hook) {
  Client client;
  std::string user = "before";
  const auto result = test::throws<sso_not_implemented>(
      hook + " not implemented", [&] { client.OpenIDConnectLogin("the code", user); });
  if (!result) return result;
  if (client.code != "the code" || user != "before") return testing::AssertionFailure() << user;
  return testing::AssertionSuccess();
}

TEST(LoginSequence, EndsAtTheFirstHookThatIsNotImplemented) {
  EXPECT_TRUE(stopsAt<Unfinished>("GetIDTokenReqParams"));
  EXPECT_TRUE(stopsAt<WithParams>("ProcessTokenResponse"));
  EXPECT_TRUE(stopsAt<WithProcessing>("VerifyIDToken"));
  EXPECT_TRUE(stopsAt<WithVerification>("GetUserName"));
}

TEST(LoginSequence, OfTheBaseAloneEndsAtTheFirstHook) {
  SSOClient client;
  std::string user;
  EXPECT_TRUE(test::throws<sso_not_implemented>(
      "GetIDTokenReqParams not implemented", [&] { client.OpenIDConnectLogin("the code", user); }));
}

// With the base's own SetCode and RequestTokenEndpoint, against a provider.
class Exchanging : public SSOClient {
 public:
  explicit Exchanging(const std::string& url) { tokenEndpoint = url; }
  std::string GetIDTokenReqParams() override { return "code=" + code; }
  void ProcessTokenResponse(std::string response) override { processed = response; }
  void VerifyIDToken() override {}
  void GetUserName(std::string& user) override { user = processed; }

  std::string processed = "nothing";
};

TEST(LoginSequence, ExchangesTheCodeAtTheTokenEndpoint) {
  test::Provider provider;
  provider.answer("/token", test::failed(400, "the answer")).start();
  Exchanging client(provider.url("/token"));
  std::string user;
  client.OpenIDConnectLogin("a code", user);
  EXPECT_EQ(user, "the answer");
  ASSERT_EQ(provider.requests().size(), 1u);
  EXPECT_EQ(provider.requests()[0].body, "code=a code");
}

// The request logs its failure and returns: the hook that follows sees an empty answer.
TEST(LoginSequence, AFailedTokenRequestReachesTheProviderAsAnEmptyAnswer) {
  Exchanging client("http://127.0.0.1:" + std::to_string(test::unusedPort()));
  std::string user;
  test::Log log;
  client.OpenIDConnectLogin("a code", user);
  EXPECT_EQ(client.processed, "");
  EXPECT_TRUE(log.is({{LOG_ERR, "sso.cpp", "request token uri Couldn't connect to server."}}));
}

}  // namespace
