#include "report.h"

#include <json/reader.h>
#include <json/value.h>
#include <json/writer.h>

#include <algorithm>
#include <cctype>
#include <exception>
#include <memory>

#include "sso/utils.h"
#include "state.h"
#include "utf8.h"

namespace {

constexpr char kTaken[] = "[...]";
constexpr size_t kShortestCode = 16;
constexpr size_t kLongestText = 700;
constexpr size_t kLongestError = 100;
constexpr size_t kLongestDescription = 700;
constexpr size_t kLongestName = 64;

void TakeOut(std::string& text, const std::string& secret) {
  if (secret.empty()) return;
  for (size_t at = 0; (at = text.find(secret, at)) != std::string::npos;) {
    text.replace(at, secret.size(), kTaken);
    at += sizeof kTaken - 1;
  }
}

// A JSON Web Token's header is an object, and its text therefore begins like this in base64.
void TakeOutTokens(std::string& text) {
  for (size_t at = 0; (at = text.find("eyJ", at)) != std::string::npos;) {
    const size_t end = text.find_first_not_of(
        "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_.", at);
    text.replace(at, end == std::string::npos ? end : end - at, kTaken);
    at += sizeof kTaken - 1;
  }
}

// As a string of a JSON document, without the quotes.
std::string InJson(const std::string& text) {
  const std::string quoted = Json::valueToQuotedString(text.c_str());
  return quoted.substr(1, quoted.size() - 2);
}

// With the other spelling of its hexadecimal digits.
std::string Lower(std::string encoded) {
  for (size_t at = 0; (at = encoded.find('%', at)) != std::string::npos; at += 3) {
    for (size_t i = at + 1; i < std::min(at + 3, encoded.size()); ++i) {
      encoded[i] = static_cast<char>(std::tolower(static_cast<unsigned char>(encoded[i])));
    }
  }
  return encoded;
}

}  // namespace

std::string Redact(const std::string& text, const std::vector<std::string>& secrets) {
  std::string out = text;
  for (const std::string& secret : secrets) {
    const std::string encoded = QOVA::SSO::URLEncode(secret);
    for (const std::string& form : {secret, encoded, Lower(encoded), InJson(secret)}) {
      TakeOut(out, form);
    }
  }
  TakeOutTokens(out);
  return out;
}

bool IsLikeCode(const std::string& text) {
  if (text.size() < kShortestCode || text.find(' ') != std::string::npos) return false;
  // The names of errors are long, too: "temporarily_unavailable".
  return std::any_of(text.begin(), text.end(),
                     [](unsigned char c) { return std::isdigit(c) || std::isupper(c); });
}

ProviderError FindError(const std::string& response) {
  const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
  Json::Value root;
  try {
    const char* const begin = response.data();
    if (!reader->parse(begin, begin + response.size(), &root, nullptr)) return {};
  } catch (const std::exception&) {  // nested too deep
    return {};
  }
  return {Member(root, "error"), Member(root, "error_description")};
}

std::string LogLine(const Failure& failure, const std::string& reference,
                    const std::string& address, const std::string& profile) {
  std::string line = "sign-in failed [" + reference + "]: " + failure.Name() + ", client " +
                     OneLine(address.empty() ? "unknown" : address, kLongestName) + ", profile " +
                     OneLine(profile.empty() ? "none" : profile, kLongestName);
  const ProviderError& provider = failure.provider;
  if (!provider.error.empty()) line += ", error " + OneLine(provider.error, kLongestError);
  if (!provider.description.empty()) {
    line += ", error_description " + OneLine(provider.description, kLongestDescription);
  }
  return line + ": " + OneLine(failure.what(), kLongestText);
}
