#include "doctor/answer.h"

#include <regex>

#include "doctor/explain.h"
#include "doctor/json.h"
#include "doctor/redact.h"
#include "doctor/text.h"
#include "doctor/url.h"

namespace doctor {

namespace {

constexpr size_t kMostRead = 16384;  // of a page: refusals are short

// Who answers instead of a provider. Their pages differ; these words are on most of them.
struct Kind {
  const char* id;
  const char* who;
  const char* words;
  const char* action;
};

constexpr Kind kKinds[] = {
    {"proxy-failed", "A proxy",
     "squid|proxy (error|server|authentication)|(via|by|the|this|your) proxy|proxy:|tinyproxy|"
     "privoxy|cache access denied|\\bERR_[A-Z]+_[A-Z_]+|x-squid-",
     "Let the proxy pass requests to the host on, or set no_proxy to it for the login program."},
    {"network-blocked", "A firewall or web filter",
     "firewall|web ?filter|(url|content|internet|web) filter|forti(gate|guard|net)|zscaler|"
     "blue ?coat|forcepoint|websense|sophos|palo alto|barracuda|netskope|umbrella|check point|"
     "(page|site|access|request|url|category|connection) (is |was |has been |have been )?"
     "(blocked|restricted|forbidden by|denied by)|blocked by|(security|usage|network) policy",
     "Allow the device to reach the host in the firewall or web filter."},
    {"captive-portal", "A captive portal",
     "captive|hot ?spot|wi-?fi|guest (network|access|internet)|"
     "(network|internet) (log ?in|sign[ -]?in|access|authentication)|(log|sign) ?in to (the|this) "
     "network|walled garden|accept the (terms|conditions)",
     "Let the network's operator admit the device without the portal."}};

bool LooksLikePage(const WebAnswer& answer) {
  const size_t first = answer.body.find_first_not_of(" \t\r\n\xEF\xBB\xBF");
  return LowerCase(answer.type).find("html") != std::string::npos ||
         (first != std::string::npos && answer.body[first] == '<');
}

std::string Title(const WebAnswer& answer) {
  const std::string low = LowerCase(answer.body.substr(0, kMostRead));
  const size_t open = low.find("<title");
  const size_t begin = open == std::string::npos ? open : low.find('>', open);
  const size_t end = begin == std::string::npos ? begin : low.find("</title", begin);
  if (end == std::string::npos) return "";
  const std::string title = answer.body.substr(begin + 1, end - begin - 1);
  return Shown(std::regex_replace(title, std::regex("\\s+"), " "), 80);
}

Finding Found(const Kind& kind, const WebAnswer& answer, const std::string& url) {
  std::string action = kind.action;
  const size_t host = action.find("the host");
  if (host != std::string::npos) action.replace(host, 8, Shown(ParsedUrl(url).host(), 100));
  return {kind.id,
          Grade::kFailure,
          std::string(kind.who) + " answers instead of the provider (" + Describe(answer) + ")",
          {},
          action};
}

// A code that the table does not have: the providers' own lists have it.
Refusal Unlisted(const std::string& text) {
  static const std::regex codes("AADSTS([0-9]{4,8})\\b|CWOAU[0-9]{4}[EWA]|CWWKS[0-9]{4}[EWA]");
  std::smatch match;
  if (!std::regex_search(text, match, codes)) return {};
  const std::string code = match[0].str();
  return {code, "The provider refuses the request with " + code,
          match[1].matched ? "See https://login.microsoftonline.com/error?code=" + match[1].str()
                           : "See the message in the documentation of WebSphere Liberty."};
}

}  // namespace

bool IsRedirect(const WebAnswer& answer) {
  return answer.status >= 300 && answer.status < 400;
}

std::string Describe(const WebAnswer& answer) {
  std::string text = "HTTP " + std::to_string(answer.status);
  if (!answer.type.empty()) text += ", " + Shown(answer.type, 60);
  if (IsRedirect(answer) && !answer.location.empty()) text += ", to " + Shown(answer.location, 200);
  const std::string title = Title(answer);
  return title.empty() ? text : text + ", " + Quote(title);
}

std::string ErrorOf(const Json::Value& document) {
  const std::string more = StringOf(document, "error_description");
  return Quote(Shown(StringOf(document, "error"), 60)) +
         (more.empty() ? "" : " (" + Shown(more, 200) + ")");
}

Refusal RefusalIn(const std::string& whole) {
  const std::string text = whole.substr(0, kMostRead);
  for (const Code* const code : CodesOf(text)) {
    // Entra ID writes this one into pages of browsers without a session. A summary is followed by
    // the code that counts.
    const std::string name = code->name;
    if (name == "AADSTS50058" || (name == "AADSTS70002" && CodesOf(text).size() > 1)) continue;
    const bool plain = code->source == CodeSource::kOAuth;
    if (plain && !Unlisted(text).code.empty()) break;
    std::string meaning = code->meaning;
    meaning.pop_back();
    return {name, meaning, code->action, code->secret == SecretVerdict::kRefused, plain};
  }
  return Unlisted(text);
}

Finding Stranger(const WebAnswer& answer, const std::string& url) {
  if (answer.status == 511) return Found(kKinds[2], answer, url);
  if (answer.status == 407) return Found(kKinds[0], answer, url);
  if (!LooksLikePage(answer) && !(IsRedirect(answer) && answer.body.empty())) return {};
  if (!RefusalIn(answer.body).code.empty()) return {};  // the provider's own page
  const bool away =
      IsRedirect(answer) && ParsedUrl(answer.location).host() != ParsedUrl(url).host();
  // An encrypted request that is answered with an unencrypted page elsewhere.
  if (away && ParsedUrl(answer.location).scheme() == "http") return Found(kKinds[2], answer, url);
  const std::string text =
      answer.via + " " + (away ? answer.location : "") + " " + answer.body.substr(0, kMostRead);
  for (const Kind& kind : kKinds) {
    if (std::regex_search(text, std::regex(kind.words, std::regex::icase))) {
      return Found(kind, answer, url);
    }
  }
  return {};
}

}  // namespace doctor
