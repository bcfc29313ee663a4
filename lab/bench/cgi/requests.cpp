// The three requests of a login with libcurl alone: what the answers are does not matter.
//   cgi_requests TOKEN_URL DISCOVERY_URL KEYS_URL
#include <curl/curl.h>

#include <cstdio>
#include <string>

namespace {

size_t append(char* data, size_t size, size_t count, void* response) {
  static_cast<std::string*>(response)->append(data, size * count);
  return size * count;
}

bool request(const char* url, const char* body) {
  std::string response;
  curl_global_init(CURL_GLOBAL_ALL);
  CURL* const handle = curl_easy_init();
  curl_easy_setopt(handle, CURLOPT_URL, url);
  if (body != nullptr) curl_easy_setopt(handle, CURLOPT_POSTFIELDS, body);
  curl_easy_setopt(handle, CURLOPT_WRITEFUNCTION, append);
  curl_easy_setopt(handle, CURLOPT_WRITEDATA, &response);
  const CURLcode result = curl_easy_perform(handle);
  if (result != CURLE_OK) std::fprintf(stderr, "%s: %s\n", url, curl_easy_strerror(result));
  curl_easy_cleanup(handle);
  curl_global_cleanup();
  return result == CURLE_OK && !response.empty();
}

}  // namespace

int main(int count, char** arguments) {
  const bool good = count == 4 &&
                    request(arguments[1],
                            "client_id=00000003-0000-0000-c000-000000000000&client_secret=secret"
                            "&code=0.AXoAcode&grant_type=authorization_code"
                            "&redirect_uri=https%3A%2F%2Fdevice.example.net%2Flogin.cgi") &&
                    request(arguments[2], nullptr) && request(arguments[3], nullptr);
  return good ? 0 : 1;
}
