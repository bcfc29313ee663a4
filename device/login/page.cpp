#include "page.h"

#include <json/reader.h>
#include <json/value.h>

#include <algorithm>
#include <cctype>
#include <cstdlib>
#include <memory>
#include <stdexcept>

#include "cgi.h"
#include "texts.h"

namespace page {
namespace {

constexpr char kEnglish[] = "en";
constexpr size_t kLongestList = 200;  // of languages; nobody speaks more

// Without 0, 1, I, L, O and U; a reference number has eight of them.
constexpr char kReference[] = "23456789ABCDEFGHJKMNPQRSTVWXYZ";

Json::Value ReadTexts() {
  const std::string script = kTexts;
  const char* begin = script.data() + script.find('{');
  const char* end = script.data() + script.rfind('}') + 1;
  const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
  Json::Value root;
  if (!reader->parse(begin, end, &root, nullptr)) throw std::logic_error("texts.js is not JSON");
  return root;
}

const Json::Value& Texts() {
  static const Json::Value texts = ReadTexts();
  return texts;
}

std::string Trim(const std::string& text) {
  const size_t begin = text.find_first_not_of(" \t");
  return begin == std::string::npos ? ""
                                    : text.substr(begin, text.find_last_not_of(" \t") - begin + 1);
}

// The first part of a language tag, in lower case: "de" of "de-AT".
std::string Primary(const std::string& range) {
  std::string tag = Trim(range.substr(0, range.find_first_of("-;")));
  std::transform(tag.begin(), tag.end(), tag.begin(),
                 [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  return tag;
}

// The weight of an entry of Accept-Language, 1 if it has none.
double Weight(const std::string& range) {
  const size_t weight = range.find("q=");
  return weight == std::string::npos ? 1 : std::strtod(range.c_str() + weight + 2, nullptr);
}

// The best of the languages that there are texts for (RFC 9110, section 12.5.4).
std::string Choose(const std::string& accepted) {
  std::string best = kEnglish;
  double weight = 0;
  const std::string list = accepted.substr(0, kLongestList) + ",";
  for (size_t begin = 0, end; (end = list.find(',', begin)) != std::string::npos; begin = end + 1) {
    const std::string range = list.substr(begin, end - begin);
    const std::string tag = Primary(range);
    if (tag.empty() || !Texts().isMember(tag) || Weight(range) <= weight) continue;
    best = tag;
    weight = Weight(range);
  }
  return best;
}

}  // namespace

Words::Words(const std::string& accepted_languages) : language_(Choose(accepted_languages)) {}

std::string Words::Get(const std::string& text, const std::string& name,
                       const std::string& value) const {
  std::string words = cgi::EscapeHTML(Texts()[language_][text].asString());
  const std::string part = "{" + name + "}";
  const size_t at = name.empty() ? std::string::npos : words.find(part);
  return at == std::string::npos ? words : words.replace(at, part.size(), value);
}

std::pair<std::string, std::string> Words::Failure(const std::string& code) const {
  const Json::Value& words = Texts()[language_];
  const Json::Value& known = words["failures"];
  const Json::Value& failure = known.isMember(code) ? known[code] : words["general"];
  return {cgi::EscapeHTML(failure[0].asString()), cgi::EscapeHTML(failure[1].asString())};
}

Outcome ReadOutcome(const std::string& text) {
  const size_t dot = text.find('.');
  if (dot == std::string::npos) return {};
  const Outcome outcome{text.substr(0, dot), text.substr(dot + 1)};
  const bool good =
      outcome.code.find_first_not_of("abcdefghijklmnopqrstuvwxyz-") == std::string::npos &&
      outcome.reference.size() == 8 &&
      outcome.reference.find_first_not_of(kReference) == std::string::npos;
  return good ? outcome : Outcome();
}

std::string Frame(const Words& words, const std::string& title, const std::string& body) {
  return "<!DOCTYPE html>\n<html lang=\"" + words.language() + "\" dir=\"" +
         words.Get("direction") +
         "\">\n<head>\n<meta charset=\"utf-8\">\n"
         "<meta name=\"viewport\" content=\"width=device-width, initial-scale=1\">\n<title>" +
         title +
         "</title>\n<link rel=\"icon\" href=\"/webman/ssoclient/logo.svg\">\n"
         "<link rel=\"stylesheet\" href=\"/webman/ssoclient/relay.css\">\n</head>\n<body>\n"
         "<div class=\"card\">\n<header class=\"brand\">"
         "<img src=\"/webman/ssoclient/logo.svg\" alt=\"\"> <span>" +
         words.Get("device") + "</span></header>\n<main>\n" + body +
         "</main>\n</div>\n</body>\n</html>\n";
}

std::string SigningIn(const std::string& url, const std::string& languages) {
  const Words words(languages);
  return Frame(words, words.Get("waiting"),
               "<div class=\"progress\"></div>\n<h1>" + words.Get("waiting") +
                   "</h1>\n<p role=\"status\">" + words.Get("waiting-text") +
                   "</p>\n<p class=\"note\"><a id=\"onward\" href=\"" + cgi::EscapeHTML(url) +
                   "\">" + words.Get("waiting-link") + "</a></p>\n");
}

}  // namespace page
