// The same work hand-written on the same libraries: the steps that have to be made, in order,
// and nothing between them. No check of what cannot fail here, no exception, no log line.
#define OPENSSL_API_COMPAT 0x10100000L

#include <curl/curl.h>
#include <fcntl.h>
#include <json/reader.h>
#include <json/writer.h>
#include <openssl/bio.h>
#include <openssl/bn.h>
#include <openssl/evp.h>
#include <openssl/hmac.h>
#include <openssl/md5.h>
#include <openssl/rsa.h>
#include <unistd.h>

#include <algorithm>
#include <boost/random/mersenne_twister.hpp>
#include <boost/uuid/random_generator.hpp>
#include <boost/uuid/uuid_io.hpp>
#include <cctype>
#include <cstring>
#include <ctime>
#include <string>

#include "platform/platform.h"
#include "work.h"

#pragma GCC diagnostic ignored \
    "-Wdeprecated-declarations"  // the reader and writer that are asked for

namespace {

using bench::Material;
using bench::Operation;

struct Bytes {
  unsigned char* data;
  int size;
};

// A base64url text through OpenSSL's filter, into memory of malloc.
Bytes decode(const char* text, size_t length) {
  char* const copy = static_cast<char*>(std::malloc(length + 4));
  for (size_t i = 0; i < length; ++i) {
    copy[i] = text[i] == '-' ? '+' : text[i] == '_' ? '/' : text[i];
  }
  size_t padded = length;
  while (padded % 4 != 0) copy[padded++] = '=';
  BIO* const memory = BIO_new_mem_buf(copy, static_cast<int>(padded));
  BIO* const filter = BIO_new(BIO_f_base64());
  BIO_set_flags(filter, BIO_FLAGS_BASE64_NO_NL);
  BIO_push(filter, memory);
  const int pending = static_cast<int>(BIO_pending(filter));
  unsigned char* const bytes =
      static_cast<unsigned char*>(std::malloc(static_cast<size_t>(pending) + 1));
  const int size = BIO_read(filter, bytes, pending);
  bytes[size] = 0;
  BIO_free_all(filter);
  std::free(copy);
  return {bytes, size};
}

// Where a token is divided.
struct Token {
  explicit Token(const std::string& text)
      : begin(text.data()),
        end(begin + text.size()),
        body(static_cast<const char*>(std::memchr(begin, '.', text.size())) + 1),
        signature(
            static_cast<const char*>(std::memchr(body, '.', static_cast<size_t>(end - body))) + 1) {
  }
  size_t signedSize() const { return static_cast<size_t>(signature - 1 - begin); }
  size_t signatureSize() const { return static_cast<size_t>(end - signature); }

