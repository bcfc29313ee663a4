#include "support/independent.h"

#include <curl/curl.h>
#include <json/reader.h>
#include <openssl/bn.h>
#include <openssl/core_names.h>
#include <openssl/param_build.h>

#include <cctype>
#include <cstring>
#include <memory>

#include "support/device.h"
#include "support/known.h"
#include "support/target.h"

namespace fuzz {
namespace {

const std::string kAlphabet = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_";

template <auto Release>
struct Freed {
  template <typename T>
  void operator()(T* resource) const {
    Release(resource);
  }
};
using Key = std::unique_ptr<EVP_PKEY, Freed<EVP_PKEY_free>>;
using Number = std::unique_ptr<BIGNUM, Freed<BN_free>>;

std::string withoutPadding(std::string text) {
  const std::size_t pads = text.size() - 1 - text.find_last_not_of('=');
  if (text.size() % 4 == 0 && pads <= 2) text.resize(text.size() - pads);
  return text;
}

}  // namespace

const unsigned char* bytesOf(const std::string& text) {
  return reinterpret_cast<const unsigned char*>(text.data());
}
unsigned char* bytesOf(std::string& text) {
  return reinterpret_cast<unsigned char*>(&text[0]);
}

std::string base64url(const std::string& bytes) {
  std::string text;
  unsigned bits = 0;
  int count = 0;
  for (const char byte : bytes) {
    bits = bits << 8 | static_cast<unsigned char>(byte);
    for (count += 8; count >= 6; count -= 6) text += kAlphabet[bits >> (count - 6) & 63];
  }
  if (count > 0) text += kAlphabet[bits << (6 - count) & 63];
  return text;
}

std::optional<std::string> strictBase64url(const std::string& text) {
  std::string bytes;
  unsigned bits = 0;
  int count = 0;
  for (char c : text) {
    c = c == '+' ? '-' : c == '/' ? '_' : c;
    const std::size_t value = kAlphabet.find(c);
    if (value == std::string::npos) return std::nullopt;
    bits = (bits << 6 | static_cast<unsigned>(value)) & 0xffff;
    if ((count += 6) < 8) continue;
    bytes += static_cast<char>(bits >> (count -= 8) & 255);
  }
  const bool leftOver = (bits & ((1u << count) - 1)) != 0;
  if (text.size() % 4 == 1 || leftOver) return std::nullopt;
  return bytes;
}

std::string lenientBase64url(const std::string& text) {
  std::string clean;
  for (char c : text.substr(0, text.find_last_not_of('=') + 1)) {
    c = c == '+' ? '-' : c == '/' ? '_' : c == '=' ? 'A' : c;
    if (std::isspace(static_cast<unsigned char>(c)) != 0) continue;
    if (kAlphabet.find(c) == std::string::npos) break;
    clean += c;
  }
  std::string bytes;
  unsigned bits = 0;
  int count = 0;
  for (const char c : clean) {
    bits = (bits << 6 | static_cast<unsigned>(kAlphabet.find(c))) & 0xffff;
    if ((count += 6) >= 8) bytes += static_cast<char>(bits >> (count -= 8) & 255);
  }
  return bytes;
}

std::optional<std::string> strictBase64(const std::string& text) {
  if (text.size() % 4 != 0 || text.find_first_of("-_") != std::string::npos) return std::nullopt;
  return strictBase64url(withoutPadding(text));
}

std::string decoded(const std::string& text) {
  const auto bytes = strictBase64url(text);
  require(bytes.has_value(), "a known text that does not decode");
  return *bytes;
}

EVP_PKEY* makeRsaKey(const std::vector<std::string>& numbers) {
  static const char* const kNames[] = {OSSL_PKEY_PARAM_RSA_N, OSSL_PKEY_PARAM_RSA_E,
                                       OSSL_PKEY_PARAM_RSA_D};
  const std::unique_ptr<OSSL_PARAM_BLD, Freed<OSSL_PARAM_BLD_free>> builder(OSSL_PARAM_BLD_new());
  std::vector<Number> owners;
  for (std::size_t i = 0; i < numbers.size(); ++i) {
    owners.emplace_back(
        BN_bin2bn(bytesOf(numbers[i]), static_cast<int>(numbers[i].size()), nullptr));
    if (OSSL_PARAM_BLD_push_BN(builder.get(), kNames[i], owners.back().get()) != 1) return nullptr;
  }
  const std::unique_ptr<OSSL_PARAM, Freed<OSSL_PARAM_free>> parameters(
      OSSL_PARAM_BLD_to_param(builder.get()));
  const std::unique_ptr<EVP_PKEY_CTX, Freed<EVP_PKEY_CTX_free>> context(
      EVP_PKEY_CTX_new_from_name(nullptr, "RSA", nullptr));
  EVP_PKEY* key = nullptr;
  const int selection = numbers.size() == 3 ? EVP_PKEY_KEYPAIR : EVP_PKEY_PUBLIC_KEY;
  if (EVP_PKEY_fromdata_init(context.get()) != 1 ||
      EVP_PKEY_fromdata(context.get(), &key, selection, parameters.get()) != 1) {
    return nullptr;
  }
  return key;
}

bool verifyRsa(const std::string& n, const std::string& e, const std::string& digest,
               const std::string& data, const std::string& signature) {
  const Key key(makeRsaKey({n, e}));
  if (key == nullptr) return false;
  const std::unique_ptr<EVP_MD_CTX, Freed<EVP_MD_CTX_free>> context(EVP_MD_CTX_new());
  return EVP_DigestVerifyInit(context.get(), nullptr, EVP_get_digestbyname(digest.c_str()), nullptr,
                              key.get()) == 1 &&
         EVP_DigestVerify(context.get(), bytesOf(signature), signature.size(), bytesOf(data),
                          data.size()) == 1;
}

std::string hmac(const std::string& key, const std::string& data, const std::string& digest) {
  std::string mac(EVP_MAX_MD_SIZE, '\0');
  std::size_t size = 0;
  require(EVP_Q_mac(nullptr, "HMAC", nullptr, digest.c_str(), nullptr, bytesOf(key), key.size(),
                    bytesOf(data), data.size(), bytesOf(mac), mac.size(), &size) != nullptr,
          "no HMAC");
  mac.resize(size);
  return mac;
}

std::string digestOf(const std::string& algorithm) {
  for (const std::string name : {"RS256", "RS384", "RS512", "HS256", "HS384", "HS512"}) {
    if (algorithm == name) return "SHA" + name.substr(2);
  }
  return "";
}

std::vector<std::string> segments(const std::string& token) {
  std::vector<std::string> all(1);
  for (const char c : token) {
    if (c == '.') {
      all.emplace_back();
    } else {
      all.back() += c;
    }
  }
  if (all.size() != 3) all.clear();
  return all;
}

bool isSigned(const std::string& token, const std::string& n, const std::string& e) {
  const auto three = segments(token);
  if (three.empty()) return false;
  Json::Value head;
  if (!readJson(cString(lenientBase64url(cString(three[0]))), head)) return false;
  const std::string algorithm = textOf(head, "alg");
  const std::string digest = digestOf(algorithm);
  if (digest.empty()) return false;
  const std::string input = cString(three[0] + "." + three[1]);
  const std::string signature = lenientBase64url(cString(three[2]));
  if (algorithm[0] == 'H') return hmac(kSecret, input, digest) == signature;
  return verifyRsa(lenientBase64url(n), lenientBase64url(e), digest, input, signature);
}

bool isHonest(const std::string& token) {
  return isSigned(token, kModulus, kExponent);
}

namespace {

Json::CharReader* newReader() {
  Json::CharReaderBuilder builder;
  // What the other reader does not know.
  builder["skipBom"] = false;
  builder["allowTrailingCommas"] = false;
  return builder.newCharReader();
}

}  // namespace

bool readJson(const std::string& text, Json::Value& value) {
  static const std::unique_ptr<Json::CharReader> reader(newReader());
  try {
    return reader->parse(text.data(), text.data() + text.size(), &value, nullptr);
  } catch (const Json::Exception&) {
    return false;
  }
}

std::string textOf(const Json::Value& object, const char* name) {
  if (!object.isObject() || !object[name].isString()) return "";
  return object[name].asString();
}

std::string percentDecoded(const std::string& text) {
  std::string bytes;
  for (std::size_t i = 0; i < text.size(); ++i) {
    const bool escape = text[i] == '%' && i + 2 < text.size();
    bytes += escape ? static_cast<char>(std::stoi(text.substr(i + 1, 2), nullptr, 16)) : text[i];
    if (escape) i += 2;
  }
  return bytes;
}

bool isEscaped(const std::string& text) {
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (std::strchr("-._~", text[i]) != nullptr && text[i] != '\0') continue;
    if (kAlphabet.find(text[i]) != std::string::npos) continue;
    const auto isHex = [&](std::size_t at) {
      return at < text.size() && text[at] != '\0' && std::strchr("0123456789ABCDEF", text[at]);
    };
    if (text[i] != '%' || !isHex(i + 1) || !isHex(i + 2)) return false;
    i += 2;
  }
  return true;
}

std::string curlEscaped(const std::string& text) {
  if (text.empty()) return "";  // libcurl takes a length of 0 for "measure it yourself"
  const std::unique_ptr<char, Freed<curl_free>> escaped(
      curl_easy_escape(nullptr, text.data(), static_cast<int>(text.size())));
  return escaped.get();
}

std::string md5Hex(const std::string& text) {
  unsigned char digest[EVP_MAX_MD_SIZE];
  unsigned size = 0;
  require(EVP_Digest(text.data(), text.size(), digest, &size, EVP_md5(), nullptr) == 1, "no MD5");
  std::string hex;
  for (unsigned i = 0; i < size; ++i) {
    char two[3];
    std::snprintf(two, sizeof two, "%02x", digest[i]);
    hex += two;
  }
  return hex;
}

std::string cString(const std::string& text) {
  return text.c_str();
}

}  // namespace fuzz
