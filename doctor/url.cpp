#include "doctor/url.h"

#include <curl/curl.h>

#include <map>
#include <memory>
#include <regex>

#include "doctor/text.h"

namespace doctor {

namespace {

std::string Part(CURLU* url, CURLUPart part) {
  char* text = nullptr;
  if (curl_url_get(url, part, &text, CURLU_DEFAULT_PORT) != CURLUE_OK) return "";
  const std::unique_ptr<char, decltype(&curl_free)> owner(text, curl_free);
  return text;
}

std::string RoleOf(const std::string& last) {
  static const std::map<std::string, std::string> roles = {{"authorize", "authorization_endpoint"},
                                                           {"token", "token_endpoint"},
                                                           {"logout", "logout_endpoint"},
                                                           {"end_session", "logout_endpoint"},
                                                           {"openid-configuration", "wellknown"},
                                                           {"keys", "other"},
                                                           {"jwk", "other"},
                                                           {"introspect", "other"},
                                                           {"userinfo", "other"},
                                                           {"revoke", "other"},
                                                           {"devicecode", "other"}};
  const auto role = roles.find(last);
  return role == roles.end() ? "" : role->second;
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
  host_part = LowerCase(Part(parsed, CURLUPART_HOST));
  port_part = Part(parsed, CURLUPART_PORT);
  path_part = Part(parsed, CURLUPART_PATH);
  password_part = Part(parsed, CURLUPART_PASSWORD);
  query = url.find('?') != std::string::npos;
  fragment = url.find('#') != std::string::npos;
}

Shape ShapeOf(const std::string& url) {
  static const std::regex entra(
      "/([^/]+)/(?:oauth2/(v2\\.0/)?(?:authorize|token|logout|devicecode)|"
      "(v2\\.0/)?\\.well-known/openid-configuration|discovery/(v2\\.0/)?keys)",
      std::regex::icase);
  const std::string path = ParsedUrl(url).path();
  Shape shape;
  const size_t end = path.find_last_not_of('/');
  if (end == std::string::npos) return shape;
  shape.role = RoleOf(LowerCase(path.substr(path.rfind('/', end) + 1, end - path.rfind('/', end))));
  std::smatch match;
  if (!std::regex_match(path, match, entra)) return shape;
  shape.tenant = LowerCase(match[1].str());
  shape.version = match[2].matched || match[3].matched || match[4].matched ? 2 : 1;
  return shape;
}

bool IsSameEndpoint(const std::string& one, const std::string& other) {
  if (one == other) return true;
  const ParsedUrl first(one);
  const ParsedUrl second(other);
  if (!first.valid() || !second.valid() || first.origin() != second.origin()) return false;
  const Shape shape = ShapeOf(one);
  return first.path() == second.path() ||
         (!shape.tenant.empty() && !ShapeOf(other).tenant.empty() &&
          shape.role == ShapeOf(other).role);
}

}  // namespace doctor
