// The authorization request and the body of the code exchange.
#include <gtest/gtest.h>

#include <array>
#include <regex>
#include <set>
#include <string>
#include <vector>

#include "support/both_clients.h"
#include "support/device.h"
#include "support/log.h"
#include "support/query.h"
#include "support/throws.h"
#include "support/tokens.h"

namespace {

using QOVA::SSO::sso_op_failed;
using test::throws;

const char kUnreserved[] = "[A-Za-z0-9._~-]|%[0-9A-F]{2}";

Json::Value Settings() {
  Json::Value settings;
  settings["authorization_endpoint"] = "https://provider.example.com/authorize";
  settings["client_id"] = "device 7/ü&=+";
  settings["client_secret"] = "s3cret&more=?%41";
  settings["redirect_uri"] = "https://nas.example.com/webman/login.cgi?sso=1&x=y";
  return settings;
}

const char kClientID[] = "device%207%2F%C3%BC%26%3D%2B";
const char kSecret[] = "s3cret%26more%3D%3F%2541";
const char kRedirectURI[] = "https%3A%2F%2Fnas.example.com%2Fwebman%2Flogin.cgi%3Fsso%3D1%26x%3Dy";

// The parts of an authorization URL that differ from call to call.
struct Request {
  std::string nonce;
  std::string state;  // the JSON text
};

template <typename Provider>
class ClientRequest : public testing::Test {
 protected:
  void SetUp() override { test::configure<Provider>(Settings()); }

  void TearDown() override { EXPECT_TRUE(log.isEmpty()); }

  static std::string url(const Json::Value& parameters = Json::Value()) {
    typename Provider::Client client;
    return client.GetAccessTokenReqURI(parameters);
  }

  // Takes a URL apart; the test fails unless it has exactly the expected form.
  static Request ask(const Json::Value& parameters) {
    const std::string whole = url(parameters);
    const std::string value = std::string("((?:") + kUnreserved + ")*)";
    const std::regex form(std::string("https://provider\\.example\\.com/authorize\\?client_id=") +
                          kClientID + "&nonce=([0-9a-f-]{36})&redirect_uri=" + kRedirectURI +
                          "&response_type=code&scope=" + Provider::scope() + "&state=" + value);
    std::smatch found;
    EXPECT_TRUE(std::regex_match(whole, found, form)) << whole;
    if (found.empty()) return {};
    return {found[1], test::fromBase64(test::percentDecoded(found[2]))};
  }

  // The state of a request, without its nonce, which is checked.
  static std::string stateWithoutNonce(const Json::Value& parameters) {
    const Request request = ask(parameters);
    const std::string nonce = "\"nonce\":\"" + test::md5(request.nonce) + "\"";
    const size_t at = request.state.find(nonce);
    EXPECT_NE(at, std::string::npos) << request.state;
    EXPECT_EQ(request.state.find("nonce", at + nonce.size()), std::string::npos);
    return at == std::string::npos ? "" : std::string(request.state).replace(at, nonce.size(), "N");
  }

  // An object whose state is a JSON text of `length` bytes, the line feed at its end included.
  static Json::Value parametersOfLength(size_t length) {
    const std::string rest = R"({"nonce":"0123456789abcdef0123456789abcdef","origin":""})";
    Json::Value parameters;
    parameters["origin"] = std::string(length - rest.size() - 1, 'x');
    return parameters;
  }

