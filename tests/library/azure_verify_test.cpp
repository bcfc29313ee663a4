// An Azure ID token against the tenant, the client and the key set that the provider publishes.
#include <curl/curl.h>
#include <gtest/gtest.h>
#include <json/value.h>

#include <memory>
#include <string>
#include <vector>

#include "sso/azuresso.h"
#include "support/device.h"
#include "support/log.h"
#include "support/provider.h"
#include "support/throws.h"
#include "support/tokens.h"

namespace {

using QOVA::JWT::jwt_not_support;
using QOVA::JWT::jwt_verify_failed;
using QOVA::SSO::AzureSSOClient;
using test::throws;

const char kNoKey[] = "kid does not exist in Azure verified kyes";
const char kWrongSignature[] = "verify rsa signature failed";
const test::Expected kSignatureLine = {LOG_ERR, "jwt.cpp", "EVP_DigestVerifyFinal failed"};

test::Expected keysLine(const std::string& what) {
  return {LOG_ERR, "azuresso.cpp", "request wellknown uri " + what + "."};
}

// libcurl's answer to an address that is missing.
const std::string kNoAddress = curl_easy_strerror(CURLE_URL_MALFORMAT);

class AzureVerify : public testing::Test {
 protected:
  AzureVerify() {
    header["alg"] = "RS256";
    header["kid"] = "the key";
    body["exp"] = Json::Int64{4102444800};
    body["tid"] = "the tenant";
    body["aud"] = "the device";
  }

  // A token with a signature that is not one.
  std::string unsignedToken() const {
    return test::signingInput(header.toStyledString(), body.toStyledString()) + ".c2ln";
  }

  std::string signedToken(const std::string& algorithm = "RS256") const {
    return test::rsaToken(test::anyRsaKey(), header.toStyledString(), body.toStyledString(),
                          algorithm);
  }

  static std::string keySet(const std::string& keys) { return "{\"keys\":[" + keys + "]}"; }
  static std::string goodKey() { return test::anyRsaKey().jwk("the key"); }

  // Verifies a token against a provider with this key set, and this discovery document if it is
  // not the ordinary one ("KEYS" in it is the address of the key set).
  void verify(const std::string& token, const test::Answer& keys, std::string discovery = "") {
    log.clear();
    provider = std::make_unique<test::Provider>();
    if (discovery.empty()) discovery = R"({"issuer":"x", "jwks_uri":"KEYS"})";
    const std::string url = provider->url("/keys");
    const size_t at = discovery.find("KEYS");
    if (at != std::string::npos) discovery.replace(at, 4, url);
    provider->answer("/discovery", test::ok(discovery)).answer("/keys", keys).start();
    configure(provider->url("/discovery"));
    AzureSSOClient client;
    verifyWith(client, token);
  }

  void verify(const std::string& token, const std::string& keys) { verify(token, test::ok(keys)); }
  void verify(const std::string& token) { verify(token, keySet(goodKey())); }

  static void configure(const std::string& wellknown) {
    Json::Value file;
    file["azure_wellknown"] = wellknown;
    file["azure_client_id"] = "the device";
    file["azure_tenant_id"] = "the tenant";
    test::writeConfig("azure.conf", file.toStyledString());
  }

  static void verifyWith(AzureSSOClient& client, const std::string& token) {
    Json::Value response;
    response["id_token"] = token;
    client.ProcessTokenResponse(response.toStyledString());
    struct Kept {
      ~Kept() { EXPECT_EQ(client.GetToken(), token); }
      AzureSSOClient& client;
      const std::string& token;
    } kept{client, token};
    client.VerifyIDToken();
  }

  std::vector<std::string> requested() const {
    std::vector<std::string> targets;
    for (const test::Request& request : provider->requests())
      targets.push_back(request.method + " " + request.target);
    return targets;
  }

