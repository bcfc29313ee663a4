// Makes what the benchmark works on: an RSA key, tokens, key sets, settings, answers. The key is
// new each time; nothing that is measured depends on which one it is.
//   bench_material FOLDER
#include <openssl/core_names.h>
#include <openssl/evp.h>
#include <openssl/hmac.h>
#include <openssl/pem.h>

#include <cstdio>
#include <fstream>
#include <iostream>
#include <memory>
#include <stdexcept>
#include <string>

#include "work.h"

namespace {

using Key = std::unique_ptr<EVP_PKEY, decltype(&EVP_PKEY_free)>;
using Context = std::unique_ptr<EVP_MD_CTX, decltype(&EVP_MD_CTX_free)>;

constexpr char kSecret[] = "a client secret of ordinary length, 42 b.";

const unsigned char* bytesOf(const std::string& text) {
  return reinterpret_cast<const unsigned char*>(text.data());
}

void require(bool good, const char* what) {
  if (!good) throw std::runtime_error(what);
}

std::string base64url(const std::string& bytes) {
  std::string text(4 * (bytes.size() / 3 + 1) + 1, '\0');
  const int length = EVP_EncodeBlock(reinterpret_cast<unsigned char*>(&text[0]), bytesOf(bytes),
                                     static_cast<int>(bytes.size()));
  text.resize(static_cast<size_t>(length));
  while (!text.empty() && text.back() == '=') text.pop_back();
  for (char& c : text) c = c == '+' ? '-' : c == '/' ? '_' : c;
  return text;
}

std::string number(EVP_PKEY* key, const char* name) {
  BIGNUM* value = nullptr;
  require(EVP_PKEY_get_bn_param(key, name, &value) == 1, "no such number in the key");
  std::string bytes(static_cast<size_t>(BN_num_bytes(value)), '\0');
  BN_bn2bin(value, reinterpret_cast<unsigned char*>(&bytes[0]));
  BN_free(value);
  return base64url(bytes);
}

std::string sign(EVP_PKEY* key, const std::string& digest, const std::string& text) {
  const Context context(EVP_MD_CTX_new(), EVP_MD_CTX_free);
  std::string signature(static_cast<size_t>(EVP_PKEY_get_size(key)), '\0');
  size_t size = signature.size();
  require(EVP_DigestSignInit(context.get(), nullptr, EVP_get_digestbyname(digest.c_str()), nullptr,
                             key) == 1 &&
              EVP_DigestSign(context.get(), reinterpret_cast<unsigned char*>(&signature[0]), &size,
                             bytesOf(text), text.size()) == 1,
          "cannot sign");
  return signature;
}

std::string mac(const std::string& digest, const std::string& text) {
  unsigned char result[EVP_MAX_MD_SIZE];
  unsigned size = 0;
  require(HMAC(EVP_get_digestbyname(digest.c_str()), kSecret, sizeof kSecret - 1, bytesOf(text),
               text.size(), result, &size) != nullptr,
          "cannot make a MAC");
  return {reinterpret_cast<char*>(result), size};
}

// The claims of an ordinary ID token, and a further one that brings the token to `size` bytes.
std::string claims(size_t size) {
  std::string text =
      R"({"aud":"00000003-0000-0000-c000-000000000000","exp":4102444800,"iat":1700000000,)"
      R"("iss":"https://login.example.net/tenant/v2.0","nonce":"d41d8cd98f00b204e9800998ecf8427e",)"
      R"("sub":"user@device.example.net","tid":"9f8e7d6c-0000-4000-8000-0123456789ab",)"
      R"("unique_name":"user@device.example.net")";
  if (size > 1000) text += R"(,"groups":")" + std::string((size - 1000) / 4 * 3, 'g') + '"';
  return text + "}";
}

std::string signingInput(const std::string& algorithm, size_t size) {
  return base64url(R"({"alg":")" + algorithm + R"(","kid":"key-0","typ":"JWT"})") + "." +
         base64url(claims(size));
}

class Folder {
 public:
  explicit Folder(std::string path) : path(std::move(path)) {}

  void write(const std::string& name, const std::string& text) const {
    std::ofstream file(path + "/" + name, std::ios::binary);
    file << text;
    require(static_cast<bool>(file.flush()), "cannot write");
  }
  std::string file(const std::string& name) const { return path + "/" + name; }

 private:
  const std::string path;
};

void writeTokens(const Folder& folder, EVP_PKEY* key) {
  for (const std::string bits : {"256", "384", "512"}) {
    const std::string rs = signingInput("RS" + bits, 0);
    folder.write("rs" + bits, rs + "." + base64url(sign(key, "SHA" + bits, rs)));
    const std::string hs = signingInput("HS" + bits, 0);
    folder.write("hs" + bits, hs + "." + base64url(mac("SHA" + bits, hs)));
  }
  for (const size_t size : bench::kTokenSizes) {
    const std::string rs = signingInput("RS256", size);
    folder.write("rs256-" + std::to_string(size), rs + "." + base64url(sign(key, "SHA256", rs)));
  }
}

// A key set of `count` keys in which the one that counts is the last.
std::string keySet(EVP_PKEY* key, int count) {
  const std::string numbers = R"(","kty":"RSA","use":"sig","alg":"RS256","n":")" +
                              number(key, OSSL_PKEY_PARAM_RSA_N) + R"(","e":")" +
                              number(key, OSSL_PKEY_PARAM_RSA_E) + R"("})";
  std::string text = R"({"keys":[)";
  for (int i = count - 1; i >= 0; --i) {
    text += R"({"kid":"key-)" + std::to_string(i) + numbers + (i > 0 ? "," : "");
  }
  return text + "]}";
}

void writeKeys(const Folder& folder, EVP_PKEY* key) {
  folder.write("n", number(key, OSSL_PKEY_PARAM_RSA_N));
  folder.write("e", number(key, OSSL_PKEY_PARAM_RSA_E));
  folder.write("jwk", R"({"kty":"RSA","kid":"key-0","n":")" + number(key, OSSL_PKEY_PARAM_RSA_N) +
                          R"(","e":")" + number(key, OSSL_PKEY_PARAM_RSA_E) + R"("})");
  const std::unique_ptr<FILE, int (*)(FILE*)> pem(std::fopen(folder.file("pem").c_str(), "w"),
                                                  std::fclose);
  require(pem != nullptr && PEM_write_PUBKEY(pem.get(), key) == 1, "cannot write the key");
  for (const int count : bench::kKeyCounts) {
    const std::string name = "keys-" + std::to_string(count);
    folder.write(name, keySet(key, count));
    folder.write("discovery-" + std::to_string(count),
                 R"({"issuer":"https://login.example.net","jwks_uri":"file://)" +
                     folder.file(name) + R"("})");
  }
}

}  // namespace

int main(int count, char** arguments) try {
  require(count == 2, "arguments: FOLDER");
  const Folder folder(arguments[1]);
  const Key key(EVP_RSA_gen(2048), EVP_PKEY_free);
  require(key != nullptr, "cannot make a key");
  writeTokens(folder, key.get());
  writeKeys(folder, key.get());
  folder.write("secret", kSecret);
  for (const size_t size : bench::kAnswerSizes) {
    folder.write("answer-" + std::to_string(size), std::string(size, 'a'));
  }
} catch (const std::exception& e) {
  std::cerr << "bench_material: " << e.what() << "\n";
  return EXIT_FAILURE;
}
