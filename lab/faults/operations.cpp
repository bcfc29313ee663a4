// Every exported operation of the library, on the paths that it can take.
#include <curl/curl.h>
#include <json/json.h>
#include <openssl/evp.h>
#include <syslog.h>

#include <algorithm>
#include <memory>

#include "faults/operation.h"
#include "sso/azuresso.h"
#include "sso/jwt.h"
#include "sso/profile.h"
#include "sso/sso.h"
#include "sso/utils.h"
#include "sso/webspheresso.h"
#include "support/device.h"
#include "support/tokens.h"

namespace faults {
namespace {

using namespace QOVA::SSO;
using QOVA::JWT::Jwt;
using Failures = std::map<std::string, Outcomes>;
using Server = Operation::Server;

const std::string kBadAlloc = "std::bad_alloc: std::bad_alloc";
const std::string kNoText = "std::logic_error: basic_string: construction from null is not valid";
const std::string kBadHeader = "std::invalid_argument: bad jwt header format!";
const std::string kBadBody = "std::invalid_argument: bad jwt body format!";
const std::string kBadResponse = "std::invalid_argument: parse json falied";
const std::string kNoKey = "std::invalid_argument: kid does not exist in Azure verified kyes";
const std::string kNotForUs = "std::invalid_argument: client ID invalid";
const std::string kNoClaims = "std::invalid_argument: please request a id_token first.";
const std::string kNoRSA = "QOVA::JWT::jwt_verify_failed: verify rsa signature failed";
const std::string kNoHMAC = "QOVA::JWT::jwt_verify_failed: verify hmac signature failed";
const std::string kNoBase64 = "QOVA::SSO::sso_op_failed: encode base64 failed.";
const std::string kTransfer = "QOVA::SSO::sso_err_resp: ";
const std::string kRefused = kTransfer + "Couldn't connect to server";
const std::string kNoName = "QOVA::SSO::sso_op_failed: QOVAWinsUserNameFqdn2Netbios failed.";
// jsoncpp takes the memory of its texts from malloc, and throws this when there is none.
const std::string kJsonMemory = "Json::RuntimeError: in Json::Value::duplicate*";

Failures operator+(Failures all, const Failures& more) {
  for (const auto& [name, outcomes] : more) {
    all[name].insert(all[name].end(), outcomes.begin(), outcomes.end());
  }
  return all;
}

// What a failure anywhere in a transfer leads to.
Failures transfer(const Outcomes& outcomes) {
  return {{"memory", outcomes},
          {"curl_easy_init", outcomes},
          {"curl_easy_setopt URL", outcomes},
          {"curl_easy_perform", outcomes}};
}

// What a failure while a segment is decoded leads to.
Failures decoding(const std::string& bad) {
  return {{"memory", {kNoText, bad}},
          {"BIO_new", {kNoText}},
          {"BIO_new_mem_buf", {kNoText}},
          {"BIO_ctrl", {kNoText}},
          {"BIO_read", {bad}}};
}

Failures signature(const std::string& bad, const std::vector<const char*>& functions) {
  Failures failures;
  for (const char* const name : functions) failures[name] = {bad};
  failures["memory"] = {bad};
  return failures;
}

Failures rsa() {
  return signature(kNoRSA, {"BIO_new", "BIO_new_mem_buf", "BIO_ctrl", "BIO_read", "BN_bin2bn",
                            "RSA_new", "RSA_set0_key", "EVP_PKEY_new", "EVP_PKEY_assign",
                            "EVP_PKEY_get_id", "EVP_MD_CTX_new", "EVP_DigestVerifyInit",
                            "EVP_DigestUpdate", "EVP_DigestVerifyFinal"});
}

Failures hmac() {
  return signature(kNoHMAC,
                   {"BIO_new", "BIO_new_mem_buf", "BIO_ctrl", "BIO_read", "BIO_write", "HMAC"});
}

// What follows from settings that could not be read, or could be read in spite of it.
Failures settings(const Outcomes& outcomes) {
  return {{"memory", outcomes},
          {"open", outcomes},
          {"read", outcomes},
          {"setresuid", outcomes},
          {"setresgid", outcomes}};
}

// --- the device

std::string profileFile(const std::string& name) {
  return R"({"sso_enable":true,"sso_profile":")" + name + "\"}";
}

void writeAzure(const std::string& discovery = "/discovery",
                const std::string& token = "/azure-token") {
  Json::Value file;
  file["azure_sso_enable"] = true;
  file["azure_wellknown"] = providerUrl(discovery);
  file["azure_client_id"] = "the device's own identifier";
  file["azure_client_secret"] = "the secret of the device";
  file["azure_tenant_id"] = "the tenant's own identifier";
  file["azure_authorization_endpoint"] = "https://login.example.com/authorize";
  file["azure_token_endpoint"] = providerUrl(token);
  file["azure_redirect_uri"] = "https://nas.example.com/login";
  file["azure_logout_endpoint"] = "https://login.example.com/logout";
  test::writeConfig("azure.conf", file.toStyledString());
}

void writeWebSphere(const std::string& token = "/websphere-token") {
  Json::Value file;
  file["websphere_wellknown"] = providerUrl("/discovery");
  file["websphere_client_id"] = "the device's own identifier";
  file["websphere_client_secret"] = "the secret of the device";
  file["websphere_authorization_endpoint"] = "https://login.example.com/authorize";
  file["websphere_token_endpoint"] = providerUrl(token);
  file["websphere_redirect_uri"] = "https://nas.example.com/login";
  file["websphere_logout_endpoint"] = "https://login.example.com/logout";
  test::writeConfig("websphere.conf", file.toStyledString());
}

void configure(const std::string& profile) {
  test::writeConfig("profile.conf", profile, 0644);
  writeAzure();
  writeWebSphere();
}

void configureAzure() {
  configure(profileFile("azure"));
}
void configureWebSphere() {
  configure(profileFile("websphere"));
}
void configureDisabled() {
  configure(R"({"sso_enable":false,"sso_profile":"azure"})");
}
void configureStranger() {
  configure(profileFile("another"));
}
// Discovery documents that are none, or name a key set whose key has no numbers, or but one.
void configureTextForDiscovery() {
  writeAzure("/text");
}
void configureBareKeys() {
  writeAzure("/bare-discovery");
}
void configureHalfKeys() {
  writeAzure("/half-discovery");
}
// A provider that hands out forged tokens.
void configureForgedAzure() {
  configureAzure();
  writeAzure("/discovery", "/forged-azure-token");
}
void configureForgedWebSphere() {
  configureWebSphere();
  writeWebSphere("/forged-websphere-token");
}
void configureNoProfile() {
  configure(R"({"sso_enable":true})");
}
void configureNothing() {
  for (const char* const name : {"profile.conf", "azure.conf", "websphere.conf"}) {
    test::removeConfig(name);
  }
}
void configureBroken() {
  for (const char* const name : {"profile.conf", "azure.conf", "websphere.conf"}) {
    test::writeConfig(name, R"({"azure_client_id": "x", )");
  }
}

// --- what operations give, as text

std::string textOf(SSOClient& client) {
  return client.GetClientID() + "|" + client.GetClientSecret() + "|" + client.GetRedirectURI() +
         "|" + client.GetToken() + "|" + client.GetAuthEndpoint() + "|" +
         client.GetTokenEndpoint() + "|" + client.GetWellknownEndpoint() + "|" +
         client.GetLogoutEndpoint();
}

std::string kindOf(SSOClient& client) {
  if (textOf(client) == "|||||||") return "nothing";
  const bool all = client.GetClientID() == "the device's own identifier" &&
                   client.GetClientSecret() == "the secret of the device" &&
                   client.GetRedirectURI() == "https://nas.example.com/login" &&
                   client.GetToken().empty() &&
                   client.GetAuthEndpoint() == "https://login.example.com/authorize" &&
                   client.GetLogoutEndpoint() == "https://login.example.com/logout";
  return all ? "all settings" : "some settings";
}

std::string percentDecoded(const std::string& text) {
  std::string bytes;
  for (std::size_t i = 0; i < text.size(); ++i) {
    const bool escape = text[i] == '%' && i + 2 < text.size();
    bytes += escape ? static_cast<char>(std::stoi(text.substr(i + 1, 2), nullptr, 16)) : text[i];
    i += escape ? 2 : 0;
  }
  return bytes;
}

// The values of "name=value&name=value", decoded; the encoder may have failed, which shows
// nowhere else.
std::map<std::string, std::string> parametersOf(const std::string& text) {
  std::map<std::string, std::string> values;
  for (std::size_t at = 0; at < text.size();) {
    const std::size_t end = std::min(text.find('&', at), text.size());
    const std::size_t sign = std::min(text.find('=', at), end);
    values[text.substr(at, sign - at)] = percentDecoded(text.substr(sign + 1, end - sign - 1));
    at = end + 1;
  }
  return values;
}

extern "C" int ReferenceBase64Decode(const char* text, std::size_t length, char* bytes,
                                     std::size_t* size);

std::string kindOfRequest(const std::string& url) {
  const std::string endpoint = "https://login.example.com/authorize?";
  if (url.compare(0, endpoint.size(), endpoint) != 0) return "another endpoint: " + url;
  auto values = parametersOf(url.substr(endpoint.size()));
  if (values.size() != 6 || values["response_type"] != "code" || values["nonce"].size() != 36 ||
      values["client_id"] != "the device's own identifier" || values["scope"].empty() ||
      values["redirect_uri"] != "https://nas.example.com/login") {
    return "other parameters: " + url;
  }
  char state[1024];
  std::size_t size = sizeof state;
  Json::Value json;
  if (ReferenceBase64Decode(values["state"].data(), values["state"].size(), state, &size) == 0 ||
      !Json::Reader().parse(state, state + size, json) || json["origin"] != "/page") {
    return "another state: " + url;
  }
  const std::string digest = json["nonce"].asString();
  if (digest.empty()) return "without digest";
  return digest == test::md5(values["nonce"]) ? "whole" : "another digest";
}

void gaveRequest(Run& run, const std::string& url) {
  const std::string kind = kindOfRequest(url);
  run.gave(kind);
  run.logged(kind != "without digest"
                 ? std::vector<Line>()
                 : std::vector<Line>{{LOG_ERR, "utils.cpp", "MD5 digest failed %m"},
                                     {LOG_ERR, "utils.cpp", "calloc failed. %m"}});
}

std::string kindOfTokenRequest(const std::string& body) {
  const std::map<std::string, std::string> expected = {
      {"client_id", "the device's own identifier"},
      {"client_secret", "the secret of the device"},
      {"code", "the code that came back"},
      {"grant_type", "authorization_code"},
      {"redirect_uri", "https://nas.example.com/login"}};
  return parametersOf(body) == expected ? "whole" : "another: " + body;
}

Json::Value parameters() {
  Json::Value value;
  value["origin"] = "/page";
  return value;
}

// --- the paths

struct Azure {
  using Client = AzureSSOClient;
  static std::string name() { return "AzureSSOClient"; }
  static std::string token() { return fixtures()["azure token"]; }
  static std::string user() { return "EXAMPLE.COM\\the-account-of-alice"; }
};

struct WebSphere {
  using Client = WebSphereSSOClient;
  static std::string name() { return "WebSphereSSOClient"; }
  static std::string token() { return fixtures()["websphere token"]; }
  static std::string user() { return "the-account-of-alice"; }
};

std::string responseWith(const std::string& token) {
  return "{\"id_token\":\"" + token + "\"}";
}

template <typename Provider>
void addConstruction(std::vector<Operation>* all) {
  using Client = typename Provider::Client;
  const std::string name = Provider::name() + "::" + Provider::name();
  const auto body = [](Run& run) {
    std::unique_ptr<Client> client;
    run.armed([&] { client = std::make_unique<Client>(); });
    if (run.returned()) run.gave(kindOf(*client));
  };
  const auto reading = settings({"ok: all settings", "ok: nothing"});
  all->push_back({name, "ok: all settings", reading, body, configureAzure});
  all->push_back({name + ", no file", "ok: nothing", {}, body, configureNothing});
  all->push_back({name + ", a broken file", "ok: nothing", {}, body, configureBroken});
}

// Parameters whose state is longer than the device encodes.
Json::Value tooMuch() {
  Json::Value value = parameters();
  value["more"] = std::string(1000, 'x');
  return value;
}

template <typename Provider>
void addRequests(std::vector<Operation>* all) {
  using Client = typename Provider::Client;
  const Failures digest = {{"memory", {"ok: without digest", kJsonMemory}},
                           {"MD5", {"ok: without digest"}},
                           {"QOVABase64Encode", {kNoBase64}}};
  all->push_back({Provider::name() + "::GetAccessTokenReqURI", "ok: whole", digest,
                  [](Run& run) {
                    Client client;
                    const Json::Value own = parameters();
                    std::string url;
                    run.armed([&] { url = client.GetAccessTokenReqURI(own); });
                    if (run.returned()) gaveRequest(run, url);
                    run.expect(own == parameters(), "the parameters are unchanged");
                  },
                  configureAzure, Server::kNone, true});
  all->push_back({Provider::name() + "::GetAccessTokenReqURI, too long a state",
                  kNoBase64,
                  {{"memory", {kJsonMemory}}},
                  [](Run& run) {
                    Client client;
                    const Json::Value own = tooMuch();
                    run.armed([&] { client.GetAccessTokenReqURI(own); });
                  },
                  configureAzure});
  all->push_back({Provider::name() + "::RedirectAuthEndpoint", "ok: whole", digest,
                  [](Run& run) {
                    Client client;
                    const Json::Value own = parameters();
                    const std::string text = test::stdoutOf(
                        [&] { run.armed([&] { client.RedirectAuthEndpoint(own); }); });
                    run.expect(run.returned() || text.empty(), "nothing is written by a failure");
                    if (!run.returned()) return;
                    const std::string start = "Location: ";
                    const bool framed = text.compare(0, start.size(), start) == 0 &&
                                        text.size() > 2 && text.substr(text.size() - 2) == "\n\n";
                    if (framed) {
                      gaveRequest(run, text.substr(start.size(), text.size() - 2 - start.size()));
                    } else {
                      run.gave("another text: " + text);
                    }
                  },
                  configureAzure});
  all->push_back({Provider::name() + "::RedirectAuthEndpoint, too long a state",
                  kNoBase64,
                  {{"memory", {kJsonMemory}}},
                  [](Run& run) {
                    Client client;
                    const Json::Value own = tooMuch();
                    const std::string text = test::stdoutOf(
                        [&] { run.armed([&] { client.RedirectAuthEndpoint(own); }); });
                    run.expect(text.empty(), "nothing is written");
                  },
                  configureAzure});
  all->push_back({Provider::name() + "::GetIDTokenReqParams",
                  "ok: whole",
                  {},
                  [](Run& run) {
                    Client client;
                    client.SetCode("the code that came back");
                    std::string body;
                    run.armed([&] { body = client.GetIDTokenReqParams(); });
                    if (run.returned()) run.gave(kindOfTokenRequest(body));
                  },
                  configureAzure});
}

template <typename Provider>
void addResponse(std::vector<Operation>* all, const std::string& variant,
                 const std::string& response, const std::string& good, const std::string& token) {
  using Client = typename Provider::Client;
  all->push_back({Provider::name() + "::ProcessTokenResponse" + variant,
                  good,
                  {{"memory", {kBadResponse}}},
                  [response, token](Run& run) {
                    Client client;
                    client.ProcessTokenResponse(responseWith("a.token.before"));
                    std::string own = response;
                    run.armed([&] { client.ProcessTokenResponse(std::move(own)); });
                    if (run.returned()) run.gave(client.GetToken() == token ? "stored" : "not");
                    run.expect(run.returned() || client.GetToken().empty(),
                               "a failure leaves no token");
                  },
                  configureAzure});
}

// An operation on a client that holds `token`; what fails leaves the client as it is.
template <typename Provider, typename Body>
Operation onToken(const std::string& operation, const std::string& token, const std::string& good,
                  const Failures& failures, const Body& body) {
  using Client = typename Provider::Client;
  return {Provider::name() + "::" + operation, good, failures,
          [token, body](Run& run) {
            Client client;
            if (!token.empty()) client.ProcessTokenResponse(responseWith(token));
            const std::string before = textOf(client);
            body(run, client);
            run.expect(textOf(client) == before, "the client is unchanged");
          },
          configureAzure};
}

template <typename Provider>
Operation userName(const std::string& variant, const std::string& token, const std::string& good,
                   const Failures& failures) {
  return onToken<Provider>(
      "GetUserName" + variant, token, good, failures, [](Run& run, auto& client) {
        std::string user = "before";
        run.armed([&] { client.GetUserName(user); });
        if (run.returned()) run.gave(user);
        run.expect(run.returned() || user == "before" || user == Provider::user(),
                   "a failure leaves the user as it was, or as the platform was asked");
      });
}

template <typename Provider>
Operation userInfo(const std::string& variant, const std::string& token, const std::string& good) {
  return onToken<Provider>(
      "GetUserInfo" + variant, token, good, decoding(kBadBody), [](Run& run, auto& client) {
        Json::Value info = "before";
        run.armed([&] { client.GetUserInfo(info); });
        if (run.returned()) run.gave(info["aud"].asString());
        run.expect(run.returned() || info == "before", "a failure leaves the value as it was");
      });
}

template <typename Provider>
Operation verification(const std::string& variant, const std::string& token,
                       const std::string& good, const Failures& failures, bool cold = false) {
  Operation operation =
      onToken<Provider>("VerifyIDToken" + variant, token, good, failures,
                        [](Run& run, auto& client) { run.armed([&] { client.VerifyIDToken(); }); });
  operation.cold = cold;
  return operation;
}

template <typename Provider>
void addTokens(std::vector<Operation>* all) {
  const std::string missing = "QOVA::SSO::sso_err_resp: we cannot find key 'id_token' in response!";
  addResponse<Provider>(all, "", responseWith("a.new.token.of.some.length"), "ok: stored",
                        "a.new.token.of.some.length");
  addResponse<Provider>(all, ", not JSON", "{\"id_token\":", kBadResponse, "");
  addResponse<Provider>(all, ", no token", R"({"access_token":"x"})", missing, "");

  Failures naming = decoding(kBadBody);
  if (Provider::name() == "AzureSSOClient") naming["QOVAWinsUserNameFqdn2Netbios"] = {kNoName};
  all->push_back(userName<Provider>("", Provider::token(), "ok: " + Provider::user(), naming));
  all->push_back(userName<Provider>(", no name", fixtures()["empty token"],
                                    "std::invalid_argument: cannot find the user name!",
                                    decoding(kBadBody)));
  all->push_back(userName<Provider>(", no token", "", kNoClaims, {}));
  all->push_back(userInfo<Provider>("", Provider::token(), "ok: the device's own identifier"));
  all->push_back(userInfo<Provider>(", no token", "", kNoClaims));
  all->push_back(
      userInfo<Provider>(", not a token", "one.two", "std::invalid_argument: bad jwt format!"));

  const Failures segments = decoding(kBadHeader) + decoding(kBadBody);
  all->push_back(
      verification<Provider>(", no token", "", "std::invalid_argument: token cannot be empty", {}));
  all->push_back(verification<Provider>(", expired", fixtures()["empty token"],
                                        "std::invalid_argument: id_token expired.", segments));
  all->push_back(verification<Provider>(", no header", ".e30.x", kNoText, {}));
}

void addAzure(std::vector<Operation>* all) {
  addResponse<Azure>(all, ", an error", R"({"error":"x"})",
                     "QOVA::SSO::sso_err_resp: {\"error\":\"x\"}\n", "");
  all->push_back(
      userName<Azure>(", an email address", fixtures()["email token"], "ok: " + Azure::user(),
                      decoding(kBadBody) + Failures{{"QOVAWinsUserNameFqdn2Netbios", {kNoName}}}));
  all->push_back(userName<Azure>(", two at signs", fixtures()["two signs token"],
                                 "std::invalid_argument: cannot get the user name!",
                                 decoding(kBadBody)));

  const Failures segments = decoding(kBadHeader) + decoding(kBadBody);
  const Failures keys = segments + transfer({kNoKey});
  const auto add = [&](const std::string& variant, const std::string& token,
                       const std::string& good, const Failures& failures, Server server,
                       const std::function<void()>& file = configureAzure) {
    Operation operation = verification<Azure>(variant, token, good, failures,
                                              server != Server::kNone && variant.empty());
    operation.server = server;
    operation.configure = file;
    all->push_back(operation);
  };
  add(", no discovery document", Azure::token(), kNoKey, segments, Server::kPlain,
      configureTextForDiscovery);
  add(", a key without numbers", Azure::token(),
      "std::invalid_argument: RSA public 'n' cannot be found!", keys, Server::kPlain,
      configureBareKeys);
  add(", a key without exponent", Azure::token(),
      "std::invalid_argument: RSA public 'e' cannot be found!", keys, Server::kPlain,
      configureHalfKeys);
  add(", another client's token", fixtures()["another audience token"], kNotForUs, segments,
      Server::kNone);
  add("", Azure::token(), "ok", keys + rsa(), Server::kPlain);
  add(", a forged token", fixtures()["forged token"], kNoRSA, keys + rsa(), Server::kPlain);
  add(", an unknown key", fixtures()["stranger's token"], kNoKey, segments, Server::kPlain);
  add(", HS256", fixtures()["azure HS256 token"],
      "QOVA::JWT::jwt_not_support: HS256 algorithm is not supported", keys, Server::kPlain);
  add(", no provider", Azure::token(), kNoKey, segments, Server::kNone);
  add(", another tenant", fixtures()["another tenant token"],
      "std::invalid_argument: tenant ID invalid", segments, Server::kNone);

  const auto keySet = [&](const std::string& variant, const std::string& path,
                          const std::string& good, const Failures& failures, Server server) {
    all->push_back({"AzureSSOClient::RequestKeysInfo" + variant, good, failures,
                    [path](Run& run) {
                      AzureSSOClient client;
                      Json::Value set = "before";
                      std::string url = providerUrl(path);
                      run.armed([&] { client.RequestKeysInfo(std::move(url), set); });
                      if (run.returned()) {
                        const bool whole = set.isObject() && set["keys"].isArray() &&
                                           set["keys"].size() == 1 &&
                                           set["keys"][0]["kid"] == "the key of this year";
                        run.gave(set.isNull() ? "null" : whole ? "the keys" : "no keys");
                        if (whole) {
                          run.logged({});
                        } else if (set.isNull()) {
                          run.logged({{LOG_ERR, "azuresso.cpp", "curl_easy_init failed. %m"},
                                      {LOG_ERR, "azuresso.cpp",
                                       "request wellknown uri bad wellknown json format.."},
                                      {LOG_ERR, "azuresso.cpp", "request wellknown uri %t."}});
                        } else {
                          run.logged({{LOG_ERR, "azuresso.cpp", "no kyes information"},
                                      {LOG_ERR, "azuresso.cpp", "curl_easy_init failed. %m"}});
                        }
                      }
                    },
                    configureAzure, server});
  };
  keySet("", "/keys", "ok: the keys", transfer({"ok: null"}), Server::kPlain);
  keySet(", no keys", "/discovery", "ok: no keys", transfer({"ok: null"}), Server::kPlain);
  keySet(", not JSON", "/text", "ok: null", {}, Server::kPlain);
  keySet(", no provider", "/keys", "ok: null", {}, Server::kNone);
}

void addWebSphere(std::vector<Operation>* all) {
  const Failures segments = decoding(kBadHeader) + decoding(kBadBody);
  const Failures encoding = {{"QOVABase64Encode", {kNoBase64}}};
  all->push_back(
      verification<WebSphere>("", WebSphere::token(), "ok", segments + encoding + hmac(), true));
  all->push_back(verification<WebSphere>(", a forged token", fixtures()["forged HS256 token"],
                                         kNoHMAC, segments + encoding + hmac()));
  all->push_back(verification<WebSphere>(
      ", another client's token", fixtures()["another audience HS256 token"], kNotForUs, segments));
  all->push_back(verification<WebSphere>(
      ", RS256", Azure::token(), "QOVA::JWT::jwt_not_support: RS256 algorithm is not supported",
      segments));
}

void addJwt(std::vector<Operation>* all) {
  const auto construct = [](const std::string& token) {
    return [token](Run& run) {
      std::string own = token;
      run.armed([&] { Jwt jwt(std::move(own)); });
    };
  };
  const std::string token = Azure::token();
  all->push_back({"Jwt::Jwt", "ok", {}, construct(token)});
  all->push_back({"Jwt::Jwt, two segments",
                  "std::invalid_argument: bad jwt format!",
                  {},
                  construct(token.substr(0, token.rfind('.')))});

  // All that a token is made of, as far as it can be seen; to be asked after the failure alone,
  // which would find OpenSSL used already.
  const auto contentOf = [](Jwt& jwt) {
    const auto textOf = [](const auto& get) {
      try {
        return get().toStyledString();
      } catch (const std::exception& e) {
        return std::string(e.what());
      }
    };
    return textOf([&] { return jwt.GetHeader(); }) + "." + textOf([&] { return jwt.GetBody(); }) +
           "." + jwt.GetSignature();
  };
  const auto expectUnchanged = [contentOf](Run& run, Jwt& jwt, const std::string& text) {
    Jwt untouched(text);
    run.expect(contentOf(jwt) == contentOf(untouched), "the token is unchanged");
  };
  const auto segment = [expectUnchanged](const std::string& text, Json::Value (Jwt::*get)()) {
    return [text, get, expectUnchanged](Run& run) {
      Jwt jwt(text);
      Json::Value value = "before";
      run.armed([&] { value = (jwt.*get)(); });
      if (run.returned()) run.gave(value.isObject() ? "an object" : "something else");
      run.expect(run.returned() || value == "before", "a failure gives no value");
      expectUnchanged(run, jwt, text);
    };
  };
  all->push_back(
      {"Jwt::GetHeader", "ok: an object", decoding(kBadHeader), segment(token, &Jwt::GetHeader)});
  all->push_back(
      {"Jwt::GetBody", "ok: an object", decoding(kBadBody), segment(token, &Jwt::GetBody)});
  all->push_back({"Jwt::GetHeader, not JSON", kBadHeader, decoding(kBadHeader),
                  segment("AAAA.BBBB.c", &Jwt::GetHeader)});
  all->push_back({"Jwt::GetBody, empty", kNoText, {}, segment("AAAA..c", &Jwt::GetBody)});
  all->push_back({"Jwt::GetSignature", "ok: whole", {}, [token](Run& run) {
                    Jwt jwt(token);
                    std::string text;
                    run.armed([&] { text = jwt.GetSignature(); });
                    if (run.returned())
                      run.gave("." + text == token.substr(token.rfind('.')) ? "whole" : "not");
                  }});

  // Two tokens are the same to the byte if one signature is right for both. Asked of an untouched
  // one too: OpenSSL that could not set itself up verifies nothing any more.
  const auto expectSigned = [](Run& run, Jwt& jwt, const std::string& text, const auto& verify) {
    Jwt untouched(text);
    const auto verifies = [&](Jwt& one) {
      try {
        verify(one);
        return true;
      } catch (const QOVA::JWT::jwt_verify_failed&) {
        return false;
      }
    };
    run.expect(verifies(jwt) == verifies(untouched), "the token verifies as before");
  };
  const auto verify = [=](const std::string& text, const std::string& number) {
    return [=](Run& run) {
      Jwt jwt(text);
      std::string n = number;
      std::string e = fixtures()["e"];
      run.armed([&] { jwt.JwtRSAVerify(n, e, EVP_sha256()); });
      run.expect(n == number && e == fixtures()["e"], "the numbers are unchanged");
      std::string right = fixtures()["n"];
      expectSigned(run, jwt, text, [&](Jwt& t) { t.JwtRSAVerify(right, e, EVP_sha256()); });
      expectUnchanged(run, jwt, text);
    };
  };
  all->push_back({"Jwt::JwtRSAVerify", "ok", rsa(), verify(token, fixtures()["n"]), nullptr,
                  Server::kNone, true});
  all->push_back({"Jwt::JwtRSAVerify, forged", kNoRSA, rsa(),
                  verify(fixtures()["forged token"], fixtures()["n"])});
  all->push_back({"Jwt::JwtRSAVerify, no modulus", kNoRSA, rsa(), verify(token, "")});

  const auto authenticate = [=](const std::string& text, const std::string& secret) {
    return [=](Run& run) {
      Jwt jwt(text);
      std::string key = secret;
      run.armed([&] { jwt.JwtHMACVerify(key, EVP_sha256()); });
      run.expect(key == secret, "the key is unchanged");
      std::string right = fixtures()["key"];
      expectSigned(run, jwt, text, [&](Jwt& t) { t.JwtHMACVerify(right, EVP_sha256()); });
      expectUnchanged(run, jwt, text);
    };
  };
  const std::string key = fixtures()["key"];
  all->push_back({"Jwt::JwtHMACVerify", "ok", hmac(), authenticate(WebSphere::token(), key),
                  nullptr, Server::kNone, true});
  all->push_back({"Jwt::JwtHMACVerify, forged", kNoHMAC, hmac(),
                  authenticate(fixtures()["forged HS256 token"], key)});
  all->push_back(
      {"Jwt::JwtHMACVerify, no key", kNoHMAC, hmac(), authenticate(WebSphere::token(), "")});
}

void addHelpers(std::vector<Operation>* all) {
  const std::string text = fixtures()["text"];
  const std::string encoded =
      "a%20text%20%26%20a%20name%2C%20longer%20than%20a%20string%20holds%20in%20itself";
  all->push_back({"URLEncode",
                  "ok: " + encoded,
                  {{"memory", {"ok: " + text}}, {"QOVACGIURLEncode", {"ok: " + text}}},
                  [text](Run& run) {
                    std::string result;
                    run.armed([&] { result = URLEncode(text); });
                    if (run.returned()) run.gave(result);
                  }});
  all->push_back({"MD5Digest",
                  "ok: " + fixtures()["digest"],
                  {{"memory", {"ok: "}}, {"MD5", {"ok: "}}},
                  [text](Run& run) {
                    std::string own = text;
                    std::string result;
                    run.armed([&] { result = MD5Digest(std::move(own)); });
                    if (!run.returned()) return;
                    run.gave(result);
                    if (!result.empty()) {
                      run.logged({});
                    } else if (std::string(seen().name) == "calloc") {  // the library's own alone
                      run.logged({{LOG_ERR, "utils.cpp", "calloc failed. Cannot allocate memory"}});
                    } else {
                      run.logged({{LOG_ERR, "utils.cpp", "MD5 digest failed %m"}});
                    }
                  }});
}

void addUrls(std::vector<Operation>* all) {
  const std::string page = "ssoclient/relay.html#";
  const auto relay = [](bool success, const std::string& state, const std::string& reason) {
    return [=](Run& run) {
      std::string url;
      run.armed([&] { url = GetSSORelayURL(success, state, reason); });
      if (run.returned()) run.gave(url);
    };
  };
  const std::string state = fixtures()["state"];  // {"origin":"/a page of some length"}
  const std::string raw = "ok: " + page + "origin=/a page of some length&success=true";
  const std::string bare = "ok: " + page + "success=true";
  all->push_back(
      {"GetSSORelayURL",
       "ok: " + page + "origin=%2Fa%20page%20of%20some%20length&success=true",
       {{"memory", {raw, bare}}, {"QOVABase64Decode", {bare}}, {"QOVACGIURLEncode", {raw}}},
       relay(true, state, "")});
  all->push_back({"GetSSORelayURL, a bad state", bare, {}, relay(true, "AAAA", "")});
  all->push_back({"GetSSORelayURL, a reason",
                  "ok: " + page + "reason=why it went wrong&success=false",
                  {},
                  relay(false, state, "why it went wrong")});

  const std::string query = "?post_logout_redirect_uri=";
  const std::string endpoint = "https://login.example.com/logout";
  const std::string site = "https://nas.example.com/webman/ssoclient/relay.html";
  const std::string site_encoded =
      "https%3A%2F%2Fnas.example.com%2Fwebman%2Fssoclient%2Frelay.html";
  const auto logout = [](const std::string& address) {
    return [address](Run& run) {
      std::string url;
      run.armed([&] { url = GetAzureSSOLogoutURL(address); });
      if (run.returned()) run.gave(url);
    };
  };
  Failures failures =
      settings({"ok: " + query + site_encoded, "ok: " + endpoint + query + site_encoded});
  failures =
      failures + Failures{{"memory", {"ok: " + endpoint + query + site, "ok: " + query + site}},
                          {"QOVACGIURLEncode", {"ok: " + endpoint + query + site}},
                          {"several", {"ok: " + query + site}}};
  all->push_back({"GetAzureSSOLogoutURL", "ok: " + endpoint + query + site_encoded, failures,
                  logout("https://nas.example.com/index.cgi"), configureAzure});
  all->push_back({"GetAzureSSOLogoutURL, no address", "ok: " + endpoint,
                  settings({"ok: ", "ok: " + endpoint}), logout(""), configureAzure});
  all->push_back({"GetAzureSSOLogoutURL, a short address",
                  "std::out_of_range: *",
                  {},
                  logout("short"),
                  configureAzure});
}

unsigned append(void* data, unsigned size, unsigned count, void* text) {
  try {
    static_cast<std::string*>(text)->append(static_cast<const char*>(data), size * count);
  } catch (const std::bad_alloc&) {
    return 0;
  }
  return size * count;
}

void addTransfers(std::vector<Operation>* all) {
  const auto text = [](CURLcode code) { return kTransfer + curl_easy_strerror(code); };
  const Outcomes no_memory = {text(CURLE_OUT_OF_MEMORY)};
  // Exhausted memory reaches libcurl in any of its parts.
  Outcomes parts;
  for (const CURLcode code : {CURLE_OUT_OF_MEMORY, CURLE_URL_MALFORMAT, CURLE_COULDNT_RESOLVE_HOST,
                              CURLE_COULDNT_CONNECT, CURLE_WRITE_ERROR, CURLE_SSL_CONNECT_ERROR,
                              CURLE_SEND_ERROR, CURLE_RECV_ERROR, CURLE_PEER_FAILED_VERIFICATION}) {
    parts.push_back(text(code));
  }
  const Failures failures = {{"memory", parts},
                             {"curl_global_init+", {kBadAlloc}},
                             {"curl_easy_init", {kBadAlloc}},
                             {"curl_easy_init+", {kBadAlloc}},
                             {"curl_easy_setopt URL", {text(CURLE_URL_MALFORMAT)}},
                             {"curl_easy_setopt URL+", no_memory},
                             {"curl_easy_setopt POSTFIELDS+", no_memory},
                             {"curl_easy_setopt SSL_VERIFYHOST+", no_memory},
                             {"curl_easy_setopt SSL_VERIFYPEER+", no_memory},
                             {"curl_easy_perform", no_memory},
                             {"curl_easy_perform+", no_memory}};
  const std::string got = "before plain text of some length";
  const std::string posted = "before plain text about what was posted";
  const auto add = [&](const std::string& variant, Server server, bool verify, bool post,
                       const Failures& more) {
    const bool refused = server == Server::kNone;
    const std::string whole = post ? posted : got;
    const auto body = [post, verify, whole, got](Run& run) {
      const std::string url = providerUrl("/text");
      const std::string form = "a=b";
      std::string response = "before ";
      run.armed([&] {
        post ? httpPost(url, form, response, verify, append)
             : httpGet(url, response, verify, append);
      });
      if (run.returned()) run.gave(response);
      run.expect(response.size() >= 7 && (whole.compare(0, response.size(), response) == 0 ||
                                          (run.returned() && response == got)),
                 "the response keeps what it held, and what arrived");
    };
    Operation operation = {(post ? "httpPost" : "httpGet") + variant,
                           refused ? kRefused : "ok: " + whole, failures + more, body};
    operation.server = server;
    operation.cold = !post && (server == Server::kTls || (!refused && variant.empty()));
    operation.quiet = true;
    all->push_back(operation);
  };
  // A form that libcurl was not given makes the request a GET.
  const Failures form = {{"curl_easy_setopt POSTFIELDS", {"ok: " + got}}};
  // A check that could not be switched off refuses the stranger.
  const Outcomes refused = {text(CURLE_PEER_FAILED_VERIFICATION)};
  const Failures checks = {{"curl_easy_setopt SSL_VERIFYHOST", refused},
                           {"curl_easy_setopt SSL_VERIFYPEER", refused}};
  add("", Server::kPlain, true, false, {});
  add("", Server::kPlain, true, true, form);
  add(", not verified", Server::kPlain, false, false, {});
  add(", not verified", Server::kPlain, false, true, form);
  add(", no provider", Server::kNone, true, false, {});
  add(", no provider", Server::kNone, true, true, {});
  add(", TLS", Server::kTls, true, false, {});
  add(", a stranger not verified", Server::kStranger, false, false, checks);
}

void addProviderRequests(std::vector<Operation>* all) {
  const auto discover = [&](const std::string& variant, const Failures& failures,
                            const std::string& good, Server server,
                            const std::function<void()>& file) {
    all->push_back(
        {"SSOClient::RequestWellknownInfo" + variant, good, failures,
         [](Run& run) {
           AzureSSOClient client;
           const std::string before = textOf(client);
           Json::Value document = "before";
           run.armed([&] { client.RequestWellknownInfo(document); });
           if (run.returned()) {
             const bool whole = document.isObject() && document.size() == 1 &&
                                document["jwks_uri"] == providerUrl("/keys");
             run.gave(whole ? "the document" : document == "before" ? "before" : "parts of it");
             run.logged(whole
                            ? std::vector<Line>()
                            : std::vector<Line>{{LOG_ERR, "sso.cpp", "bad_alloc. %m"},
                                                {LOG_ERR, "sso.cpp", "bad wellknown json format."},
                                                {LOG_ERR, "sso.cpp", "%t"}});
           }
           run.expect(textOf(client) == before, "the client is unchanged");
         },
         file, server});
  };
  discover("", transfer({"ok: before"}) + Failures{{"memory", {"ok: parts of it"}}},
           "ok: the document", Server::kPlain, configureAzure);
  discover(", no provider", {}, "ok: before", Server::kNone, configureAzure);
  discover(", not JSON", transfer({"ok: before"}), "ok: before", Server::kPlain,
           configureTextForDiscovery);

  const auto exchange = [&](const std::string& variant, const std::string& good, Server server) {
    all->push_back({"SSOClient::RequestTokenEndpoint" + variant, good,
                    transfer({"ok: before "}) +
                        Failures{{"curl_easy_setopt POSTFIELDS", {"ok: before not posted", good}}},
                    [](Run& run) {
                      WebSphereSSOClient client;
                      std::string response = "before ";
                      const std::string form = "a=b";
                      run.armed([&] { client.RequestTokenEndpoint(response, form); });
                      if (run.returned()) run.gave(response);
                      // An answer is an answer, whatever it says.
                      run.logged(
                          response != "before "
                              ? std::vector<Line>()
                              : std::vector<Line>{{LOG_ERR, "sso.cpp", "bad_alloc. %m"},
                                                  {LOG_ERR, "sso.cpp", "request token uri %t."}});
                    },
                    configureAzure, server});
  };
  exchange("", "ok: before " + responseWith(WebSphere::token()), Server::kPlain);
  exchange(", no provider", "ok: before ", Server::kNone);
}

// Whole logins, from what their parts may come to.
void addLogins(std::vector<Operation>* all) {
  const Failures segments = decoding(kBadHeader) + decoding(kBadBody);
  // Settings that could not be read lead nowhere; those that were lead to this user alone.
  const auto unread = [](const std::string& user) {
    return settings({kBadResponse, "ok: " + user});
  };
  const Failures form = {{"curl_easy_setopt POSTFIELDS", {kBadResponse}}};
  const Failures azure = segments + rsa() + transfer({kBadResponse, kNoKey}) + form +
                         unread(Azure::user()) +
                         Failures{{"QOVAWinsUserNameFqdn2Netbios", {kNoName}}};
  const Failures websphere = segments + hmac() + transfer({kBadResponse}) + form +
                             unread(WebSphere::user()) +
                             Failures{{"QOVABase64Encode", {kNoBase64}}};
  const std::string unreadable = "QOVA::SSO::sso_op_failed: read profile file failed.";
  const Failures profile = {
      {"memory", {unreadable}}, {"open", {unreadable}}, {"read", {unreadable}}};

  const auto login = [](Run& run) {
    std::string user = "before";
    const std::string code = "the code that came back";
    run.armed([&] { OIDCLogin(code, user); });
    if (run.returned()) run.gave(user);
    // The Azure client asks the platform about the name in the caller's string.
    const bool asked = run.outcome() == kNoName || run.outcome() == kBadAlloc;
    run.expect(run.returned() || user == "before" || (asked && user == Azure::user()),
               "a failure leaves the user as it was, or as the platform was asked");
  };
  const auto add = [&](const std::string& variant, const std::string& good,
                       const Failures& failures, const std::function<void()>& file, Server server) {
    all->push_back({"OIDCLogin" + variant, good, profile + failures, login, file, server,
                    server == Server::kPlain && good.compare(0, 2, "ok") == 0});
  };
  add(", Azure", "ok: " + Azure::user(), azure, configureAzure, Server::kPlain);
  add(", WebSphere", "ok: " + WebSphere::user(), websphere, configureWebSphere, Server::kPlain);
  add(", no provider", kBadResponse, settings({kBadResponse}), configureAzure, Server::kNone);
  add(", no file", unreadable, {}, configureNothing, Server::kNone);
  add(", disabled", "QOVA::SSO::sso_op_failed: sso does not enable.", {}, configureDisabled,
      Server::kNone);
  add(", a stranger", "QOVA::SSO::sso_exception: profile not support.", {}, configureStranger,
      Server::kNone);
  add(", no profile", "QOVA::SSO::sso_op_failed: not specify sso profile", {}, configureNoProfile,
      Server::kNone);
  add(", a broken file", unreadable, {}, configureBroken, Server::kNone);
  // Whatever fails on the way, a forged token signs no user in.
  add(", Azure, a forged token", kNoRSA,
      segments + rsa() + transfer({kBadResponse, kNoKey}) + form + settings({kBadResponse, kNoRSA}),
      configureForgedAzure, Server::kPlain);
  add(", WebSphere, a forged token", kNoHMAC,
      segments + hmac() + transfer({kBadResponse}) + form + settings({kBadResponse, kNoHMAC}) +
          Failures{{"QOVABase64Encode", {kNoBase64}}},
      configureForgedWebSphere, Server::kPlain);

  const auto sequence = [&](const std::string& name, const std::string& good,
                            const Failures& failures, const auto& make) {
    all->push_back({"SSOClient::OpenIDConnectLogin, " + name, good, failures,
                    [make](Run& run) {
                      auto client = make();
                      std::string user = "before";
                      std::string code = "the code that came back";
                      run.armed([&] { client->OpenIDConnectLogin(std::move(code), user); });
                      if (run.returned()) run.gave(user);
                    },
                    configureAzure, Server::kPlain});
  };
  sequence("WebSphere", "ok: " + WebSphere::user(),
           segments + hmac() + transfer({kBadResponse}) + form +
               Failures{{"QOVABase64Encode", {kNoBase64}}},
           [] { return std::make_unique<WebSphereSSOClient>(); });
  sequence("Azure", "ok: " + Azure::user(),
           segments + rsa() + transfer({kBadResponse, kNoKey}) + form +
               Failures{{"QOVAWinsUserNameFqdn2Netbios", {kNoName}}},
           [] { return std::make_unique<AzureSSOClient>(); });
  all->push_back({"SSOClient::OpenIDConnectLogin",
                  "QOVA::SSO::sso_not_implemented: GetIDTokenReqParams not implemented",
                  {},
                  [](Run& run) {
                    SSOClient client;
                    std::string user = "before";
                    std::string code = "the code that came back, of some length";
                    run.armed([&] { client.OpenIDConnectLogin(std::move(code), user); });
                    run.expect(user == "before", "the user is unchanged");
                  }});
}

void addBase(std::vector<Operation>* all) {
  struct Hook {
    const char* name;
    std::function<void(SSOClient&)> call;
  };
  const Hook hooks[] = {
      {"VerifyIDToken", [](SSOClient& c) { c.VerifyIDToken(); }},
      {"GetIDTokenReqParams", [](SSOClient& c) { c.GetIDTokenReqParams(); }},
      {"ProcessTokenResponse", [](SSOClient& c) { c.ProcessTokenResponse(std::string()); }},
      {"GetUserName",
       [](SSOClient& c) {
         std::string user;
         c.GetUserName(user);
       }},
  };
  for (const Hook& hook : hooks) {
    all->push_back(
        {std::string("SSOClient::") + hook.name,
         std::string("QOVA::SSO::sso_not_implemented: ") + hook.name + " not implemented",
         {},
         [hook](Run& run) {
           SSOClient client;
           run.armed([&] { hook.call(client); });
         }});
  }

  struct Accessor {
    const char* name;
    std::string (SSOClient::*get)();
    const char* value;
  };
  const Accessor accessors[] = {
      {"GetClientID", &SSOClient::GetClientID, "the device's own identifier"},
      {"GetClientSecret", &SSOClient::GetClientSecret, "the secret of the device"},
      {"GetRedirectURI", &SSOClient::GetRedirectURI, "https://nas.example.com/login"},
      {"GetToken", &SSOClient::GetToken, ""},
      {"GetAuthEndpoint", &SSOClient::GetAuthEndpoint, "https://login.example.com/authorize"},
      {"GetTokenEndpoint", &SSOClient::GetTokenEndpoint, "http://127.0.0.1:9/azure-token"},
      {"GetWellknownEndpoint", &SSOClient::GetWellknownEndpoint, "http://127.0.0.1:9/discovery"},
      {"GetLogoutEndpoint", &SSOClient::GetLogoutEndpoint, "https://login.example.com/logout"},
  };
  for (const Accessor& accessor : accessors) {
    const std::string value = accessor.value;
    all->push_back({std::string("SSOClient::") + accessor.name,
                    "ok: " + value,
                    {},
                    [accessor](Run& run) {
                      AzureSSOClient client;
                      const std::string before = textOf(client);
                      std::string text;
                      run.armed([&] { text = (client.*accessor.get)(); });
                      if (run.returned()) run.gave(text);
                      run.expect(textOf(client) == before, "the client is unchanged");
                    },
                    configureAzure});
  }
  all->push_back({"SSOClient::isEnable",
                  "ok: true",
                  {},
                  [](Run& run) {
                    AzureSSOClient client;
                    bool enabled = false;
                    run.armed([&] { enabled = client.isEnable(); });
                    run.gave(enabled ? "true" : "false");
                  },
                  configureAzure});
  all->push_back({"SSOClient::SetCode", "ok", {}, [](Run& run) {
                    SSOClient client;
                    std::string code = "a code, longer than a string holds in itself";
                    run.armed([&] { client.SetCode(std::move(code)); });
                  }});
  all->push_back(
      {"SSOClient::SetRedirectURI", "ok: https://nas.example.com/another/login", {}, [](Run& run) {
         SSOClient client;
         std::string uri = "https://nas.example.com/another/login";
         run.armed([&] { client.SetRedirectURI(std::move(uri)); });
         if (run.returned()) run.gave(client.GetRedirectURI());
       }});
  all->push_back({"SSOClient::SSOClient",
                  "ok: equal",
                  {},
                  [](Run& run) {
                    AzureSSOClient client;
                    const std::string before = textOf(client);
                    run.armed([&] {
                      SSOClient copy(client);
                      SSOClient moved(std::move(copy));
                      if (moved.GetClientID() != client.GetClientID()) abort();
                    });
                    if (run.returned()) run.gave("equal");
                    run.expect(textOf(client) == before, "the copied client is unchanged");
                  },
                  configureAzure});
  all->push_back({"SSOClient::operator=",
                  "ok: equal",
                  {},
                  [](Run& run) {
                    AzureSSOClient client;
                    const std::string before = textOf(client);
                    SSOClient other;
                    SSOClient third;
                    run.armed([&] {
                      other = client;
                      third = std::move(other);
                    });
                    if (run.returned()) run.gave(textOf(third) == before ? "equal" : "different");
                    run.expect(textOf(client) == before, "the copied client is unchanged");
                  },
                  configureAzure});
}

void addProfile(std::vector<Operation>* all) {
  const auto construct = [](Run& run) {
    std::unique_ptr<SSOProfile> profile;
    run.armed([&] { profile = std::make_unique<SSOProfile>(); });
    if (!run.returned()) return;
    run.gave((profile->SSOIsEnable() ? "on " : "off ") + profile->GetSSOProfile() + ", " +
             kindOf(*profile->GetSSOClient()));
  };
  const auto add = [&](const std::string& variant, const std::string& good,
                       const Failures& failures, const std::function<void()>& file) {
    all->push_back({"SSOProfile::SSOProfile" + variant, good, failures, construct, file});
  };
  const std::string off = "ok: off , nothing";
  add(", Azure", "ok: on azure, all settings",
      settings({off, "ok: on azure, all settings", "ok: on azure, nothing"}), configureAzure);
  add(", WebSphere", "ok: on websphere, all settings",
      settings({off, "ok: on websphere, all settings", "ok: on websphere, nothing"}),
      configureWebSphere);
  add(", disabled", "ok: off azure, nothing", settings({off, "ok: off azure, nothing"}),
      configureDisabled);
  add(", a stranger", "ok: on another, nothing", settings({off, "ok: on another, nothing"}),
      configureStranger);
  add(", no file", off, {}, configureNothing);

  const auto ask = [&](const std::string& name, const std::string& good, const auto& question) {
    all->push_back({"SSOProfile::" + name,
                    good,
                    {},
                    [question](Run& run) {
                      SSOProfile profile;
                      std::string answer;
                      run.armed([&] { answer = question(profile); });
                      if (run.returned()) run.gave(answer);
                    },
                    configureAzure});
  };
  ask("SSOIsEnable", "ok: on",
      [](SSOProfile& p) { return std::string(p.SSOIsEnable() ? "on" : "off"); });
  ask("GetSSOProfile", "ok: azure", [](SSOProfile& p) { return p.GetSSOProfile(); });
  ask("GetSSOClient", "ok: client",
      [](SSOProfile& p) { return std::string(p.GetSSOClient() != nullptr ? "client" : "null"); });
}

template <typename Exception>
void addException(std::vector<Operation>* all, const std::string& name) {
  all->push_back({name + "::" + name, "ok", {}, [](Run& run) {
                    const std::string message = "a message, longer than a string holds in itself";
                    std::string what;
                    run.armed([&] {
                      const Exception exception(message);
                      const Exception copy(exception);
                      if (copy.what() != message) abort();
                    });
                  }});
}

std::vector<Operation> makeOperations() {
  std::vector<Operation> all;
  addHelpers(&all);
  addException<sso_exception>(&all, "sso_exception");
  addException<sso_err_resp>(&all, "sso_err_resp");
  addException<sso_op_failed>(&all, "sso_op_failed");
  addException<sso_not_implemented>(&all, "sso_not_implemented");
  addException<QOVA::JWT::jwt_exception>(&all, "jwt_exception");
  addException<QOVA::JWT::jwt_not_support>(&all, "jwt_not_support");
  addException<QOVA::JWT::jwt_verify_failed>(&all, "jwt_verify_failed");
  addJwt(&all);
  addBase(&all);
  addConstruction<Azure>(&all);
  addConstruction<WebSphere>(&all);
  addProfile(&all);
  addRequests<Azure>(&all);
  addRequests<WebSphere>(&all);
  addTokens<Azure>(&all);
  addTokens<WebSphere>(&all);
  addWebSphere(&all);
  addAzure(&all);
  addUrls(&all);
  addTransfers(&all);
  addProviderRequests(&all);
  addLogins(&all);
  return all;
}

}  // namespace

const std::vector<Operation>& operations() {
  static const std::vector<Operation> all = makeOperations();
  return all;
}

}  // namespace faults