  const std::vector<std::string> kBoth = {"GET /discovery", "GET /keys"};
  const std::vector<std::string> kNone;
  Json::Value header;
  Json::Value body;
  std::unique_ptr<test::Provider> provider;
  test::Log log;
};

TEST_F(AzureVerify, AcceptsTheThreeAlgorithms) {
  for (const char* algorithm : {"RS256", "RS384", "RS512"}) {
    header["alg"] = algorithm;
    EXPECT_NO_THROW(verify(signedToken(algorithm))) << algorithm;
    EXPECT_EQ(requested(), kBoth);
    EXPECT_TRUE(log.isEmpty());
  }
}

TEST_F(AzureVerify, RefusesTheDigestOfAnotherAlgorithm) {
  header["alg"] = "RS512";
  EXPECT_TRUE(throws<jwt_verify_failed>(kWrongSignature, [&] { verify(signedToken("RS256")); }));
  EXPECT_TRUE(log.is({kSignatureLine}));
}

TEST_F(AzureVerify, RefusesEveryOtherAlgorithm) {
  for (const char* algorithm : {"HS256", "HS512", "ES256", "PS256", "none", "rs256", "Rs256", "",
                                "RS25", "RS2560", " RS256", "RS256 ", "RS128"}) {
    header["alg"] = algorithm;
    EXPECT_TRUE(throws<jwt_not_support>(std::string(algorithm) + " algorithm is not supported",
                                        [&] { verify(signedToken()); }));
    EXPECT_EQ(requested(), kBoth) << "the key is looked for first";
    EXPECT_TRUE(log.isEmpty());
  }
}

TEST_F(AzureVerify, NamesAnAlgorithmThatIsNoTextByItsText) {
  header["alg"] = 5;
  EXPECT_TRUE(
      throws<jwt_not_support>("5 algorithm is not supported", [&] { verify(signedToken()); }));
  header["alg"] = Json::Value();
  EXPECT_TRUE(
      throws<jwt_not_support>(" algorithm is not supported", [&] { verify(signedToken()); }));
  header.removeMember("alg");
  EXPECT_TRUE(
      throws<jwt_not_support>(" algorithm is not supported", [&] { verify(signedToken()); }));
}

TEST_F(AzureVerify, RefusesAnotherKeyTextOrSignature) {
  const std::string token = signedToken();
  std::vector<std::string> wrong = {unsignedToken(), token.substr(0, token.size() - 4)};
  body["roles"] = "admin";
  wrong.push_back(test::signingInput(header.toStyledString(), body.toStyledString()) +
                  token.substr(token.rfind('.')));
  for (const std::string& other : wrong) {
    EXPECT_TRUE(throws<jwt_verify_failed>(kWrongSignature, [&] { verify(other); }));
    EXPECT_TRUE(log.is({kSignatureLine}));
  }
  const std::string foreign = test::RsaKey().jwk("the key");
  EXPECT_TRUE(throws<jwt_verify_failed>(kWrongSignature, [&] { verify(token, keySet(foreign)); }));
  EXPECT_TRUE(log.is({kSignatureLine}));
}

TEST_F(AzureVerify, RefusesAMissingSignatureSilently) {
  const std::string token = signedToken();
  EXPECT_TRUE(throws<jwt_verify_failed>(kWrongSignature,
                                        [&] { verify(token.substr(0, token.rfind('.') + 1)); }));
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(AzureVerify, LooksAtNoOtherClaim) {
  body["iss"] = "https://foreign.example.com";
  body["nonce"] = "wrong";
  body["nbf"] = Json::Int64{4102444800};
  body["iat"] = Json::Int64{4102444800};
  body["azp"].append("another");
  header["typ"] = "odd";
  header["x5t"] = "odd";
  EXPECT_NO_THROW(verify(signedToken()));
}

TEST_F(AzureVerify, FetchesNothingBeforeTheClaimsAreRight) {
  const Json::Value right = body;
  for (const char* claim : {"exp", "tid", "aud"}) {
    body = right;
    body.removeMember(claim);
    EXPECT_THROW(verify(unsignedToken()), std::invalid_argument);
    EXPECT_EQ(requested(), kNone) << claim;
  }
}

TEST_F(AzureVerify, NeedsTheTenantByteForByte) {
  for (const char* tenant : {"", "the tenan", "the tenant ", "The tenant", "the device"}) {
    body["tid"] = tenant;
    EXPECT_TRUE(
        throws<std::invalid_argument>("tenant ID invalid", [&] { verify(unsignedToken()); }));
  }
  body["tid"] = std::string("the tenant\0", 11);
  EXPECT_TRUE(throws<std::invalid_argument>("tenant ID invalid", [&] { verify(unsignedToken()); }));
  body["tid"] = 42;
  EXPECT_TRUE(throws<std::invalid_argument>("tenant ID invalid", [&] { verify(unsignedToken()); }));
}

TEST_F(AzureVerify, ComparesTheTextsOfNumbersAndOfWhatIsMissing) {
  test::writeConfig("azure.conf", R"({"azure_client_id":"7", "azure_tenant_id":"42"})");
  AzureSSOClient numbered;
  body["tid"] = 42;
  body["aud"] = 7;
  EXPECT_TRUE(
      throws<std::invalid_argument>(kNoKey, [&] { verifyWith(numbered, unsignedToken()); }));
  test::removeConfig("azure.conf");
  AzureSSOClient empty;
  body["tid"] = Json::Value();
  body.removeMember("aud");
  EXPECT_TRUE(throws<std::invalid_argument>(kNoKey, [&] { verifyWith(empty, unsignedToken()); }));
}

TEST_F(AzureVerify, LetsTheErrorOfTheJsonLibraryPass) {
  // Read before anything is checked: the token is expired as well.
  body["exp"] = 1;
  for (Json::Value* place : {&header["kid"], &body["tid"]}) {
    const Json::Value right = *place;
    for (const Json::ValueType type : {Json::arrayValue, Json::objectValue}) {
      *place = Json::Value(type);
      EXPECT_TRUE(throws<Json::LogicError>([&] { verify(unsignedToken()); }));
      EXPECT_EQ(requested(), kNone);
    }
    *place = right;
  }
}

// A token that is wrong in every way reports the first; repaired, the next.
TEST_F(AzureVerify, ReportsTheFirstOfManyFaults) {
  std::string keys = R"({"keys":[{"kid":"the key"}]})";
  const auto refuses = [&](const std::string& message, const std::string& token) {
    return throws<std::invalid_argument>(message, [&] { verify(token, keys); });
  };
  EXPECT_TRUE(refuses("token cannot be empty", ""));
  EXPECT_TRUE(refuses("bad jwt format!", "!!!!.!!!!"));
  EXPECT_TRUE(refuses("bad jwt header format!", "!!!!.!!!!.!"));
  EXPECT_TRUE(refuses("bad jwt body format!", "e30.!!!!.!"));
  header["alg"] = "none";
  header["kid"] = "unknown";
  body["exp"] = 1;
  body["tid"] = "another";
  body["aud"] = "another";
  EXPECT_TRUE(refuses("id_token expired.", unsignedToken()));
  body["exp"] = Json::Int64{4102444800};
  EXPECT_TRUE(refuses("tenant ID invalid", unsignedToken()));
  body["tid"] = "the tenant";
  EXPECT_TRUE(refuses("client ID invalid", unsignedToken()));
  body["aud"] = "the device";
  EXPECT_TRUE(refuses(kNoKey, unsignedToken()));
  header["kid"] = "the key";
  EXPECT_TRUE(refuses("RSA public 'n' cannot be found!", unsignedToken()));
  keys = R"({"keys":[{"kid":"the key", "n":"AQAB"}]})";
  EXPECT_TRUE(refuses("RSA public 'e' cannot be found!", unsignedToken()));
  keys = keySet(goodKey());
  EXPECT_TRUE(throws<jwt_not_support>("none algorithm is not supported",
                                      [&] { verify(unsignedToken(), keys); }));
  header["alg"] = "RS256";
  EXPECT_TRUE(throws<jwt_verify_failed>(kWrongSignature, [&] { verify(unsignedToken(), keys); }));
  EXPECT_NO_THROW(verify(signedToken(), keys));
}

class AzureKey : public AzureVerify {};

TEST_F(AzureKey, IsTheOneWithTheKidOfTheHeader) {
  const std::string other = test::RsaKey().jwk("another");
  for (const std::string& keys : {goodKey(), other + "," + goodKey(), goodKey() + "," + other}) {
    EXPECT_NO_THROW(verify(signedToken(), keySet(keys)));
    EXPECT_TRUE(log.isEmpty());
  }
}

TEST_F(AzureKey, IsTheFirstOfTwoWithTheSameKid) {
  const std::string wrong = test::RsaKey().jwk("the key");
  EXPECT_NO_THROW(verify(signedToken(), keySet(goodKey() + "," + wrong)));
  EXPECT_TRUE(throws<jwt_verify_failed>(
      kWrongSignature, [&] { verify(signedToken(), keySet(wrong + "," + goodKey())); }));
  EXPECT_TRUE(throws<std::invalid_argument>("RSA public 'n' cannot be found!", [&] {
    verify(signedToken(), keySet(R"({"kid":"the key"},)" + goodKey()));
  }));
}

TEST_F(AzureKey, IsFoundBehindWhatHasNoKid) {
  for (const char* passed : {"{}", R"({"n":"AQAB","e":"AQAB"})", "null", "5", "\"the key\"", "[]",
                             R"(["the key"])", R"([{"kid":"the key"}])", R"({"KID":"the key"})"}) {
    EXPECT_NO_THROW(verify(signedToken(), keySet(passed + std::string(",") + goodKey()))) << passed;
    EXPECT_TRUE(log.isEmpty());
  }
}

TEST_F(AzureKey, IsComparedByTheTextOfItsKid) {
  header["kid"] = 42;
  EXPECT_NO_THROW(verify(signedToken(), keySet(test::anyRsaKey().jwk("42"))));
  header["kid"] = "42";
  const Json::Value number = 42;
  std::string key = test::anyRsaKey().jwk("KID");
  key.replace(key.find("\"KID\""), 5, "42");
  EXPECT_NO_THROW(verify(signedToken(), keySet(key)));
  // A header without a "kid" names the key whose "kid" is empty.
  header.removeMember("kid");
  EXPECT_NO_THROW(verify(signedToken(), keySet(goodKey() + "," + test::anyRsaKey().jwk(""))));
}

TEST_F(AzureKey, WithAnotherKidIsNotTaken) {
  for (const char* kid : {"The key", "the key ", "the ke", "", "another"}) {
    header["kid"] = kid;
    EXPECT_TRUE(throws<std::invalid_argument>(kNoKey, [&] { verify(signedToken()); })) << kid;
    EXPECT_EQ(requested(), kBoth);
    EXPECT_TRUE(log.isEmpty());
  }
}

TEST_F(AzureKey, WithAKidThatIsNoTextLetsTheErrorOfTheJsonLibraryPass) {
  for (const char* kid : {"[]", "{}", "[\"the key\"]"}) {
    const std::string keys = keySet(std::string("{\"kid\":") + kid + "}," + goodKey());
    EXPECT_TRUE(throws<Json::LogicError>([&] { verify(signedToken(), keys); })) << kid;
  }
  // Nobody looks behind the key that was found.
  EXPECT_NO_THROW(verify(signedToken(), keySet(goodKey() + ",{\"kid\":[]}")));
}

TEST_F(AzureKey, NeedsAModulusThenAnExponentThatAreText) {
  for (const char* bad : {"", "null", "5", "true", "[\"AQAB\"]", "{\"a\":\"AQAB\"}"}) {
    const std::string none;
    const std::string n = *bad == '\0' ? none : std::string(",\"n\":") + bad;
    const std::string e = *bad == '\0' ? none : std::string(",\"e\":") + bad;
    const std::string kid = "{\"kid\":\"the key\"";
    SCOPED_TRACE(bad);
    for (const std::string& keys : {kid + n + "}", kid + n + e + "}", kid + n + ",\"e\":\"AQAB\"}"})
      EXPECT_TRUE(throws<std::invalid_argument>("RSA public 'n' cannot be found!",
                                                [&] { verify(signedToken(), keySet(keys)); }));
    EXPECT_TRUE(throws<std::invalid_argument>("RSA public 'e' cannot be found!", [&] {
      verify(signedToken(), keySet(kid + ",\"n\":\"AQAB\"" + e + "}"));
    }));
    EXPECT_TRUE(log.isEmpty());
  }
}

TEST_F(AzureKey, WithEmptyNumbersFailsSilently) {
  EXPECT_TRUE(throws<jwt_verify_failed>(kWrongSignature, [&] {
    verify(signedToken(), keySet(R"({"kid":"the key", "n":"", "e":"AQAB"})"));
  }));
  EXPECT_TRUE(log.isEmpty());
  EXPECT_TRUE(throws<jwt_verify_failed>(kWrongSignature, [&] {
    verify(signedToken(), keySet(R"({"kid":"the key", "n":"AQAB", "e":""})"));
  }));
  EXPECT_TRUE(log.isEmpty());
}

TEST_F(AzureKey, NeedNotSayWhatItIsFor) {
  const test::RsaKey& key = test::anyRsaKey();
  Json::Value odd;
  odd["kid"] = "the key";
  odd["n"] = key.n();
  odd["e"] = key.e();
  odd["kty"] = "EC";
  odd["use"] = "enc";
  odd["alg"] = "none";
  EXPECT_NO_THROW(verify(signedToken(), keySet(odd.toStyledString())));
}

class AzureKeySet : public AzureVerify {
 protected:
  // Everything that leaves no key set ends in the one message, here with these lines before it.
  void expectNoKey(const test::Answer& keys, const std::vector<test::Expected>& lines,
                   const std::string& discovery = "") {
    EXPECT_TRUE(
        throws<std::invalid_argument>(kNoKey, [&] { verify(signedToken(), keys, discovery); }));
    EXPECT_TRUE(log.is(lines));
  }
};

TEST_F(AzureKeySet, IsFetchedAnewForEachToken) {
  verify(signedToken());
  AzureSSOClient client;
  verifyWith(client, signedToken());
  verifyWith(client, signedToken());
  EXPECT_EQ(requested(), (std::vector<std::string>{"GET /discovery", "GET /keys", "GET /discovery",
                                                   "GET /keys", "GET /discovery", "GET /keys"}));
}

TEST_F(AzureKeySet, ThatIsNotJsonHoldsNoKey) {
  const std::string good = keySet(goodKey());
  for (const std::string& text : {std::string(), std::string("<html>"), std::string("{"),
                                  good.substr(0, good.size() - 1), good.substr(0, good.size() - 2),
                                  good.substr(0, good.size() - 3), "{\"keys\":[" + goodKey() + "],",
                                  "{\"keys\":[" + goodKey() + "],\"x\":" + std::string(2000, '[')})
    expectNoKey(test::ok(text), {keysLine("bad wellknown json format.")});
}

TEST_F(AzureKeySet, WithoutKeysHoldsNoKey) {
  const test::Expected line = {LOG_ERR, "azuresso.cpp", "no kyes information"};
  for (const char* text : {"{}", R"({"Keys":[]})", R"({"error":"x"})", "null", "502 Bad Gateway",
                           "true", "[]", "\"keys\"", R"(["keys"])", R"([{"keys":[]}])"})
    expectNoKey(test::ok(text), {line});
}

TEST_F(AzureKeySet, WhoseKeysAreNoArrayHoldsNoKey) {
  const std::vector<std::string> values = {
      "null", "5", "\"the key\"", "[]", "{}", goodKey(), "{\"the key\":" + goodKey() + "}"};
  for (const std::string& keys : values) expectNoKey(test::ok("{\"keys\":" + keys + "}"), {});
}

TEST_F(AzureKeySet, CountsWhateverTheStatusOfItsAnswer) {
  EXPECT_NO_THROW(verify(signedToken(), test::failed(500, keySet(goodKey()))));
  expectNoKey(test::failed(404, "<html>not found</html>"),
              {keysLine("bad wellknown json format.")});
}

TEST_F(AzureKeySet, ThatBreaksOffHoldsNoKey) {
  test::Answer answer = test::ok(keySet(goodKey()));
  answer.contentLength = static_cast<long long>(answer.body.size()) + 1;
  expectNoKey(answer, {keysLine(curl_easy_strerror(CURLE_PARTIAL_FILE))});
}

TEST_F(AzureKeySet, ThatCannotBeReachedHoldsNoKey) {
  const std::string nowhere =
      "{\"jwks_uri\":\"http://localhost:" + std::to_string(test::unusedPort()) + "/keys\"}";
  expectNoKey(test::ok(""), {keysLine(curl_easy_strerror(CURLE_COULDNT_CONNECT))}, nowhere);
  EXPECT_EQ(requested(), std::vector<std::string>{"GET /discovery"});
}

TEST_F(AzureKeySet, WithoutAnAddressHoldsNoKey) {
  for (const char* discovery :
       {"{}", R"({"jwks_uri":null})", R"({"jwks_uri":""})", R"({"JWKS_URI":"KEYS"})", "null",
        "502 Bad Gateway", "[]", R"(["jwks_uri"])", "\"jwks_uri\""})
    expectNoKey(test::ok(keySet(goodKey())), {keysLine(kNoAddress)}, discovery);
}

TEST_F(AzureKeySet, WithAnAddressThatIsNoTextLetsTheErrorOfTheJsonLibraryPass) {
  for (const char* address : {"[]", "{}", "[\"KEYS\"]"}) {
    EXPECT_TRUE(throws<Json::LogicError>([&] {
      verify(signedToken(), test::ok(keySet(goodKey())),
             std::string("{\"jwks_uri\":") + address + "}");
    }));
    EXPECT_TRUE(log.isEmpty());
  }
}

const test::Expected kDiscoveryLine = {LOG_ERR, "sso.cpp", "bad wellknown json format."};

TEST_F(AzureKeySet, IsNotFoundThroughABadDiscoveryDocument) {
  for (const char* discovery : {"<html>", "{", "{\"jwks_uri\":\"KEYS"})
    expectNoKey(test::ok(keySet(goodKey())), {kDiscoveryLine, keysLine(kNoAddress)}, discovery);
}

// What was read of a document before its fault is kept.
TEST_F(AzureKeySet, IsFoundThroughADiscoveryDocumentThatBreaksOffBehindIt) {
  EXPECT_NO_THROW(
      verify(signedToken(), test::ok(keySet(goodKey())), "{\"jwks_uri\":\"KEYS\", \"issuer\":"));
  EXPECT_TRUE(log.is({kDiscoveryLine}));
}

TEST_F(AzureKeySet, IsNotFoundWithoutADiscoveryDocument) {
  const std::string nowhere = "http://localhost:" + std::to_string(test::unusedPort()) + "/";
  configure(nowhere);
  AzureSSOClient client;
  EXPECT_TRUE(throws<std::invalid_argument>(kNoKey, [&] { verifyWith(client, signedToken()); }));
  EXPECT_TRUE(log.is(
      {{LOG_ERR, "sso.cpp", curl_easy_strerror(CURLE_COULDNT_CONNECT)}, keysLine(kNoAddress)}));
}

// The discovery document comes through the operation that a program may override.
class OwnDiscovery : public AzureSSOClient {
 public:
  explicit OwnDiscovery(std::string keys) : address(std::move(keys)) {}
  void RequestWellknownInfo(Json::Value& out) override {
    EXPECT_EQ(out, Json::Value());
    out["jwks_uri"] = address;
  }

 private:
  std::string address;
};

TEST_F(AzureKeySet, IsFoundThroughAnOverriddenDiscovery) {
  verify(signedToken());
  OwnDiscovery client(provider->url("/keys"));
  EXPECT_NO_THROW(verifyWith(client, signedToken()));
  EXPECT_EQ(requested(), (std::vector<std::string>{"GET /discovery", "GET /keys", "GET /keys"}));
}

}  // namespace
