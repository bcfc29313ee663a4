// The two clients' checks of an ID token without any server: what the Azure client fetches lies
// in files. Headers and bodies are texts, so that they can be as odd as an attacker likes.
#pragma once

#include <gtest/gtest.h>
#include <json/value.h>

#include <cstdio>
#include <string>

#include "support/both_clients.h"
#include "support/device.h"
#include "support/log.h"
#include "support/throws.h"
#include "support/tokens.h"

namespace test {

const char kCheckSecret[] = "s3cret of the device";
const char kCheckBody[] =
    R"({"exp":4102444800,"tid":"the tenant","aud":"the device","sub":"Alice",)"
    R"("unique_name":"Alice@corp.example.com"})";

// A text as a JSON string, byte for byte: jsoncpp's writer would replace what is no UTF-8.
inline std::string jsonText(const std::string& bytes) {
  std::string text = "\"";
  text.reserve(bytes.size() + 2);
  for (const char c : bytes) {
    if (static_cast<unsigned char>(c) >= 0x20 && c != '"' && c != '\\') {
      text += c;
      continue;
    }
    char escape[8];
    std::snprintf(escape, sizeof escape, "\\u%04x", static_cast<unsigned char>(c));
    text += escape;
  }
  return text + "\"";
}

// What differs between the clients.
template <typename Provider>
struct Signing;

template <>
struct Signing<Azure> {
  static const char* family() { return "RS"; }
  static const char* foreign() { return "HS"; }
  static const char* failed() { return "verify rsa signature failed"; }
  static std::string sign(const std::string& header, const std::string& body,
                          const std::string& digest) {
    return rsaToken(anyRsaKey(), header, body, "RS" + digest);
  }
};

template <>
struct Signing<WebSphere> {
  static const char* family() { return "HS"; }
  static const char* foreign() { return "RS"; }
  static const char* failed() { return "verify hmac signature failed"; }
  static std::string sign(const std::string& header, const std::string& body,
                          const std::string& digest) {
    return hmacToken(kCheckSecret, header, body, "HS" + digest);
  }
};

template <typename Provider>
class TokenCheck : public testing::Test {
 protected:
  using Client = typename Provider::Client;
  using Sign = Signing<Provider>;

  void SetUp() override {
    settings["client_id"] = "the device";
    settings["tenant_id"] = "the tenant";
    settings["client_secret"] = kCheckSecret;
    settings["wellknown"] = address("discovery");
    configure<Provider>(settings);
    writeConfig("discovery", "{\"issuer\":\"x\",\"jwks_uri\":\"" + address("keys") + "\"}");
    if (Provider::name() == "azure") publish(anyRsaKey().jwk("the key"));
  }

  static std::string address(const std::string& file) { return "file://" + configPath(file); }
  static void publish(const std::string& keys) { writeConfig("keys", "{\"keys\":[" + keys + "]}"); }

  static std::string header(const std::string& alg) {
    return R"({"alg":")" + alg + R"(","kid":"the key"})";
  }
  static std::string goodHeader() { return header(std::string(Sign::family()) + "256"); }
  static std::string token(const std::string& header, const std::string& body = kCheckBody,
                           const std::string& digest = "256") {
    return Sign::sign(header, body, digest);
  }

  static void take(Client& client, const std::string& token) {
    client.ProcessTokenResponse("{\"id_token\":" + jsonText(token) + "}");
    EXPECT_EQ(client.GetToken(), token);
  }
  static void verify(const std::string& token) {
    Client client;
    take(client, token);
    client.VerifyIDToken();
  }

  // Use as EXPECT_TRUE(accepts(token)).
  static testing::AssertionResult accepts(const std::string& token) {
    try {
      verify(token);
    } catch (const std::exception& e) {
      return testing::AssertionFailure() << "threw " << typeid(e).name() << ": " << e.what();
    }
    return testing::AssertionSuccess();
  }
  // what() ends at a zero byte.
  template <typename Error>
  static testing::AssertionResult refuses(const std::string& message, const std::string& token) {
    return throws<Error>(message.c_str(), [&] { verify(token); });
  }
  static testing::AssertionResult doubts(const std::string& token) {
    return refuses<QOVA::JWT::jwt_verify_failed>(Sign::failed(), token);
  }
  static testing::AssertionResult misses(const std::string& token) {
    return refuses<std::invalid_argument>("kid does not exist in Azure verified kyes", token);
  }

  Json::Value settings;
  Log log;
};

}  // namespace test
