// GetSSORelayURL: what it takes from the state and the reason, and what it makes of them.
#include <gtest/gtest.h>
#include <json/writer.h>

#include "sso/sso.h"
#include "support/log.h"
#include "support/tokens.h"

namespace {

using QOVA::SSO::GetSSORelayURL;

const char* const kSuccess = "ssoclient/relay.html#success=true";
const char* const kFailure = "ssoclient/relay.html#success=false";

std::string relayOf(const std::string& json) {
  test::Log log;
  const std::string url = GetSSORelayURL(true, test::base64(json), "a reason");
  EXPECT_TRUE(log.isEmpty());
  return url;
}

std::string withOrigin(const std::string& encoded) {
  return "ssoclient/relay.html#origin=" + encoded + "&success=true";
}

TEST(Relay, SuccessCarriesTheEncodedOrigin) {
  EXPECT_EQ(relayOf(R"({"origin":"https://device:5001/webman/?a=b&c"})"),
            withOrigin("https%3A%2F%2Fdevice%3A5001%2Fwebman%2F%3Fa%3Db%26c"));
  EXPECT_EQ(relayOf(R"({"nonce":"0123","origin":"/","x":[1]})"), withOrigin("%2F"));
  EXPECT_EQ(relayOf("{\"origin\":\"a b\"}\n"), withOrigin("a%20b"));
  EXPECT_EQ(relayOf(R"({"origin":"\u00e4"})"), withOrigin("%C3%A4"));
}

TEST(Relay, AnEmptyOriginIsAnOrigin) {
  EXPECT_EQ(relayOf(R"({"origin":""})"), withOrigin(""));
}

TEST(Relay, CommentsInTheStateAreAllowed) {
  EXPECT_EQ(relayOf("/* c */ {\"origin\":\"a\" // d\n}"), withOrigin("a"));
}

TEST(Relay, StateWithoutAUsableOriginGivesNone) {
  for (const std::string json :
       {R"({"origin": 5})", R"({"origin":null})", R"({"origin":true})", R"({"origin":["a"]})",
        R"({"origin":{"origin":"a"}})", R"({"Origin":"a"})", R"({"inner":{"origin":"a"}})", "{}"}) {
    EXPECT_EQ(relayOf(json), kSuccess) << json;
  }
}

TEST(Relay, StateThatIsNoObjectGivesNone) {
  for (const std::string json : {"5", "\"origin\"", "true", "null", R"([{"origin":"a"}])",
                                 R"(["origin","a"])", "502 Bad Gateway"}) {
    EXPECT_EQ(relayOf(json), kSuccess) << json;
  }
}

TEST(Relay, StateThatDoesNotParseGivesNone) {
  for (const std::string json :
       {"", "origin", "{", R"({"origin":"a")", R"({"origin":"a)", R"({"origin":"a",})", "<html>"}) {
    EXPECT_EQ(relayOf(json), kSuccess) << json;
  }
}

TEST(Relay, StateThatDoesNotDecodeGivesNone) {
  const std::string good = test::base64(R"({"origin":"a"})");
  for (const std::string& state :
       {std::string("?"), std::string("A"), std::string("===="), "!" + good, good + "!",
        good.substr(1), R"({"origin":"a"})" + std::string()}) {
    test::Log log;
    EXPECT_EQ(GetSSORelayURL(true, state, ""), kSuccess) << state;
    EXPECT_TRUE(log.isEmpty());
  }
}

TEST(Relay, EmptyStateGivesNone) {
  EXPECT_EQ(GetSSORelayURL(true, "", ""), kSuccess);
}

TEST(Relay, StateEndsAtItsFirstZeroByte) {
  EXPECT_EQ(relayOf(std::string("{\"origin\":\"a\"}\0,garbage", 22)), withOrigin("a"));
  EXPECT_EQ(relayOf(std::string("\0{\"origin\":\"a\"}", 15)), kSuccess);
}

// A state of so many bytes: the origin, and a filling.
std::string stateOf(std::size_t size) {
  const std::string start = R"({"origin":"a","fill":")";
  const std::string end = "\"}";
  return start + std::string(size - start.size() - end.size(), 'x') + end;
}

TEST(Relay, StateMayHold1024Bytes) {
  for (const std::size_t size : {765u, 1022u, 1023u, 1024u}) {
    EXPECT_EQ(relayOf(stateOf(size)), withOrigin("a")) << size;
  }
  for (const std::size_t size : {1025u, 1026u, 1027u, 5000u}) {
    EXPECT_EQ(relayOf(stateOf(size)), kSuccess) << size;
  }
}

// jsoncpp has its own exception for this, and it fits into a state.
TEST(Relay, StateThatIsNestedTooDeepGivesNone) {
  const std::string start = R"({"origin":"a","b":)";
  EXPECT_EQ(relayOf(start + std::string(1024 - start.size(), '[')), kSuccess);
  EXPECT_EQ(relayOf(std::string(1024, '[')), kSuccess);
}

TEST(Relay, FailureCarriesTheReasonAsItIs) {
  for (const std::string reason :
       {"a b", "reason", "a&b=c#d", "%20", "{\"error\":\"x\"}\n", "\xc3\xa4"}) {
    EXPECT_EQ(GetSSORelayURL(false, "", reason),
              "ssoclient/relay.html#reason=" + std::string(reason) + "&success=false");
  }
  const std::string zero("a\0b", 3);
  EXPECT_EQ(GetSSORelayURL(false, "", zero),
            "ssoclient/relay.html#reason=" + zero + "&success=false");
}

TEST(Relay, FailureDoesNotReadTheState) {
  const std::string state = test::base64(R"({"origin":"a"})");
  EXPECT_EQ(GetSSORelayURL(false, state, ""), kFailure);
  EXPECT_EQ(GetSSORelayURL(false, "not base64", ""), kFailure);
  EXPECT_EQ(GetSSORelayURL(false, state, "r"), "ssoclient/relay.html#reason=r&success=false");
}

TEST(Relay, SuccessDoesNotReadTheReason) {
  EXPECT_EQ(GetSSORelayURL(true, "", "a reason"), kSuccess);
}

}  // namespace