  test::Log log;
};
TYPED_TEST_SUITE(ClientRequest, test::Clients, test::ClientName);

TYPED_TEST(ClientRequest, HasItsSixParametersInTheOrderOfTheirNames) {
  const std::string url = this->url();
  std::vector<std::string> names;
  for (const auto& parameter : test::parametersOf(url.substr(url.find('?') + 1)))
    names.push_back(parameter.first);
  EXPECT_EQ(names, (std::vector<std::string>{"client_id", "nonce", "redirect_uri", "response_type",
                                             "scope", "state"}));
  EXPECT_FALSE(this->ask(Json::Value()).nonce.empty()) << "the exact form";
}

// RFC 4122, sections 3 and 4.4: version 4, the variant of that document.
TYPED_TEST(ClientRequest, HasARandomUuidAsNonce) {
  const std::regex uuid("[0-9a-f]{8}-[0-9a-f]{4}-4[0-9a-f]{3}-[89ab][0-9a-f]{3}-[0-9a-f]{12}");
  for (int i = 0; i < 50; ++i) {
    const std::string nonce = this->ask(Json::Value()).nonce;
    EXPECT_TRUE(std::regex_match(nonce, uuid)) << nonce;
  }
}

TYPED_TEST(ClientRequest, HasAFreshNonceAndStateEachTime) {
  std::set<std::string> nonces;
  std::set<std::string> states;
  for (int i = 0; i < 200; ++i) {
    const Request request = this->ask(Json::Value());
    nonces.insert(request.nonce);
    states.insert(request.state);
  }
  EXPECT_EQ(nonces.size(), 200u);
  EXPECT_EQ(states.size(), 200u);
}

// Every digit but those of version and variant takes all its values.
TYPED_TEST(ClientRequest, HasANonceThatIsRandomInEveryDigit) {
  std::array<std::set<char>, 36> seen;
  for (int i = 0; i < 500; ++i) {
    const std::string url = this->url();
    const std::string nonce = url.substr(url.find("nonce=") + 6, 36);
    for (size_t at = 0; at < seen.size(); ++at) seen[at].insert(nonce[at]);
  }
  for (size_t at = 0; at < seen.size(); ++at) {
    const bool dash = at == 8 || at == 13 || at == 18 || at == 23;
    EXPECT_EQ(seen[at].size(), dash || at == 14 ? 1u : at == 19 ? 4u : 16u) << at;
  }
}

TYPED_TEST(ClientRequest, CarriesTheDigestOfTheNonceAloneForNull) {
  const Request request = this->ask(Json::Value());
  EXPECT_EQ(request.state, "{\"nonce\":\"" + test::md5(request.nonce) + "\"}\n");
}

TYPED_TEST(ClientRequest, CarriesTheCallersObject) {
  Json::Value parameters;
  parameters["origin"] = "/webman/index.cgi";
  parameters["zone"]["deep"].append(1);
  EXPECT_EQ(this->stateWithoutNonce(parameters),
            "{N,\"origin\":\"/webman/index.cgi\",\"zone\":{\"deep\":[1]}}\n");
}

TYPED_TEST(ClientRequest, EscapesWhatIsNotAsciiInTheState) {
  Json::Value parameters;
  parameters["origin"] = "/M\xc3\xbcnchen/\xf0\x9f\x98\x80";
  EXPECT_EQ(this->stateWithoutNonce(parameters),
            "{N,\"origin\":\"/M\\u00fcnchen/\\ud83d\\ude00\"}\n");
}

TYPED_TEST(ClientRequest, ReplacesANonceOfTheCaller) {
  Json::Value parameters;
  for (const Json::Value& nonce : {Json::Value("mine"), Json::Value(5), Json::Value()}) {
    parameters["nonce"] = nonce;
    EXPECT_EQ(this->stateWithoutNonce(parameters), "{N}\n");
    EXPECT_EQ(parameters["nonce"], nonce) << "the caller's object is copied";
  }
}

TYPED_TEST(ClientRequest, TreatsWhatIsNotAnObjectAsNull) {
  for (const Json::Value& parameters :
       {Json::Value(), Json::Value(5), Json::Value("text"), Json::Value(true),
        Json::Value(Json::arrayValue), Json::Value(Json::objectValue)}) {
    EXPECT_EQ(this->stateWithoutNonce(parameters), "{N}\n") << parameters.toStyledString();
  }
  Json::Value list;
  list.append("x");
  EXPECT_EQ(this->stateWithoutNonce(list), "{N}\n");
}

TYPED_TEST(ClientRequest, FitsAStateOf765Bytes) {
  EXPECT_EQ(this->ask(this->parametersOfLength(765)).state.size(), 765u);
}

TYPED_TEST(ClientRequest, ThrowsForAStateOf766Bytes) {
  for (size_t length : {766u, 767u, 768u, 769u, 100000u}) {
    EXPECT_TRUE(throws<sso_op_failed>("encode base64 failed.", [&] {
      this->url(this->parametersOfLength(length));
    })) << length;
  }
}

TYPED_TEST(ClientRequest, UsesTheEndpointAsItIs) {
  for (const char* endpoint : {"", "https://a/b?tenant=c", "not a URL", "https://a/#x"}) {
    Json::Value settings = Settings();
    settings["authorization_endpoint"] = endpoint;
    test::configure<TypeParam>(settings);
    EXPECT_EQ(this->url().find(std::string(endpoint) + "?client_id="), 0u) << endpoint;
  }
}

TYPED_TEST(ClientRequest, DoesNotRefuseEmptySettings) {
  test::removeConfig(TypeParam::name() + ".conf");
  const std::regex form(
      "\\?client_id=&nonce=[0-9a-f-]{36}&redirect_uri=&response_type=code&scope=" +
      TypeParam::scope() + "&state=.+");
  EXPECT_TRUE(std::regex_match(this->url(), form));
  typename TypeParam::Client client;
  EXPECT_EQ(client.GetIDTokenReqParams(),
            "client_id=&client_secret=&code=&grant_type=authorization_code&redirect_uri=");
}

TYPED_TEST(ClientRequest, UsesARedirectURISetLater) {
  typename TypeParam::Client client;
  client.SetRedirectURI("https://other/");
  const std::string encoded = "redirect_uri=https%3A%2F%2Fother%2F";
  EXPECT_NE(client.GetAccessTokenReqURI(Json::Value()).find("&" + encoded + "&"),
            std::string::npos);
  const std::string body = client.GetIDTokenReqParams();
  EXPECT_EQ(body.substr(body.rfind('&') + 1), encoded);
}

TYPED_TEST(ClientRequest, IsWrittenAsOneRedirectHeaderThatIsNotFlushed) {
  typename TypeParam::Client client;
  Json::Value parameters;
  parameters["origin"] = "/";
  test::CoutRecorder out;
  client.RedirectAuthEndpoint(parameters);
  EXPECT_EQ(out.flushes, 0);
  ASSERT_EQ(out.writes.size(), 1u);
  const std::string url = "https://provider\\.example\\.com/authorize\\?client_id=[^\r\n]*";
  EXPECT_TRUE(std::regex_match(out.writes[0], std::regex("Location: " + url + "\n\n")))
      << out.writes[0];
}

TYPED_TEST(ClientRequest, IsWrittenToStandardOutput) {
  const std::string out = test::stdoutOf([] {
    typename TypeParam::Client client;
    client.RedirectAuthEndpoint(Json::Value());
  });
  EXPECT_EQ(out.find("Location: https://provider.example.com/authorize?client_id="), 0u) << out;
  EXPECT_EQ(out.find('\n'), out.size() - 2);
  EXPECT_EQ(out.substr(out.size() - 2), "\n\n");
}

TYPED_TEST(ClientRequest, WritesNothingWhenTheUrlCannotBeMade) {
  typename TypeParam::Client client;
  const Json::Value parameters = this->parametersOfLength(766);
  test::CoutRecorder out;
  EXPECT_TRUE(throws<sso_op_failed>("encode base64 failed.",
                                    [&] { client.RedirectAuthEndpoint(parameters); }));
  EXPECT_TRUE(out.writes.empty());
  EXPECT_EQ(out.flushes, 0);
}

TYPED_TEST(ClientRequest, IsFollowedByACodeExchangeWithTheSecretInItsBody) {
  typename TypeParam::Client client;
  client.SetCode("0.AQ&=+ /\xff");
  EXPECT_EQ(client.GetIDTokenReqParams(),
            std::string("client_id=") + kClientID + "&client_secret=" + kSecret +
                "&code=0.AQ%26%3D%2B%20%2F%FF&grant_type=authorization_code&redirect_uri=" +
                kRedirectURI);
}

TYPED_TEST(ClientRequest, ExchangesAnEmptyCodeAsWell) {
  typename TypeParam::Client client;
  const std::string body = std::string("client_id=") + kClientID + "&client_secret=" + kSecret +
                           "&code=&grant_type=authorization_code&redirect_uri=" + kRedirectURI;
  EXPECT_EQ(client.GetIDTokenReqParams(), body);
  client.SetCode("x");
  client.SetCode("");
  EXPECT_EQ(client.GetIDTokenReqParams(), body);
}

}  // namespace
