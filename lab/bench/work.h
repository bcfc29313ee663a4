// What is measured: each piece of work, and the sizes for which its cost is reported. library.cpp
// and floor.cpp say how each is done.
#pragma once

#include <openssl/evp.h>

#include <cstddef>
#include <functional>
#include <string>
#include <utility>

#include "operation.h"

namespace bench {

constexpr std::size_t kTokenSizes[] = {1 << 10, 1 << 12, 1 << 14, 1 << 16, 1 << 18, 1 << 20};
constexpr int kKeyCounts[] = {1, 10, 100, 300, 1000};
constexpr std::size_t kAnswerSizes[] = {1 << 10, 10 << 10, 100 << 10, 1 << 20, 10 << 20};

using Digest = const EVP_MD* (*)();

// How a program does it.
struct Work {
  // The material is a token's name.
  std::function<Maker(const std::string& token, Digest)> rsa;        // the signature alone
  std::function<Maker(const std::string& token, Digest)> hmac;       // the same
  std::function<Maker(const std::string& token, Digest)> check;      // header and claims as well
  std::function<Maker(const std::string& token, Digest)> checkHmac;  // the same
  std::function<Maker(const std::string& token)> parse;              // header and claims alone
  // With a key set of that many keys; an answer of that name.
  std::function<Maker(const std::string& keys)> login;
  std::function<Maker(const std::string& name)> answer;
  Maker url;
  Maker urlEncode;
  Maker md5;
};

inline Makers makersOf(const Work& work) {
  Makers makers = {{"parse", work.parse("rs256")},
                   {"url", work.url},
                   {"urlencode", work.urlEncode},
                   {"md5", work.md5}};
  const std::pair<const char*, Digest> digests[] = {
      {"256", EVP_sha256}, {"384", EVP_sha384}, {"512", EVP_sha512}};
  for (const auto& [bits, digest] : digests) {
    const std::string rs = std::string("rs") + bits;
    const std::string hs = std::string("hs") + bits;
    makers[rs] = work.rsa(rs, digest);
    makers[hs] = work.hmac(hs, digest);
    makers["check-" + rs] = work.check(rs, digest);
    makers["check-" + hs] = work.checkHmac(hs, digest);
  }
  for (const std::size_t size : kTokenSizes) {
    const std::string name = "rs256-" + std::to_string(size);
    makers[name] = work.rsa(name, EVP_sha256);
    makers["check-" + name] = work.check(name, EVP_sha256);
  }
  for (const int keys : kKeyCounts) {
    makers["login-keys-" + std::to_string(keys)] = work.login(std::to_string(keys));
  }
  for (const std::size_t size : kAnswerSizes) {
    const std::string name = "answer-" + std::to_string(size);
    makers[name] = work.answer(name);
  }
  return makers;
}

// The client secret as the device's settings give it to the library: base64 text.
inline std::string encodedSecret(const Material& material) {
  const std::string secret = material["secret"];
  unsigned char text[1024];
  const int length = EVP_EncodeBlock(text, reinterpret_cast<const unsigned char*>(secret.data()),
                                     static_cast<int>(secret.size()));
  return {reinterpret_cast<char*>(text), static_cast<size_t>(length)};
}

}  // namespace bench
