#include "support/known.h"

#include <openssl/core_names.h>
#include <openssl/evp.h>
#include <openssl/param_build.h>

#include <memory>

#include "support/device.h"
#include "support/independent.h"
#include "support/target.h"

namespace fuzz {

const char kModulus[] =
    "ofgWCuLjybRlzo0tZWJjNiuSfb4p4fAkd_wWJcyQoTbji9k0l8W26mPddxHmfHQp"
    "-Vaw-4qPCJrcS2mJPMEzP1Pt0Bm4d4QlL-yRT-SFd2lZS-pCgNMsD1W_YpRPEwOW"
    "vG6b32690r2jZ47soMZo9wGzjb_7OMg0LOL-bSf63kpaSHSXndS5z5rexMdbBYUs"
    "LA9e-KXBdQOS-UTo7WTBEMa2R2CapHg665xsmtdVMTBQY4uDZlxvb3qCo5ZwKh9k"
    "G4LT6_I5IhlJH7aGhyxXFvUK-DWNmoudF8NAco9_h9iaGNj8q2ethFkMLs91kzk2"
    "PAcDTW9gb54h4FRWyuXpoQ";
const char kExponent[] = "AQAB";

const char kClaims[] = R"({"exp":2000000300,"aud":"device-17","tid":"tenant-4","sub":"alice",)"
                       R"("unique_name":"alice@werk.example.net"})";

const char kDiscovery[] =
    R"({"issuer":"https://provider.example","jwks_uri":"https://provider.example/keys"})";

namespace {

const char kPrivateExponent[] =
    "Eq5xpGnNCivDflJsRQBXHx1hdR1k6Ulwe2JZD50LpXyWPEAeP88vLNO97IjlA7_G"
    "Q5sLKMgvfTeXZx9SE-7YwVol2NXOoAJe46sui395IW_GO-pWJ1O0BkTGoVEn2bKV"
    "RUCgu-GjBVaYLU6f3l9kJfFNS3E0QbVdxzubSu3Mkqzjkn439X0M_V51gfpRLI9J"
    "YanrC4D4qAdGcopV_0ZHHzQlBjudU2QvXt4ehNYTCBr6XCLQUShb1juUO1ZdiYoF"
    "aFQT5Tw8bGUl_x_jTj3ccPDVZFD9pIuhLhBOneufuBiB4cS98l2SR_RQyGWSeWjn"
    "czT0QU91p1DhOVRuOopznQ";

EVP_PKEY* privateKey() {
  static EVP_PKEY* const key =
      makeRsaKey({decoded(kModulus), decoded(kExponent), decoded(kPrivateExponent)});
  require(key != nullptr, "no private key");
  return key;
}

std::string digestNameOf(const std::string& header) {
  for (const char* const number : {"384", "512"}) {
    if (header.find(number) != std::string::npos) return std::string("SHA") + number;
  }
  return "SHA256";
}

std::string signingInput(const std::string& header, const std::string& claims) {
  return base64url(header) + "." + base64url(claims);
}

}  // namespace

std::string sign(const std::string& data, const std::string& digest) {
  const std::unique_ptr<EVP_MD_CTX, decltype(&EVP_MD_CTX_free)> context(EVP_MD_CTX_new(),
                                                                        EVP_MD_CTX_free);
  std::size_t size = 256;
  std::string signature(size, '\0');
  require(
      EVP_DigestSignInit(context.get(), nullptr, EVP_get_digestbyname(digest.c_str()), nullptr,
                         privateKey()) == 1 &&
          EVP_DigestSign(context.get(), bytesOf(signature), &size, bytesOf(data), data.size()) == 1,
      "cannot sign");
  return signature;
}

std::string rsaToken(const std::string& header, const std::string& claims) {
  const std::string input = signingInput(header, claims);
  return input + "." + base64url(sign(input, digestNameOf(header)));
}

std::string hmacToken(const std::string& header, const std::string& claims) {
  const std::string input = signingInput(header, claims);
  return input + "." + base64url(hmac(kSecret, input, digestNameOf(header)));
}

std::string tokenResponse(const std::string& token) {
  return R"({"token_type":"Bearer","expires_in":"3600","id_token":")" + token + R"("})";
}

std::string keySet() {
  return R"({"keys":[{"kty":"RSA","use":"sig","kid":"key-1","n":")" + std::string(kModulus) +
         R"(","e":"AQAB"}]})";
}

}  // namespace fuzz
