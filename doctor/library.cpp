#include "doctor/library.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <openssl/evp.h>
#include <sched.h>
#include <unistd.h>

#include "doctor/json.h"
#include "doctor/text.h"
#include "sso/azuresso.h"
#include "sso/jwt.h"
#include "sso/profile.h"
#include "sso/sso.h"
#include "sso/webspheresso.h"

namespace doctor {

namespace {

using QOVA::JWT::Jwt;
using QOVA::SSO::AzureSSOClient;
using QOVA::SSO::SSOClient;
using QOVA::SSO::SSOProfile;
using QOVA::SSO::WebSphereSSOClient;

// Of the form of Entra ID's codes, which it checks before the client.
constexpr char kFalseCode[] =
    "1.AXsocGllbnQtZG9jdG9yLWZhbHNl.ssoclient-doctor-sends-this-code-which-no-provider-gave-out";

// A client that may be kept from the network, so that the checks before it can be asked for.
class QuietAzureClient : public AzureSSOClient {
 public:
  void RequestWellknownInfo(Json::Value&) override {}
};

// Calls `use` with a new client of the provider.
Json::Value WithClient(Provider provider, const std::function<Json::Value(SSOClient&)>& use) {
  if (provider == Provider::kAzure) {
    AzureSSOClient client;
    return use(client);
  }
  WebSphereSSOClient client;
  return use(client);
}

// Stores a token in a client the way a provider's answer does.
void Store(SSOClient& client, const std::string& token) {
  Json::Value answer(Json::objectValue);
  answer["id_token"] = token;
  client.ProcessTokenResponse(WriteJson(answer, JsonStyle::kCompact));
}

// True if the profile file, as this process can read it, ends OIDCLogin before it constructs a
// client.
bool ProfileEndsLogin() {
  const int file = open(QOVA::SSO::kProfilePath, O_RDONLY | O_CLOEXEC);
  if (file < 0) return true;
  close(file);
  SSOProfile profile;
  return !profile.SSOIsEnable() || ProviderOf(profile.GetSSOProfile()) == Provider::kNone;
}

Json::Value Exchange(SSOClient& client, const std::string& body) {
  std::string response;
  client.RequestTokenEndpoint(response, body);
  Json::Value result(Json::objectValue);
  result["response"] = response;
  client.ProcessTokenResponse(response);
  return result;
}

const EVP_MD* DigestOf(const std::string& algorithm) {
  const std::string size = algorithm.size() > 2 ? algorithm.substr(2) : "";
  return size == "512" ? EVP_sha512() : size == "384" ? EVP_sha384() : EVP_sha256();
}

// Winbind's client library, which only a library of that platform loads. Its functions return 0 on
// success.
Json::Value AskWinbind(const std::string& user) {
  void* const library = dlopen("libwbclient.so.0", RTLD_LAZY | RTLD_NOLOAD);
  if (library == nullptr) return {};
  const auto ping = reinterpret_cast<int (*)()>(dlsym(library, "wbcPing"));
  const auto lookup = reinterpret_cast<int (*)(const char*, const char*, void*, int*)>(
      dlsym(library, "wbcLookupName"));
  Json::Value state(Json::objectValue);
  state["ping"] = ping != nullptr && ping() == 0;
  const size_t slash = user.find('\\');
  if (lookup == nullptr || slash == std::string::npos) return state;
  unsigned char sid[256];  // more than a security identifier takes
  int type = 0;
  state["known"] =
      lookup(user.substr(0, slash).c_str(), user.substr(slash + 1).c_str(), sid, &type) == 0;
  return state;
}

}  // namespace

Provider ProviderOf(const std::string& profile) {
  if (profile == QOVA::SSO::kAzureProfile) return Provider::kAzure;
  if (profile == QOVA::SSO::kWebSphereProfile) return Provider::kWebSphere;
  return Provider::kNone;
}

Reply Library::AskClient(const std::function<Json::Value(SSOClient&)>& question) const {
  return Ask([&] { return WithClient(provider, question); }, seconds);
}

Settings Library::ReadSettings() const {
  const Reply reply = AskClient([](SSOClient& client) {
    Json::Value values(Json::objectValue);
    values["client_id"] = client.GetClientID();
    values["client_secret"] = client.GetClientSecret();
    values["redirect_uri"] = client.GetRedirectURI();
    values["authorization_endpoint"] = client.GetAuthEndpoint();
    values["token_endpoint"] = client.GetTokenEndpoint();
    values["logout_endpoint"] = client.GetLogoutEndpoint();
    values["wellknown"] = client.GetWellknownEndpoint();
    return values;
  });
  const auto value = [&reply](const char* name) { return StringOf(reply.result, name); };
  return {value("client_id"),      value("client_secret"),
          value("redirect_uri"),   value("authorization_endpoint"),
          value("token_endpoint"), value("logout_endpoint"),
          value("wellknown")};
}

Reply Library::Login(const Caller* caller) const {
  const auto question = [] {
    if (!ProfileEndsLogin()) return Json::Value();
    std::string user;
    QOVA::SSO::OIDCLogin("", user);
    return Json::Value();
  };
  return Ask(
      [question] {
        // Should the file be changed at this very moment, nothing can leave the device.
        if (geteuid() == 0) (void)!unshare(CLONE_NEWNET);
        return question();
      },
      seconds, caller);
}

Reply Library::Profile(const Caller* caller) const {
  return Ask(
      [] {
        SSOProfile profile;
        Json::Value values(Json::objectValue);
        values["enable"] = profile.SSOIsEnable();
        values["profile"] = profile.GetSSOProfile();
        return values;
      },
      seconds, caller);
}

Reply Library::TokenRequest(const std::string& body) const {
  return AskClient([&body](SSOClient& client) { return Exchange(client, body); });
}

std::string Library::ExchangeBody() const {
  const Reply reply = AskClient([](SSOClient& client) {
    client.SetCode(kFalseCode);
    return Json::Value(client.GetIDTokenReqParams());
  });
  return reply.result.isString() ? reply.result.asString() : "";
}

std::string Library::AuthorizationRequest() const {
  const Provider chosen = provider;
  const Reply reply = Ask(
      [chosen] {
        const Json::Value state(Json::objectValue);
        return Json::Value(chosen == Provider::kAzure
                               ? AzureSSOClient().GetAccessTokenReqURI(state)
                               : WebSphereSSOClient().GetAccessTokenReqURI(state));
      },
      seconds);
  return reply.result.isString() ? reply.result.asString() : "";
}

Reply Library::Split(const std::string& token) const {
  return Ask([token] { return Json::Value(Jwt(token).GetSignature()); }, seconds);
}

Reply Library::Header(const std::string& token) const {
  return Ask([token] { return Jwt(token).GetHeader(); }, seconds);
}

Reply Library::Body(const std::string& token) const {
  return Ask([token] { return Jwt(token).GetBody(); }, seconds);
}

Reply Library::Verify(const std::string& token) const {
  return AskClient([&token](SSOClient& client) {
    Store(client, token);
    client.VerifyIDToken();
    return Json::Value(true);
  });
}

Reply Library::VerifyOffline(const std::string& token) const {
  if (provider != Provider::kAzure) return Verify(token);
  return Ask(
      [token] {
        QuietAzureClient client;
        Store(client, token);
        client.VerifyIDToken();
        return Json::Value(true);
      },
      seconds);
}

Reply Library::VerifyRSA(const std::string& token, const std::string& n, const std::string& e,
                         const std::string& algorithm) const {
  return Ask(
      [token, n, e, algorithm] {
        std::string modulus = n;
        std::string exponent = e;
        Jwt(token).JwtRSAVerify(modulus, exponent, DigestOf(algorithm));
        return Json::Value(true);
      },
      seconds);
}

Reply Library::VerifyHMAC(const std::string& token, const std::string& secret,
                          const std::string& algorithm) const {
  return Ask(
      [token, secret, algorithm] {
        std::string key = EncodeBase64Url(secret);
        Jwt(token).JwtHMACVerify(key, DigestOf(algorithm));
        return Json::Value(true);
      },
      seconds);
}

Reply Library::UserName(const std::string& token) const {
  return AskClient([&token](SSOClient& client) {
    Store(client, token);
    std::string user;
    client.GetUserName(user);
    return Json::Value(user);
  });
}

Reply Library::Winbind(const std::string& user) const {
  return Ask([user] { return AskWinbind(user); }, seconds);
}

}  // namespace doctor
