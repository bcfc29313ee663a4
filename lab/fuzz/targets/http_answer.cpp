// The bytes of a whole HTTP answer, read by libcurl itself: the library's transfer against a bare
// one with the same options.
#include <curl/curl.h>

#include <cstring>

#include "sso/common.h"
#include "sso/internal/http_body.h"
#include "sso/utils.h"
#include "support/target.h"
#include "support/transport.h"

namespace {

std::size_t collect(char* data, std::size_t size, std::size_t count, void* userData) {
  static_cast<std::string*>(userData)->append(data, strnlen(data, size * count));
  return size * count;
}

std::string bare(const char* url, std::string* body) {
  CURL* const handle = curl_easy_init();
  curl_easy_setopt(handle, CURLOPT_URL, url);
  curl_easy_setopt(handle, CURLOPT_WRITEFUNCTION, collect);
  curl_easy_setopt(handle, CURLOPT_WRITEDATA, body);
  const CURLcode result = curl_easy_perform(handle);
  curl_easy_cleanup(handle);
  return result == CURLE_OK ? "" : curl_easy_strerror(result);
}

}  // namespace

FUZZ_TARGET(http_answer) {
  fuzz::transport().real = true;
  fuzz::transport().wire = input;
  std::string response;
  std::string failure;
  try {
    QOVA::SSO::httpGet("http://127.0.0.1/", response, true, QOVA::SSO::WriteToStringCallback);
  } catch (const QOVA::SSO::sso_err_resp& e) {
    failure = e.what();
  }
  std::string expected;
  fuzz::require(bare("http://127.0.0.1/", &expected) == failure, "another result");
  fuzz::require(expected == response, "another body");
  return failure.empty() && !response.empty();
}
