#include "doctor/explain.h"

#include <algorithm>
#include <cctype>
#include <cstring>
#include <iostream>
#include <map>
#include <regex>
#include <set>

#include "doctor/codes.h"
#include "doctor/json.h"
#include "doctor/messages.h"
#include "doctor/paste.h"
#include "doctor/terminal.h"

namespace doctor {

namespace {

constexpr size_t kLongestText = 64 * 1024;
constexpr char kNothing[] = "No known code or message was recognised";

bool IsDigit(char c) {
  return std::isdigit(static_cast<unsigned char>(c)) != 0;
}

bool IsWord(char c) {
  return std::isalnum(static_cast<unsigned char>(c)) != 0 || c == '_' || c == '-';
}

// The place behind a line break, and the blanks after it, at `at`; `at` if there is none.
size_t BehindBreak(const std::string& text, size_t at) {
  size_t end = at;
  while (end < text.size() && (text[end] == '\n' || text[end] == '\r')) ++end;
  if (end == at) return at;
  while (end < text.size() && (text[end] == ' ' || text[end] == '\t')) ++end;
  return end;
}

// The place behind `word` in any case of letters, which a line break may interrupt; npos if it is
// not there.
size_t Behind(const std::string& text, size_t at, const std::string& word) {
  for (size_t i = 0; i < word.size(); ++i) {
    if (i > 0) at = BehindBreak(text, at);
    if (at >= text.size() || std::toupper(static_cast<unsigned char>(text[at])) != word[i])
      return std::string::npos;
    ++at;
  }
  return at;
}

// "AADSTS" and the number at `at`. A number is only taken across a line break if it is no code
// before the break, or if the description follows behind it.
const Code* EntraCode(const std::string& text, size_t at) {
  const Code* found = nullptr;
  std::string name = "AADSTS";
  if (at < text.size() && text[at] == ' ') ++at;
  for (int lines = 0; lines < 2; ++lines) {
    while (at < text.size() && IsDigit(text[at])) name += text[at++];
    const Code* const code = FindCode(name);
    if (code != nullptr && (found == nullptr || text.compare(at, 2, ": ") == 0)) found = code;
    const size_t next = BehindBreak(text, at);
    if (next == at) break;
    at = next;
  }
  return found;
}

// A message number of Liberty: four digits and a letter behind the prefix.
const Code* LibertyCode(const std::string& text, size_t at, std::string name) {
  for (int i = 0; i < 5; ++i) {
    at = BehindBreak(text, at);
    if (at == text.size()) return nullptr;
    name += text[at++];
  }
  return at < text.size() && IsWord(text[at]) ? nullptr : FindCode(name);
}

// Numbers without "AADSTS", where it is certain that they are such codes.
void AddNumbers(const std::string& text, std::set<const Code*>& found) {
  static const std::regex lists(
      "(?:error_codes|error\\?code|sign-in error code)[^0-9A-Za-z]{1,12}"
      "([0-9]{5,7}(?:[^0-9A-Za-z]{1,6}[0-9]{5,7}){0,4})",
      std::regex::icase);
  static const std::regex number("[0-9]+");
  for (std::sregex_iterator list(text.begin(), text.end(), lists), end; list != end; ++list) {
    const std::string numbers = (*list)[1].str();
    for (std::sregex_iterator one(numbers.begin(), numbers.end(), number); one != end; ++one) {
      found.insert(FindCode("AADSTS" + one->str()));
    }
  }
}

// True if the plain error at `at` is where an error is expected: other texts use such words too.
bool IsErrorAt(const std::string& text, size_t at, size_t length) {
  const size_t end = at + length;
  if (at > 0 && IsWord(text[at - 1])) return false;
  if (end < text.size() && IsWord(text[end])) return false;
  if (text.find_first_not_of(" \r\n\"'", end) == std::string::npos &&
      text.find_first_not_of(" \r\n\"'") >= at) {
    return true;  // nothing else
  }
  if (at > 0 && text[at - 1] == '>' && end < text.size() && text[end] == '<') return true;
  size_t word = at;
  while (word > 0 && !IsWord(text[word - 1]) && at - word < 10) --word;
  for (const std::string before : {"error", "reason", "refused"}) {
    if (word < before.size() || word == at) continue;
    std::string there = text.substr(word - before.size(), before.size());
    std::transform(there.begin(), there.end(), there.begin(),
                   [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    if (there == before) return true;
  }
  return false;
}

bool HoldsError(const std::string& text, const std::string& name) {
  static const std::set<std::string> unmistakable = {
      "invalid_grant", "invalid_client", "unauthorized_client", "unsupported_grant_type",
      "unsupported_response_type"};
  for (size_t at = 0; (at = text.find(name, at)) != std::string::npos; at += name.size()) {
    if (IsErrorAt(text, at, name.size())) return true;
    const bool whole = (at == 0 || !IsWord(text[at - 1])) &&
                       (at + name.size() == text.size() || !IsWord(text[at + name.size()]));
    if (whole && unmistakable.count(name) > 0) return true;
  }
  return false;
}

std::vector<const Code*> CodesIn(const std::vector<std::string>& readings) {
  std::set<const Code*> found;
  for (const std::string& text : readings) {
    for (size_t at = 0; at < text.size(); ++at) {
      if (std::toupper(static_cast<unsigned char>(text[at])) == 'A') {
        const size_t end = Behind(text, at, "AADSTS");
        if (end != std::string::npos) found.insert(EntraCode(text, end));
      } else if (std::toupper(static_cast<unsigned char>(text[at])) == 'C') {
        for (const std::string prefix : {"CWOAU", "CWWKS"}) {
          const size_t end = Behind(text, at, prefix);
          if (end != std::string::npos) found.insert(LibertyCode(text, end, prefix));
        }
      }
    }
    AddNumbers(text, found);
  }
  found.erase(nullptr);
  std::vector<const Code*> codes;
  for (const Code& code : Codes()) {
    // The plain error that comes with a code says less than the code.
    if (code.source == CodeSource::kOAuth && found.empty()) {
      const auto holds = [&code](const std::string& text) { return HoldsError(text, code.name); };
      if (std::any_of(readings.begin(), readings.end(), holds)) codes.push_back(&code);
    } else if (found.count(&code) > 0) {
      codes.push_back(&code);
    }
  }
  return codes;
}

// True if the library's own words, or the login program's, lead to this place; or if nothing but a
// detail comes with the text.
bool IsAnchored(const std::string& text, size_t at, const std::string& literal) {
  static const std::regex lead("(uri |[a-z]\\.cpp:[0-9]+ |reason=|sign-in failed: )$");
  const size_t end = at + literal.size();
  if (at == 0) return end == text.size() || text[end] == ':' || literal.back() == ' ';
  const size_t begin = at > 40 ? at - 40 : 0;
  return std::regex_search(text.substr(begin, at - begin), lead);
}

bool HoldsMessage(const std::string& text, const Message& message) {
  static std::map<const char*, std::regex> patterns;
  const bool anchored = message.pattern == kAnchored;
  if (message.pattern != nullptr && !anchored) {
    if (*message.pattern == '\0') return false;
    const auto pattern = patterns.try_emplace(message.pattern, message.pattern).first;
    return std::regex_search(text, pattern->second);
  }
  const std::string literal(message.text, std::strcspn(message.text, "%"));
  for (size_t at = 0; (at = text.find(literal, at)) != std::string::npos; ++at) {
    if (!anchored || IsAnchored(text, at, literal)) return true;
  }
  return false;
}

std::string WhoSays(const Message& message) {
  const std::string where = message.where;
  switch (message.group) {
    case MessageGroup::kLog:
      return "log line of " + where;
    case MessageGroup::kGuard:
      return "log line, priority " + where;
    case MessageGroup::kOther:
      return "from " + where;
    default:
      return "exception " + where;
  }
}

// As plain text: the document's quotation marks for code are left out.
std::string Plain(std::string text) {
  text.erase(std::remove(text.begin(), text.end(), '`'), text.end());
  return text;
}

const char* NameOf(CodeSource source) {
  if (source == CodeSource::kEntra) return "Microsoft Entra ID";
  return source == CodeSource::kLiberty ? "WebSphere Liberty" : "OAuth 2.0";
}

std::string TextOrInput(const std::string& text) {
  if (text != "-") return text.substr(0, kLongestText);
  std::string input(kLongestText, '\0');
  std::cin.read(&input[0], static_cast<std::streamsize>(input.size()));
  input.resize(static_cast<size_t>(std::cin.gcount()));
  return input;
}

void PrintJson(const std::vector<Explanation>& explanations) {
  Json::Value document(Json::objectValue);
  document["tool"] = "ssoclient-doctor";
  document["version"] = SSOCLIENT_VERSION;
  document["verdict"] = explanations.empty() ? kNothing : "Codes or messages were recognised";
  document["exit_status"] = explanations.empty() ? 1 : 0;
  document["findings"] = document["requests"] = Json::Value(Json::arrayValue);
  Json::Value& list = document["explanations"] = Json::Value(Json::arrayValue);
  for (const Explanation& one : explanations) {
    Json::Value value(Json::objectValue);
    value["name"] = one.name;
    value["where"] = one.where;
    value["meaning"] = one.meaning;
    value["action"] = one.action;
    value["secret_refused"] = one.secret_refused;
    list.append(value);
  }
  std::cout << WriteJson(document, JsonStyle::kForPeople) << '\n';
}

void PrintText(const std::vector<Explanation>& explanations) {
  const size_t width = TerminalWidth();
  for (const Explanation& one : explanations) {
    std::cout << Wrap(one.name + " (" + one.where + ")", 0, width) << "  "
              << Wrap(one.meaning, 2, width) << "  " << Wrap("-> " + one.action, 2, width);
    if (one.secret_refused) std::cout << "  The provider refused the client secret.\n";
  }
  if (!explanations.empty()) return;
  std::cout << kNothing << ".\n"
            << Wrap(
                   "Microsoft explains every AADSTS code at "
                   "https://login.microsoftonline.com/error, IBM every CWOAU and CWWKS message in "
                   "the documentation of WebSphere Liberty.",
                   0, width);
}

}  // namespace

std::string PlacesOf(unsigned met) {
  static constexpr struct {
    unsigned bit;
    const char* name;
  } kPlaces[] = {{kPage, "the provider's page"},
                 {kRedirect, "redirect URI"},
                 {kToken, "token endpoint"},
                 {kLogout, "logout"},
                 {kServerLog, "the provider's log"}};
  std::string places;
  for (const auto& place : kPlaces) {
    if ((met & place.bit) != 0) places += (places.empty() ? "" : ", ") + std::string(place.name);
  }
  return places;
}

std::vector<const Code*> CodesOf(const std::string& text) {
  return CodesIn(ReadingsOf(text));
}

std::vector<Explanation> Explain(const std::string& text) {
  const std::vector<std::string> readings = ReadingsOf(text);
  std::vector<Explanation> explanations;
  for (const Code* const code : CodesIn(readings)) {
    explanations.push_back({code->name,
                            std::string(NameOf(code->source)) + "; met at: " + PlacesOf(code->met),
                            code->meaning, code->action, code->secret == SecretVerdict::kRefused});
  }
  std::vector<std::string> lines;
  for (const std::string& reading : readings) {
    lines.push_back(Collapse(reading));
    lines.push_back(Collapse(Join(reading)));
  }
  for (const Message& message : Messages()) {
    const auto holds = [&message](const std::string& line) { return HoldsMessage(line, message); };
    if (std::none_of(lines.begin(), lines.end(), holds)) continue;
    explanations.push_back({(*message.text == ' ' ? "..." : "") + std::string(message.text),
                            WhoSays(message), Plain(message.cause), Plain(message.remedy), false});
  }
  return explanations;
}

int RunExplain(const std::string& text, bool json) {
  const std::vector<Explanation> explanations = Explain(TextOrInput(text));
  json ? PrintJson(explanations) : PrintText(explanations);
  return explanations.empty() ? 1 : 0;
}

}  // namespace doctor
