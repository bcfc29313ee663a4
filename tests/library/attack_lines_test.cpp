// Line breaks, and what else could end a value early, in every setting and parameter: where they
// come out, and in what form. What comes out as it is has a test too: callers must know.
#include <curl/curl.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "sso/profile.h"
#include "sso/sso.h"
#include "sso/utils.h"
#include "support/provider.h"
#include "support/query.h"
#include "support/token_check.h"

namespace {

using QOVA::SSO::GetAzureSSOLogoutURL;
using QOVA::SSO::GetSSORelayURL;
using QOVA::SSO::URLEncode;
using test::throws;

const char kBreak[] = "\r\nSet-Cookie: id=forged\r\n\r\n<script>";
const char kEncodedBreak[] = "%0D%0ASet-Cookie%3A%20id%3Dforged%0D%0A%0D%0A%3Cscript%3E";

bool holdsBreak(const std::string& text) {
  return text.find_first_of("\r\n") != std::string::npos;
}

template <typename Provider>
class AttackLines : public test::TokenCheck<Provider> {
 protected:
  using Client = typename Provider::Client;

  // A client all of whose settings end in a line break and more, but for those named.
  void poison(const std::vector<std::string>& clean = {}) {
    for (const char* name :
         {"client_id", "client_secret", "redirect_uri", "tenant_id", "authorization_endpoint",
          "token_endpoint", "wellknown", "logout_endpoint"}) {
      const bool left = std::find(clean.begin(), clean.end(), name) != clean.end();
      this->settings[name] = std::string("https://x/") + (left ? "" : kBreak);
    }
    test::configure<Provider>(this->settings);
  }
};
TYPED_TEST_SUITE(AttackLines, test::Clients, test::ClientName);

// Only the endpoint stands outside the encoding, exactly as it was configured.
TYPED_TEST(AttackLines, LeaveTheRedirectHeaderWhole) {
  this->poison({"authorization_endpoint"});
  Json::Value origin;
  origin["origin"] = kBreak;
  origin[kBreak] = kBreak;
  const std::string out = test::stdoutOf([&] {
    typename TestFixture::Client client;
    client.RedirectAuthEndpoint(origin);
  });
  EXPECT_EQ(out.find_first_of("\r\n"), out.size() - 2);
  EXPECT_EQ(out.substr(out.size() - 2), "\n\n");
  const std::string value = std::string("https%3A%2F%2Fx%2F") + kEncodedBreak;
  EXPECT_NE(out.find("?client_id=" + value + "&nonce="), std::string::npos) << out;
  EXPECT_NE(out.find("&redirect_uri=" + value + "&response_type="), std::string::npos) << out;
  EXPECT_EQ(out.find('<'), std::string::npos);
}

// Whoever writes the configuration writes the header: the file is root's.
TYPED_TEST(AttackLines, InTheAuthorizationEndpointComeOutAsTheyAre) {
  this->poison();
  typename TestFixture::Client client;
  const std::string url = client.GetAccessTokenReqURI(Json::Value());
  EXPECT_EQ(url.find(std::string("https://x/") + kBreak + "?client_id="), 0u);
  EXPECT_FALSE(holdsBreak(url.substr(url.find("?client_id="))));
}

TYPED_TEST(AttackLines, LeaveTheBodyOfTheCodeExchangeWhole) {
  this->poison();
  typename TestFixture::Client client;
  client.SetCode(std::string("code") + kBreak + "&client_id=forged#?=+%00%");
  const std::string body = client.GetIDTokenReqParams();
  EXPECT_FALSE(holdsBreak(body));
  const auto parameters = test::parametersOf(body);
  ASSERT_EQ(parameters.size(), 5u) << body;
  EXPECT_EQ(parameters[0].first, "client_id");
  EXPECT_EQ(parameters[0].second, std::string("https%3A%2F%2Fx%2F") + kEncodedBreak);
  EXPECT_EQ(parameters[1].second, parameters[0].second);
  EXPECT_EQ(parameters[2].second,
            std::string("code") + kEncodedBreak + "%26client_id%3Dforged%23%3F%3D%2B%2500%25");
  EXPECT_EQ(parameters[4].second, parameters[0].second);
}

// libcurl takes no such address: nothing is sent, so that no header can be slipped in.
TYPED_TEST(AttackLines, InAnAddressSendNothing) {
  test::Provider provider;
  provider.start();
  for (const char* end :
       {"\r\nX: y", "\n", "\r", " ", "\t", "\x7f", "\x01", "/ HTTP/1.1\r\nHost: x"}) {
    const std::string address = provider.url("/token") + end;
    const test::Expected token = {
        LOG_ERR, "sso.cpp",
        std::string("request token uri ") + curl_easy_strerror(CURLE_URL_MALFORMAT) + "."};
    this->settings["token_endpoint"] = address;
    this->settings["wellknown"] = address;
    test::configure<TypeParam>(this->settings);
    typename TestFixture::Client client;
    std::string response;
    this->log.clear();
    client.RequestTokenEndpoint(response, "a=b");
    EXPECT_TRUE(this->log.is({token})) << testing::PrintToString(address);
    EXPECT_EQ(response, "");
    Json::Value document;
    this->log.clear();
    client.RequestWellknownInfo(document);
    EXPECT_TRUE(this->log.is({{LOG_ERR, "sso.cpp", curl_easy_strerror(CURLE_URL_MALFORMAT)}}));
  }
  EXPECT_TRUE(provider.requests().empty());
}

// What the caller sets is kept as it is, and comes out encoded like the configured address.
TYPED_TEST(AttackLines, OfARedirectUriThatIsSetLeaveHeaderAndBodyWhole) {
  this->settings["authorization_endpoint"] = "https://x/";
  this->settings["redirect_uri"] = "https://configured/";
  test::configure<TypeParam>(this->settings);
  for (const std::string& end : {std::string(kBreak), std::string("\r"), std::string("\n")}) {
    typename TestFixture::Client client;
    client.SetRedirectURI("https://nas/" + end);
    EXPECT_EQ(client.GetRedirectURI(), "https://nas/" + end);
    const std::string encoded = "https%3A%2F%2Fnas%2F" + URLEncode(end);
    ASSERT_EQ(test::percentDecoded(encoded), "https://nas/" + end);
    const std::string header =
        test::stdoutOf([&] { client.RedirectAuthEndpoint(Json::Value(Json::objectValue)); });
    EXPECT_EQ(header.find_first_of("\r\n"), header.size() - 2) << header;
    EXPECT_EQ(header.find("Location: https://x/?client_id="), 0u) << header;
    EXPECT_NE(header.find("&redirect_uri=" + encoded + "&response_type="), std::string::npos)
        << header;
    const std::string body = client.GetIDTokenReqParams();
    EXPECT_FALSE(holdsBreak(body));
    const auto parameters = test::parametersOf(body);
    ASSERT_EQ(parameters.size(), 5u) << body;
    EXPECT_EQ(parameters[4].first, "redirect_uri");
    EXPECT_EQ(parameters[4].second, encoded);
  }
}

TYPED_TEST(AttackLines, OfATokenStayInTheMessage) {
  const std::string header = "{\"alg\":" + test::jsonText(kBreak) + ",\"kid\":\"the key\"}";
  EXPECT_TRUE(this->template refuses<QOVA::JWT::jwt_not_support>(
      std::string(kBreak) + " algorithm is not supported", this->token(header)));
  EXPECT_TRUE(this->log.isEmpty());
}

using AttackAzureLines = AttackLines<test::Azure>;

// The provider's own document names the address: it is refused like a configured one.
TEST_F(AttackAzureLines, OfTheDiscoveryDocumentSendNothing) {
  test::Provider provider;
  provider.start();
  const std::string address = provider.url("/keys") + "\r\nX: y";
  test::writeConfig("discovery", "{\"jwks_uri\":" + test::jsonText(address) + "}");
  EXPECT_TRUE(misses(token(goodHeader())));
  EXPECT_TRUE(log.is(
      {{LOG_ERR, "azuresso.cpp",
        std::string("request wellknown uri ") + curl_easy_strerror(CURLE_URL_MALFORMAT) + "."}}));
  EXPECT_TRUE(provider.requests().empty());
}

// One line, whatever the error response holds, with the line feed of the writer at its end.
TEST_F(AttackAzureLines, OfAnErrorResponseAreEscaped) {
  Client client;
  const std::string description = "{\"error\":" + test::jsonText(kBreak) + "}";
  EXPECT_TRUE(throws<QOVA::SSO::sso_err_resp>(
      "{\"error\":\"\\r\\nSet-Cookie: id=forged\\r\\n\\r\\n<script>\"}\n",
      [&] { client.ProcessTokenResponse(description); }));
}

TEST_F(AttackAzureLines, OfAnAddressAreEncodedInTheLogoutUrl) {
  settings["logout_endpoint"] = "https://x/logout";
  test::configure<test::Azure>(settings);
  const std::string url = GetAzureSSOLogoutURL(std::string("https://nas/") + kBreak);
  EXPECT_EQ(url, std::string("https://x/logout?post_logout_redirect_uri=https%3A%2F%2Fnas%2F") +
                     kEncodedBreak + "%2Fwebman%2Fssoclient%2Frelay.html");
  settings["logout_endpoint"] = std::string("https://x/") + kBreak;
  test::configure<test::Azure>(settings);
  EXPECT_EQ(GetAzureSSOLogoutURL("").find("https://x/\r\n"), 0u) << "as it is configured";
}

TEST_F(AttackAzureLines, OfANameReachThePlatformAsTheyAre) {
  for (const char* name : {"unique_name", "email"}) {
    Client client;
    const std::string claim = "\nA\r\nlice\r@co\n\rrp\r\n";
    take(client,
         token(goodHeader(), std::string("{\"") + name + "\":" + test::jsonText(claim) + "}"));
    std::string user;
    client.GetUserName(user);
    EXPECT_EQ(user, "CO\n\rRP\r\n\\\nA\r\nlice\r") << name;
    EXPECT_TRUE(log.isEmpty());
  }
}

TEST(AttackRelay, EncodesTheOriginAndNotTheReason) {
  Json::Value state;
  state["origin"] = kBreak;
  state["nonce"] = kBreak;
  const std::string url = GetSSORelayURL(true, test::base64(state.toStyledString()), kBreak);
  EXPECT_EQ(url, std::string("ssoclient/relay.html#origin=") + kEncodedBreak + "&success=true");
  EXPECT_EQ(GetSSORelayURL(false, "", kBreak),
            std::string("ssoclient/relay.html#reason=") + kBreak + "&success=false");
}

// A success cannot be talked into a failure, nor the other way round, by what the state holds.
TEST(AttackRelay, KeepsItsVerdict) {
  for (const char* origin : {"&success=false", "#success=false", "x&success=true&y=", "%26success",
                             "javascript:alert(1)", "//evil.example.com", "\\\\evil"}) {
    Json::Value state;
    state["origin"] = origin;
    const std::string url = GetSSORelayURL(true, test::base64(state.toStyledString()), "");
    const std::string start = "ssoclient/relay.html#origin=";
    const std::string end = "&success=true";
    ASSERT_GT(url.size(), start.size() + end.size());
    EXPECT_EQ(url.substr(0, start.size()), start);
    EXPECT_EQ(url.substr(url.size() - end.size()), end);
    const std::string value = url.substr(start.size(), url.size() - start.size() - end.size());
    EXPECT_EQ(value.find_first_of("&#=:/\\()"), std::string::npos) << value;
    EXPECT_EQ(test::percentDecoded(value), origin);
  }
}

// Base64 of another kind, or with anything between its characters, is not a state.
TEST(AttackRelay, ReadsNoStateFromWhatIsNotQuiteBase64) {
  const std::string json = R"({"origin":"/?>~~>?"})";
  const std::string good = test::base64(json);
  ASSERT_NE(GetSSORelayURL(true, good, "").find("origin="), std::string::npos);
  std::vector<std::string> states = {good + "\r\n",
                                     "\n" + good,
                                     " " + good,
                                     good + good,
                                     good + "=",
                                     good + "====",
                                     good.substr(0, good.size() - 1),
                                     good + '\0',
                                     "%" + good,
                                     test::base64url(json) + "."};
  for (size_t at = 1; at < good.size(); at += 5) {
    for (const char* odd : {"\r\n", " ", "-", "_", "=", "%2B", "\xff"}) {
      std::string state = good;
      states.push_back(state.insert(at, odd));
    }
  }
  for (const std::string& state : states) {
    EXPECT_EQ(GetSSORelayURL(true, state, ""), "ssoclient/relay.html#success=true")
        << testing::PrintToString(state);
  }
}

TEST(AttackPercent, EncodingIsNotTakenForEncoded) {
  for (const auto& [text, encoded] :
       std::vector<std::pair<std::string, std::string>>{{"%", "%25"},
                                                        {"%0d%0a", "%250d%250a"},
                                                        {"%00", "%2500"},
                                                        {"%zz", "%25zz"},
                                                        {"%25", "%2525"},
                                                        {"a%", "a%25"},
                                                        {"%u000a", "%25u000a"},
                                                        {"+", "%2B"},
                                                        {" ", "%20"},
                                                        {"\xc0\x8a", "%C0%8A"},
                                                        {"\xe5\x98\x8a", "%E5%98%8A"},
                                                        {"\x7f", "%7F"},
                                                        {"\xe2\x80\xa8", "%E2%80%A8"}}) {
    EXPECT_EQ(URLEncode(text), encoded);
    EXPECT_EQ(test::percentDecoded(URLEncode(text)), text);
  }
  // A zero byte ends the text for the platform, which is given no length.
  EXPECT_EQ(URLEncode(std::string("a\0b", 3)), "a");
  EXPECT_EQ(URLEncode(std::string("\0", 1)), "");
}

// Each length at which a text of escapes alone fills the buffer, and texts that just do not.
TEST(AttackPercent, EncodingFillsItsBufferToTheLastByte) {
  for (size_t size = 1; size <= 700; ++size) {
    const std::string encoded = URLEncode(std::string(size, '\n'));
    ASSERT_EQ(encoded.size(), 3 * size);
    for (size_t at = 0; at < encoded.size(); at += 3) ASSERT_EQ(encoded.substr(at, 3), "%0A");
    std::string mixed(size, '\n');
    mixed[size / 2] = 'a';
    ASSERT_EQ(URLEncode(mixed).size(), 3 * size - 2);
  }
}

TEST(AttackProfile, NameIsLoggedAsItStands) {
  for (const std::string& name :
       {std::string("azure\nroot: forged %s%n"), std::string("azure\r\nroot: forged"),
        std::string("azure\r"), std::string("azure\n"), std::string(kBreak)}) {
    test::Log log;
    test::writeConfig("profile.conf",
                      "{\"sso_enable\":true,\"sso_profile\":" + test::jsonText(name) + "}");
    QOVA::SSO::SSOProfile profile;
    EXPECT_TRUE(log.is({{LOG_ERR, "profile.cpp", "Profile '" + name + "' not support"}}));
    EXPECT_EQ(profile.GetSSOProfile(), name);
    std::string user;
    EXPECT_TRUE(throws<QOVA::SSO::sso_exception>("profile not support.",
                                                 [&] { QOVA::SSO::OIDCLogin("code", user); }));
  }
}

using AttackWebSphereLines = AttackLines<test::WebSphere>;

TEST_F(AttackWebSphereLines, OfASubjectStayInTheName) {
  for (const char* name : {"A\r\nlice", "\r", "\n", "Alice\n", "\r\nAlice", kBreak}) {
    Client client;
    take(client, token(goodHeader(), "{\"sub\":" + test::jsonText(name) + "}"));
    std::string user = "before";
    client.GetUserName(user);
    EXPECT_EQ(user, name);
    EXPECT_TRUE(log.isEmpty());
  }
}

// The borders of the two texts that the platform encodes into 1024 bytes: 765 bytes fit, and what
// was encoded is whole.
TEST_F(AttackWebSphereLines, SecretsUpToTheBorderAreUsedWhole) {
  for (size_t size = 760; size <= 771; ++size) {
    std::string secret(size, 's');
    secret.back() = '!';
    settings["client_secret"] = secret;
    test::configure<test::WebSphere>(settings);
    const std::string right = test::hmacToken(secret, goodHeader(), test::kCheckBody);
    const std::string shorter =
        test::hmacToken(secret.substr(0, size - 1), goodHeader(), test::kCheckBody);
    if (size <= 765) {
      EXPECT_TRUE(accepts(right)) << size;
      EXPECT_TRUE(doubts(shorter)) << size;
    } else {
      for (const std::string& token : {right, shorter})
        EXPECT_TRUE(refuses<QOVA::SSO::sso_op_failed>("encode base64 failed.", token)) << size;
    }
  }
}

TYPED_TEST(AttackLines, AStateUpToTheBorderComesBackWhole) {
  for (size_t size = 690; size <= 720; ++size) {
    Json::Value parameters;
    parameters["origin"] = std::string(size - 1, 'o') + '!';
    const size_t text = size + std::string(R"({"nonce":"","origin":""})").size() + 32 + 1;
    typename TestFixture::Client client;
    if (text > 765) {
      EXPECT_TRUE(throws<QOVA::SSO::sso_op_failed>("encode base64 failed.", [&] {
        client.GetAccessTokenReqURI(parameters);
      })) << size;
      continue;
    }
    const std::string url = client.GetAccessTokenReqURI(parameters);
    const std::string state = test::percentDecoded(url.substr(url.find("&state=") + 7));
    EXPECT_EQ(state.size(), (text + 2) / 3 * 4);
    EXPECT_EQ(GetSSORelayURL(true, state, ""),
              "ssoclient/relay.html#origin=" + URLEncode(parameters["origin"].asString()) +
                  "&success=true")
        << size;
  }
}

}  // namespace
