// MD5 is deprecated in OpenSSL 3, and is what the state carries.
#define OPENSSL_API_COMPAT 0x10100000L

#include "sso/utils.h"

#include <openssl/md5.h>
#include <syslog.h>

#include <new>

#include "sso/internal/encoding.h"
#include "sso/internal/libcurl.h"
#include "sso/internal/owned.h"

namespace QOVA {
namespace SSO {

namespace {

constexpr char kUnit[] = "utils.cpp";

using WriteFunction = unsigned (*)(void* data, unsigned size, unsigned count, void* userData);

// libcurl's state, set up and torn down around every transfer.
class CurlState {
 public:
  explicit CurlState(const Curl& library) : curl(library) { curl.global_init(CURL_GLOBAL_ALL); }
  ~CurlState() { curl.global_cleanup(); }
  CurlState(const CurlState&) = delete;
  CurlState& operator=(const CurlState&) = delete;

 private:
  const Curl& curl;
};

// libcurl's type has size_t where ours has unsigned. It passes at most its own buffer's size, and
// the calling conventions of the supported targets carry values below 2^32 alike in both types.
curl_write_callback CurlFunction(WriteFunction writeFn) {
  return reinterpret_cast<curl_write_callback>(reinterpret_cast<void (*)()>(writeFn));
}

// A POST of `body`, or a GET if it is null.
void Transfer(const std::string& url, const std::string* body, std::string& response,
              bool verifySSL, WriteFunction writeFn) {
  const Curl& curl = LoadCurl();
  const CurlState state(curl);
  const std::unique_ptr<CURL, decltype(curl.easy_cleanup)> owner(curl.easy_init(),
                                                                 curl.easy_cleanup);
  CURL* const handle = owner.get();
  if (handle == nullptr) throw std::bad_alloc();

  curl.easy_setopt(handle, CURLOPT_URL, url.c_str());
  if (body != nullptr) curl.easy_setopt(handle, CURLOPT_POSTFIELDS, body->c_str());
  curl.easy_setopt(handle, CURLOPT_WRITEFUNCTION, CurlFunction(writeFn));
  curl.easy_setopt(handle, CURLOPT_WRITEDATA, &response);
  if (!verifySSL) {
    curl.easy_setopt(handle, CURLOPT_SSL_VERIFYHOST, 0L);
    curl.easy_setopt(handle, CURLOPT_SSL_VERIFYPEER, 0L);
  }

  const CURLcode result = curl.easy_perform(handle);
  if (result != CURLE_OK) throw sso_err_resp(curl.easy_strerror(result));
}

}  // namespace

void httpGet(const std::string& url, std::string& response, bool verifySSL,
             unsigned (*writeFn)(void* data, unsigned size, unsigned count, void* userData)) {
  Transfer(url, nullptr, response, verifySSL, writeFn);
}

void httpPost(const std::string& url, const std::string& body, std::string& response,
              bool verifySSL,
              unsigned (*writeFn)(void* data, unsigned size, unsigned count, void* userData)) {
  Transfer(url, &body, response, verifySSL, writeFn);
}

std::string URLEncode(const std::string& text) {
  std::string encoded;
  AppendURLEncoded(text, encoded);
  return encoded;
}

std::string MD5Digest(std::string text) {
  std::string result;
  unsigned char digest[MD5_DIGEST_LENGTH];
  if (MD5(reinterpret_cast<const unsigned char*>(text.data()), text.size(), digest) == nullptr) {
    __extension__ syslog(LOG_ERR, "%s:%d MD5 digest failed %m", kUnit, __LINE__);
    return result;
  }
  const CText hex(static_cast<char*>(std::calloc(2 * sizeof digest + 1, 1)));
  if (hex == nullptr) {
    __extension__ syslog(LOG_ERR, "%s:%d calloc failed. %m", kUnit, __LINE__);
    return result;
  }
  char* out = hex.get();
  for (const unsigned char byte : digest) {
    *out++ = "0123456789abcdef"[byte >> 4];
    *out++ = "0123456789abcdef"[byte & 15];
  }
  result = hex.get();
  return result;
}

}  // namespace SSO
}  // namespace QOVA
