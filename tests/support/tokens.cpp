#include "support/tokens.h"

#include <openssl/bn.h>
#include <openssl/core_names.h>
#include <openssl/hmac.h>
#include <openssl/pem.h>
#include <openssl/rsa.h>

#include <stdexcept>
#include <utility>
#include <vector>

namespace test {
namespace {

void require(bool good, const char* what) {
  if (!good) throw std::runtime_error(std::string("test tokens: ") + what);
}

const unsigned char* bytesOf(const std::string& text) {
  return reinterpret_cast<const unsigned char*>(text.data());
}

const EVP_MD* digestNamed(const std::string& name) {
  const EVP_MD* digest = EVP_get_digestbyname(name.c_str());
  require(digest != nullptr, "unknown digest");
  return digest;
}

std::shared_ptr<EVP_PKEY> readKey(const char* path) {
  const std::unique_ptr<BIO, decltype(&BIO_free)> file(BIO_new_file(path, "r"), BIO_free);
  require(file != nullptr, "cannot open the key");
  return {PEM_read_bio_PrivateKey(file.get(), nullptr, nullptr, nullptr), EVP_PKEY_free};
}

std::string digestOf(const std::string& algorithm) {
  return "SHA" + algorithm.substr(2);
}

}  // namespace

std::string base64(const std::string& bytes) {
  std::string text(4 * ((bytes.size() + 2) / 3) + 1, '\0');
  const int size = EVP_EncodeBlock(reinterpret_cast<unsigned char*>(&text[0]), bytesOf(bytes),
                                   static_cast<int>(bytes.size()));
  text.resize(static_cast<std::size_t>(size));
  return text;
}

std::string md5(const std::string& text) {
  unsigned char digest[EVP_MAX_MD_SIZE];
  unsigned size = 0;
  EVP_Digest(text.data(), text.size(), digest, &size, EVP_md5(), nullptr);
  std::string hex;
  for (unsigned i = 0; i < size; ++i) {
    hex += "0123456789abcdef"[digest[i] >> 4];
    hex += "0123456789abcdef"[digest[i] & 15];
  }
  return hex;
}

std::string base64url(const std::string& bytes) {
  std::string text = base64(bytes);
  for (char& c : text) c = c == '+' ? '-' : c == '/' ? '_' : c;
  text.erase(text.find_last_not_of('=') + 1);
  return text;
}

std::string fromBase64(const std::string& text) {
  std::string padded = text;
  for (char& c : padded) c = c == '-' ? '+' : c == '_' ? '/' : c;
  padded.erase(padded.find_last_not_of('=') + 1);
  const std::size_t missing = (4 - padded.size() % 4) % 4;
  padded.append(missing, '=');
  std::string bytes(padded.size() / 4 * 3 + 1, '\0');
  const int size = EVP_DecodeBlock(reinterpret_cast<unsigned char*>(&bytes[0]), bytesOf(padded),
                                   static_cast<int>(padded.size()));
  require(size >= 0, "not base64");
  bytes.resize(static_cast<std::size_t>(size) - missing);
  return bytes;
}

RsaKey::RsaKey(std::shared_ptr<EVP_PKEY> pair) : key(std::move(pair)) {
  require(key != nullptr, "no RSA key");
}

RsaKey::RsaKey(int bits) : key(EVP_RSA_gen(static_cast<unsigned>(bits)), EVP_PKEY_free) {
  require(key != nullptr, "no RSA key");
}

std::string RsaKey::number(const char* name) const {
  BIGNUM* value = nullptr;
  require(EVP_PKEY_get_bn_param(key.get(), name, &value) == 1, "no such number");
  std::string bytes(static_cast<std::size_t>(BN_num_bytes(value)), '\0');
  BN_bn2bin(value, reinterpret_cast<unsigned char*>(&bytes[0]));
  BN_free(value);
  return base64url(bytes);
}

std::string RsaKey::n() const {
  return number(OSSL_PKEY_PARAM_RSA_N);
}
std::string RsaKey::e() const {
  return number(OSSL_PKEY_PARAM_RSA_E);
}

std::string RsaKey::jwk(const std::string& kid) const {
  return R"({"kty":"RSA","use":"sig","kid":")" + kid + R"(","n":")" + n() + R"(","e":")" + e() +
         R"("})";
}

std::string RsaKey::sign(const std::string& data, const std::string& digest) const {
  std::unique_ptr<EVP_MD_CTX, decltype(&EVP_MD_CTX_free)> context(EVP_MD_CTX_new(),
                                                                  EVP_MD_CTX_free);
  std::size_t size = 0;
  require(
      EVP_DigestSignInit(context.get(), nullptr, digestNamed(digest), nullptr, key.get()) == 1 &&
          EVP_DigestSign(context.get(), nullptr, &size, bytesOf(data), data.size()) == 1,
      "sign");
  std::string signature(size, '\0');
  require(EVP_DigestSign(context.get(), reinterpret_cast<unsigned char*>(&signature[0]), &size,
                         bytesOf(data), data.size()) == 1,
          "sign");
  signature.resize(size);
  return signature;
}

const RsaKey& anyRsaKey() {
  static const RsaKey key(readKey(RSA_KEY));
  return key;
}

std::string hmac(const std::string& secret, const std::string& data, const std::string& digest) {
  unsigned char result[EVP_MAX_MD_SIZE];
  unsigned size = 0;
  require(HMAC(digestNamed(digest), bytesOf(secret), static_cast<int>(secret.size()), bytesOf(data),
               data.size(), result, &size) != nullptr,
          "hmac");
  return std::string(reinterpret_cast<const char*>(result), size);
}

std::string signingInput(const std::string& header, const std::string& body) {
  return base64url(header) + "." + base64url(body);
}

std::string rsaToken(const RsaKey& key, const std::string& header, const std::string& body,
                     const std::string& algorithm) {
  const std::string input = signingInput(header, body);
  return input + "." + base64url(key.sign(input, digestOf(algorithm)));
}

std::string hmacToken(const std::string& secret, const std::string& header, const std::string& body,
                      const std::string& algorithm) {
  const std::string input = signingInput(header, body);
  return input + "." + base64url(hmac(secret, input, digestOf(algorithm)));
}

}  // namespace test
