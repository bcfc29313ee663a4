// The work done by the library.
#include <string>
#include <utility>

#include "sso/azuresso.h"
#include "sso/jwt.h"
#include "sso/utils.h"
#include "work.h"

namespace {

using bench::Material;
using bench::Operation;
using QOVA::JWT::Jwt;
using QOVA::SSO::AzureSSOClient;

auto rsa(const std::string& name, bench::Digest digest) {
  return [=](const Material& material) -> Operation {
    return [token = material[name], n = material["n"], e = material["e"], digest]() mutable {
      std::string copy = token;
      Jwt jwt(std::move(copy));
      jwt.JwtRSAVerify(n, e, digest());
    };
  };
}

auto hmac(const std::string& name, bench::Digest digest) {
  return [=](const Material& material) -> Operation {
    return [token = material[name], key = bench::encodedSecret(material), digest]() mutable {
      std::string copy = token;
      Jwt jwt(std::move(copy));
      jwt.JwtHMACVerify(key, digest());
    };
  };
}

// From the token to its claims, signature checked: what other libraries do in one call.
auto check(const std::string& name, bench::Digest digest) {
  return [=](const Material& material) -> Operation {
    return [token = material[name], n = material["n"], e = material["e"], digest]() mutable {
      std::string copy = token;
      Jwt jwt(std::move(copy));
      bench::require(jwt.GetHeader().isObject() && jwt.GetBody().isObject(), "parse");
      jwt.JwtRSAVerify(n, e, digest());
    };
  };
}

auto checkHmac(const std::string& name, bench::Digest digest) {
  return [=](const Material& material) -> Operation {
    return [token = material[name], key = bench::encodedSecret(material), digest]() mutable {
      std::string copy = token;
      Jwt jwt(std::move(copy));
      bench::require(jwt.GetHeader().isObject() && jwt.GetBody().isObject(), "parse");
      jwt.JwtHMACVerify(key, digest());
    };
  };
}

// Header and claims, as a client reads them.
auto parse(const std::string& name) {
  return [=](const Material& material) -> Operation {
    return [token = material[name]] {
      std::string copy = token;
      Jwt jwt(std::move(copy));
      bench::require(jwt.GetHeader().isObject() && jwt.GetBody().isObject(), "parse");
    };
  };
}

Operation url(const Material&) {
  Json::Value parameters;
  parameters["origin"] = "https://device.example.net/webman/index.cgi";
  return [client = AzureSSOClient(), parameters]() mutable {
    bench::require(client.GetAccessTokenReqURI(parameters).size() > 300, "no URL: no settings?");
  };
}

Operation md5(const Material&) {
  return [text = std::string("01234567-89ab-4cde-8f01-23456789abcd")] {
    bench::require(QOVA::SSO::MD5Digest(text).size() == 32, "MD5");
  };
}

Operation urlEncode(const Material&) {
  return [text = std::string("https://device.example.net/webman/login.cgi?state=1&x=a b")] {
    bench::require(QOVA::SSO::URLEncode(text).size() > text.size(), "URLEncode");
  };
}

// A client whose discovery document and key set lie in files: libcurl reads those too.
class FileClient : public AzureSSOClient {
 public:
  FileClient(const Material& material, const std::string& keys) {
    wellknownEndpoint = material.url("discovery-" + keys);
  }
  explicit FileClient(const std::string& answer) { tokenEndpoint = answer; }
};

auto answer(const std::string& name) {
  return [=](const Material& material) -> Operation {
    return [client = FileClient(material.url(name))]() mutable {
      std::string response;
      client.RequestTokenEndpoint(response, "code=x");
      bench::require(!response.empty(), "no answer");
    };
  };
}

// From token response to user name, with a key set of that size.
auto login(const std::string& keys) {
  return [=](const Material& material) -> Operation {
    const std::string response = R"({"id_token":")" + material["rs256"] + R"("})";
    return [client = FileClient(material, keys), response]() mutable {
      client.ProcessTokenResponse(response);
      client.VerifyIDToken();
      std::string user;
      client.GetUserName(user);
      bench::require(user == "DEVICE.EXAMPLE.NET\\user", "another user");
    };
  };
}

}  // namespace

int main(int count, char** arguments) {
  return bench::run(
      count, arguments,
      bench::makersOf({rsa, hmac, check, checkHmac, parse, login, answer, url, urlEncode, md5}));
}
