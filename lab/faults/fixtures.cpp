// What the operations work with, and the provider that they talk to.
#include <json/json.h>
#include <sys/wait.h>
#include <unistd.h>

#include <memory>
#include <stdexcept>

#include "faults/operation.h"
#include "support/ca.h"
#include "support/device.h"
#include "support/memory_file.h"
#include "support/provider.h"
#include "support/tokens.h"

namespace faults {
namespace {

const char kSecret[] = "the secret of the device";

Json::Value claims(const std::string& tenant = "the tenant's own identifier") {
  Json::Value body;
  body["exp"] = Json::Int64{4102444800};
  body["aud"] = "the device's own identifier";
  body["tid"] = tenant;
  body["sub"] = "the-account-of-alice";
  body["unique_name"] = "the-account-of-alice@example.com";
  return body;
}

std::string header(const std::string& algorithm, const std::string& kid = "the key of this year") {
  Json::Value value;
  value["alg"] = algorithm;
  value["kid"] = kid;
  return value.toStyledString();
}

// The token with the signature of another.
std::string forged(const std::string& token, const std::string& other) {
  return token.substr(0, token.rfind('.')) + other.substr(other.rfind('.'));
}

Json::Value made() {
  const test::RsaKey key;
  const std::string body = claims().toStyledString();
  Json::Value all;
  const auto rsa = [&](const std::string& head, const std::string& content) {
    return test::rsaToken(key, head, content);
  };
  const auto hmac = [&](const std::string& head, const std::string& content) {
    return test::hmacToken(kSecret, head, content);
  };
  all["azure token"] = rsa(header("RS256"), body);
  all["forged token"] = forged(rsa(header("RS256"), body), rsa(header("RS256"), "{}"));
  all["stranger's token"] = rsa(header("RS256", "a stranger"), body);
  all["azure HS256 token"] = hmac(header("HS256"), body);
  Json::Value stranger = claims();
  stranger["aud"] = "the identifier of another";
  all["another audience token"] = rsa(header("RS256"), stranger.toStyledString());
  all["another audience HS256 token"] = hmac(header("HS256"), stranger.toStyledString());
  Json::Value mail = claims();
  mail["email"] = mail["unique_name"];
  mail.removeMember("unique_name");
  all["email token"] = rsa(header("RS256"), mail.toStyledString());
  all["another tenant token"] = rsa(header("RS256"), claims("another").toStyledString());
  all["websphere token"] = hmac(header("HS256"), body);
  all["forged HS256 token"] = forged(hmac(header("HS256"), body), hmac(header("HS256"), "{}"));
  all["empty token"] = hmac(header("HS256"), "{}");
  Json::Value two = claims();
  two["unique_name"] = "the-account@of-alice@example.com";
  all["two signs token"] = hmac(header("HS256"), two.toStyledString());
  all["n"] = key.n();
  all["e"] = key.e();
  all["jwk"] = key.jwk("the key of this year");
  all["key"] = test::base64url(kSecret);
  all["state"] = test::base64(R"({"origin":"/a page of some length"})");
  all["text"] = "a text & a name, longer than a string holds in itself";
  all["digest"] = test::md5(all["text"].asString());
  const test::Ca authority;
  const test::Identity server = authority.issue({"localhost"});
  all["authority"] = authority.certificate();
  all["server certificate"] = server.certificate;
  all["server key"] = server.key;
  const test::Identity another = test::selfSigned({"another.example.com"});
  all["stranger certificate"] = another.certificate;
  all["stranger key"] = another.key;
  return all;
}

std::unique_ptr<test::Provider> provider;

}  // namespace

Fixtures& fixtures() {
  static Fixtures all;
  return all;
}

void makeFixtures() {
  const test::MemoryFile file;
  const pid_t child = fork();
  if (child == 0) {
    file.put(made().toStyledString());
    _exit(0);
  }
  int status = 1;
  if (waitpid(child, &status, 0) != child || status != 0) throw std::runtime_error("fixtures");
  Json::Value all;
  if (!Json::Reader().parse(file.contents(), all)) throw std::runtime_error("fixtures");
  for (const std::string& name : all.getMemberNames()) {
    fixtures().texts[name] = all[name].asString();
  }
  // One authority instead of the system's many: reading them is most of a transfer otherwise.
  test::coverFile("/etc/ssl/certs/ca-certificates.crt", fixtures()["authority"]);
}

std::string providerUrl(const std::string& path) {
  if (provider == nullptr) return "http://127.0.0.1:9" + path;  // no server listens there
  const bool tls = provider->url("").compare(0, 5, "https") == 0;
  return provider->url(path, tls ? "localhost" : "127.0.0.1");
}

void startProvider(Operation::Server server) {
  provider.reset();
  if (server == Operation::Server::kNone) return;
  if (server == Operation::Server::kPlain) {
    provider = std::make_unique<test::Provider>();
  } else {
    const std::string who = server == Operation::Server::kTls ? "server" : "stranger";
    provider = std::make_unique<test::Provider>(
        test::Identity{fixtures()[who + " certificate"], fixtures()[who + " key"]});
  }
  const auto response = [](const std::string& token) {
    return test::ok("{\"id_token\":\"" + token + "\"}");
  };
  provider->answer("POST /azure-token", response(fixtures()["azure token"]));
  provider->answer("POST /websphere-token", response(fixtures()["websphere token"]));
  provider->answer("POST /forged-azure-token", response(fixtures()["forged token"]));
  provider->answer("POST /forged-websphere-token", response(fixtures()["forged HS256 token"]));
  for (const char* const path : {"/azure-token", "/websphere-token"}) {
    provider->answer(path, test::failed(405, "not posted"));
  }
  provider->answer("/discovery", test::ok("{\"jwks_uri\":\"" + providerUrl("/keys") + "\"}"));
  provider->answer("/keys", test::ok("{\"keys\":[" + fixtures()["jwk"] + "]}"));
  provider->answer("/bare-discovery",
                   test::ok("{\"jwks_uri\":\"" + providerUrl("/bare-keys") + "\"}"));
  provider->answer("/bare-keys", test::ok(R"({"keys":[{"kid":"the key of this year"}]})"));
  provider->answer("/half-discovery",
                   test::ok("{\"jwks_uri\":\"" + providerUrl("/half-keys") + "\"}"));
  provider->answer("/half-keys",
                   test::ok(R"({"keys":[{"kid":"the key of this year","n":"AQAB"}]})"));
  provider->answer("/text", test::ok("plain text of some length"));
  provider->answer("POST /text", test::ok("plain text about what was posted"));
  provider->start();
}

void stopProvider() {
  provider.reset();
}

void leaveProvider() {
  (void)provider.release();
}

}  // namespace faults
