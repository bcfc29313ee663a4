#include "doctor/url.h"

#include <curl/curl.h>

#include <memory>

namespace doctor {

namespace {

std::string Part(CURLU* url, CURLUPart part) {
  char* text = nullptr;
  if (curl_url_get(url, part, &text, 0) != CURLUE_OK) return "";
  const std::unique_ptr<char, decltype(&curl_free)> owner(text, curl_free);
  return text;
}

}  // namespace

ParsedUrl::ParsedUrl(const std::string& url) {
  const std::unique_ptr<CURLU, decltype(&curl_url_cleanup)> owner(curl_url(), curl_url_cleanup);
  CURLU* const parsed = owner.get();
  // As a transfer does: a scheme is guessed where there is none.
  constexpr unsigned kRules = CURLU_GUESS_SCHEME | CURLU_NON_SUPPORT_SCHEME;
  is_valid =
      parsed != nullptr && curl_url_set(parsed, CURLUPART_URL, url.c_str(), kRules) == CURLUE_OK;
  if (!is_valid) return;
  scheme_part = Part(parsed, CURLUPART_SCHEME);
  host_part = Part(parsed, CURLUPART_HOST);
  password_part = Part(parsed, CURLUPART_PASSWORD);
  query = url.find('?') != std::string::npos;
  fragment = url.find('#') != std::string::npos;
}

}  // namespace doctor