  const char* begin;
  const char* end;
  const char* body;
  const char* signature;
};

bool verifyRsa(const Token& token, const char* n, size_t n_size, const char* e, size_t e_size,
               const EVP_MD* md) {
  const Bytes modulus = decode(n, n_size);
  const Bytes exponent = decode(e, e_size);
  const Bytes signature = decode(token.signature, token.signatureSize());
  RSA* const rsa = RSA_new();
  RSA_set0_key(rsa, BN_bin2bn(modulus.data, modulus.size, nullptr),
               BN_bin2bn(exponent.data, exponent.size, nullptr), nullptr);
  EVP_PKEY* const key = EVP_PKEY_new();
  EVP_PKEY_assign(key, EVP_PKEY_RSA, rsa);
  EVP_MD_CTX* const context = EVP_MD_CTX_new();
  EVP_DigestVerifyInit(context, nullptr, md, nullptr, key);
  EVP_DigestUpdate(context, token.begin, token.signedSize());
  const bool good =
      EVP_DigestVerifyFinal(context, signature.data, static_cast<size_t>(signature.size)) == 1;
  EVP_MD_CTX_free(context);
  EVP_PKEY_free(key);
  std::free(modulus.data);
  std::free(exponent.data);
  std::free(signature.data);
  return good;
}

auto rsa(const std::string& name, bench::Digest digest) {
  return [=](const Material& material) -> Operation {
    return [text = material[name], n = material["n"], e = material["e"], digest] {
      const std::string copy = text;
      bench::require(verifyRsa(Token(copy), n.data(), n.size(), e.data(), e.size(), digest()),
                     "RSA");
    };
  };
}

bool verifyHmac(const Token& token, const std::string& key_text, const EVP_MD* md) {
  const Bytes key = decode(key_text.data(), key_text.size());
  BIO* const memory = BIO_new(BIO_s_mem());
  BIO* const filter = BIO_new(BIO_f_base64());
  BIO_set_flags(filter, BIO_FLAGS_BASE64_NO_NL);
  BIO_push(filter, memory);
  unsigned char mac[64];
  unsigned size = 0;
  HMAC(md, key.data, key.size, reinterpret_cast<const unsigned char*>(token.begin),
       token.signedSize(), mac, &size);
  BIO_write(filter, mac, static_cast<int>(size));
  (void)BIO_flush(filter);
  const int pending = static_cast<int>(BIO_pending(memory));
  char* const text = static_cast<char*>(std::malloc(static_cast<size_t>(pending) + 1));
  const int read = BIO_read(memory, text, pending);
  char* out = text;
  for (int i = 0; i < read; ++i) {
    if (text[i] != '=') *out++ = text[i] == '/' ? '_' : text[i] == '+' ? '-' : text[i];
  }
  *out = '\0';
  const bool good = std::strcmp(text, token.signature) == 0;
  std::free(text);
  BIO_free_all(filter);
  std::free(key.data);
  return good;
}

auto hmac(const std::string& name, bench::Digest digest) {
  return [=](const Material& material) -> Operation {
    return [text = material[name], key = bench::encodedSecret(material), digest] {
      const std::string copy = text;
      bench::require(verifyHmac(Token(copy), key, digest()), "HMAC");
    };
  };
}

Json::Value parseText(const char* text, size_t size) {
  Json::Value value;
  Json::Reader().parse(text, text + size, value, true);
  return value;
}

Json::Value parseSegment(const char* begin, const char* end) {
  const Bytes bytes = decode(begin, static_cast<size_t>(end - begin));
  Json::Value value =
      parseText(reinterpret_cast<char*>(bytes.data), static_cast<size_t>(bytes.size));
  std::free(bytes.data);
  return value;
}

auto parse(const std::string& name) {
  return [=](const Material& material) -> Operation {
    return [text = material[name]] {
      const std::string copy = text;
      const Token token(copy);
      const Json::Value header = parseSegment(token.begin, token.body - 1);
      const Json::Value body = parseSegment(token.body, token.signature - 1);
      bench::require(header.isObject() && body.isObject(), "parse");
    };
  };
}

// From the token to its claims, signature checked.
auto check(const std::string& name, bench::Digest digest) {
  return [=](const Material& material) -> Operation {
    return [text = material[name], n = material["n"], e = material["e"], digest] {
      const std::string copy = text;
      const Token token(copy);
      const Json::Value header = parseSegment(token.begin, token.body - 1);
      const Json::Value body = parseSegment(token.body, token.signature - 1);
      bench::require(header.isObject() && body.isObject() &&
                         verifyRsa(token, n.data(), n.size(), e.data(), e.size(), digest()),
                     "check");
    };
  };
}

auto checkHmac(const std::string& name, bench::Digest digest) {
  return [=](const Material& material) -> Operation {
    return [text = material[name], key = bench::encodedSecret(material), digest] {
      const std::string copy = text;
      const Token token(copy);
      const Json::Value header = parseSegment(token.begin, token.body - 1);
      const Json::Value body = parseSegment(token.body, token.signature - 1);
      bench::require(header.isObject() && body.isObject() && verifyHmac(token, key, digest()),
                     "check");
    };
  };
}

struct Seed {
  template <typename Word>
  void generate(Word* begin, Word* end) const {
    const int file = open("/dev/urandom", O_RDONLY | O_CLOEXEC);
    const size_t size = static_cast<size_t>(end - begin) * sizeof *begin;
    bench::require(read(file, begin, size) == static_cast<ssize_t>(size), "urandom");
    close(file);
  }
};

void hexDigest(const std::string& text, char (&hex)[33]) {
  unsigned char digest[MD5_DIGEST_LENGTH];
  MD5(reinterpret_cast<const unsigned char*>(text.data()), text.size(), digest);
  for (int i = 0; i < MD5_DIGEST_LENGTH; ++i) {
    hex[2 * i] = "0123456789abcdef"[digest[i] >> 4];
    hex[2 * i + 1] = "0123456789abcdef"[digest[i] & 15];
  }
  hex[32] = '\0';
}

void appendEncoded(std::string& url, const char* name, const char* text, size_t size) {
  char* const encoded = static_cast<char*>(std::calloc(3 * size + 1, 1));
  QOVACGIURLEncode(text, encoded, 3 * size);
  url.append(name).append(encoded);
  std::free(encoded);
}

struct Settings {
  std::string endpoint;
  std::string client;
  std::string redirect;
};

std::string makeUrl(const Settings& settings, const Json::Value& parameters) {
  Seed seed;
  boost::mt19937 engine(seed);
  const std::string nonce =
      to_string(boost::uuids::basic_random_generator<boost::mt19937>(engine)());
  char hex[33];
  hexDigest(nonce, hex);
  Json::Value object = parameters;
  object["nonce"] = hex;
  const std::string text = Json::FastWriter().write(object);
  char state[1024] = {};
  QOVABase64Encode(text.data(), text.size(), state, sizeof state, 1);
  std::string url = settings.endpoint;
  appendEncoded(url, "?client_id=", settings.client.c_str(), settings.client.size());
  appendEncoded(url, "&nonce=", nonce.c_str(), nonce.size());
  appendEncoded(url, "&redirect_uri=", settings.redirect.c_str(), settings.redirect.size());
  appendEncoded(url, "&response_type=", "code", 4);
  appendEncoded(url, "&scope=", "openid", 6);
  appendEncoded(url, "&state=", state, std::strlen(state));
  return url;
}

Operation url(const Material&) {
  const std::string text = bench::contents("/usr/qova/etc/ssoclient/azure.conf");
  const Json::Value file = parseText(text.data(), text.size());
  const Settings settings = {file["azure_authorization_endpoint"].asString(),
                             file["azure_client_id"].asString(),
                             file["azure_redirect_uri"].asString()};
  Json::Value parameters;
  parameters["origin"] = "https://device.example.net/webman/index.cgi";
  return [settings, parameters] {
    bench::require(makeUrl(settings, parameters).size() > 300, "no URL: no settings?");
  };
}

Operation md5(const Material&) {
  return [text = std::string("01234567-89ab-4cde-8f01-23456789abcd")] {
    unsigned char digest[MD5_DIGEST_LENGTH];
    MD5(reinterpret_cast<const unsigned char*>(text.data()), text.size(), digest);
    bench::require(digest[0] + digest[15] > 0, "MD5");
  };
}

Operation urlEncode(const Material&) {
  return [text = std::string("https://device.example.net/webman/login.cgi?state=1&x=a b")] {
    std::string encoded;
    appendEncoded(encoded, "", text.c_str(), text.size());
    bench::require(encoded.size() > text.size(), "URLEncode");
  };
}

size_t append(char* data, size_t size, size_t count, void* response) {
  static_cast<std::string*>(response)->append(data, size * count);
  return size * count;
}

// A GET, or a POST of `body`.
std::string request(const std::string& address, const char* body = nullptr) {
  std::string response;
  curl_global_init(CURL_GLOBAL_ALL);
  CURL* const handle = curl_easy_init();
  curl_easy_setopt(handle, CURLOPT_URL, address.c_str());
  if (body != nullptr) curl_easy_setopt(handle, CURLOPT_POSTFIELDS, body);
  curl_easy_setopt(handle, CURLOPT_WRITEFUNCTION, append);
  curl_easy_setopt(handle, CURLOPT_WRITEDATA, &response);
  bench::require(curl_easy_perform(handle) == CURLE_OK, "transfer");
  curl_easy_cleanup(handle);
  curl_global_cleanup();
  return response;
}

auto answer(const std::string& name) {
  return [=](const Material& material) -> Operation {
    return [address = material.url(name)] {
      bench::require(!request(address, "code=x").empty(), "no answer");
    };
  };
}

Json::Value getJson(const std::string& address) {
  const std::string text = request(address);
  return parseText(text.data(), text.size());
}

const Json::Value& findKey(const Json::Value& keys, const std::string& kid) {
  for (const Json::Value& key : keys["keys"]) {
    const char* begin = nullptr;
    const char* end = nullptr;
    key["kid"].getString(&begin, &end);
    if (kid.compare(0, kid.npos, begin, static_cast<size_t>(end - begin)) == 0) return key;
  }
  return Json::Value::nullSingleton();
}

std::string userName(const Json::Value& claims) {
  const std::string name = claims["unique_name"].asString();
  const size_t at = name.find('@');
  std::string user = name.substr(at + 1);
  for (char& c : user) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  user.append(1, '\\').append(name, 0, at);
  char netbios[1024] = {};
  QOVAWinsUserNameFqdn2Netbios(user.c_str(), netbios, sizeof netbios - 1);
  return netbios;
}

// From token response to user name.
std::string login(const std::string& response, const std::string& wellknown,
                  const Json::Value& settings) {
  const std::string text = parseText(response.data(), response.size())["id_token"].asString();
  const Token token(text);
  const Json::Value header = parseSegment(token.begin, token.body - 1);
  const Json::Value claims = parseSegment(token.body, token.signature - 1);
  bench::require(claims["exp"].asInt64() > time(nullptr) &&
                     claims["tid"] == settings["azure_tenant_id"] &&
                     claims["aud"] == settings["azure_client_id"],
                 "claims");
  const Json::Value keys = getJson(getJson(wellknown)["jwks_uri"].asString());
  const Json::Value& key = findKey(keys, header["kid"].asString());
  const std::string n = key["n"].asString();
  const std::string e = key["e"].asString();
  bench::require(header["alg"] == "RS256" &&
                     verifyRsa(token, n.data(), n.size(), e.data(), e.size(), EVP_sha256()),
                 "signature");
  return userName(claims);
}

auto loginWith(const std::string& keys) {
  return [=](const Material& material) -> Operation {
    const std::string text = bench::contents("/usr/qova/etc/ssoclient/azure.conf");
    return [response = R"({"id_token":")" + material["rs256"] + R"("})",
            settings = parseText(text.data(), text.size()),
            wellknown = material.url("discovery-" + keys)] {
      bench::require(login(response, wellknown, settings) == "DEVICE.EXAMPLE.NET\\user", "user");
    };
  };
}

// jsoncpp's parse of a key set alone.
auto parseKeys(const std::string& keys) {
  return [=](const Material& material) -> Operation {
    return [text = material["keys-" + keys]] {
      bench::require(parseText(text.data(), text.size()).isObject(), "key set");
    };
  };
}

}  // namespace

int main(int count, char** arguments) {
  bench::Makers makers =
      bench::makersOf({rsa, hmac, check, checkHmac, parse, loginWith, answer, url, urlEncode, md5});
  for (const int keys : bench::kKeyCounts) {
    makers["parse-keys-" + std::to_string(keys)] = parseKeys(std::to_string(keys));
  }
  return bench::run(count, arguments, makers);
}
