#include "faults/lines.h"

#include <curl/curl.h>
#include <syslog.h>

#include <algorithm>
#include <cctype>
#include <cstring>
#include <map>

namespace faults {
namespace {

#define MISSING_ADDRESS "URL using bad/illegal format or missing URL"
#define NO_MEMORY "Out of memory"
#define DENIED "Resource temporarily unavailable"

constexpr int kGuardError = LOG_AUTH | LOG_ERR;
constexpr int kGuardNote = LOG_AUTH | LOG_INFO;

const Line kOwn[] = {
    {LOG_ERR, "sso.cpp", "bad_alloc. %m"},
    {LOG_ERR, "sso.cpp", "bad wellknown json format."},
    {LOG_ERR, "sso.cpp", "%t"},
    {LOG_ERR, "sso.cpp", "request token uri %t."},
    {LOG_ERR, "azuresso.cpp", "curl_easy_init failed. %m"},
    {LOG_ERR, "azuresso.cpp", "no kyes information"},
    {LOG_ERR, "azuresso.cpp", "request wellknown uri bad wellknown json format.."},
    {LOG_ERR, "azuresso.cpp", "request wellknown uri %t."},
    {LOG_ERR, "utils.cpp", "MD5 digest failed %m"},
    {LOG_ERR, "utils.cpp", "calloc failed. %m"},
    {LOG_ERR, "jwt.cpp", "EVP_PKEY_assign_RSA failed"},
    {LOG_ERR, "jwt.cpp", "check key type failed"},
    {LOG_ERR, "jwt.cpp", "EVP_DigestVerifyInit failed"},
    {LOG_ERR, "jwt.cpp", "EVP_DigestVerifyUpdate failed"},
    {LOG_ERR, "jwt.cpp", "EVP_DigestVerifyFinal failed"},
    {LOG_ERR, "profile.cpp", "Profile 'another' not support"},
};

// Of each unit with a guard; its ids are the driver's.
const char* const kGuarded[] = {"azuresso.cpp", "webspheresso.cpp", "profile.cpp"};
const Line kOfGuard[] = {
    {kGuardNote, "", "WARNING: setresuid(-1, 0, -1)"},
    {kGuardNote, "", "WARNING: setresgid(-1, 0, -1)"},
    {kGuardError, "", "ERROR: setresuid(-1, 0, -1) [" DENIED "]"},
    {kGuardError, "", "ERROR: setresgid(-1, 0, -1) [" DENIED "]"},
    {kGuardError, "", "ERROR: setresuid(-1, 1001, -1) [" DENIED "]"},
    {kGuardError, "", "ERROR: setresgid(-1, 2002, -1) [" DENIED "]"},
    {kGuardError, "", "ERROR: ENTERCriticalSection"},
    {kGuardError, "", "ERROR: LEAVECriticalSection"},
};

bool isTextOfCurl(const std::string& text) {
  for (int code = 1; code < CURL_LAST; ++code) {
    if (text == curl_easy_strerror(static_cast<CURLcode>(code))) return true;
  }
  return false;
}

bool isMessage(const std::string& text, int error, const std::string& pattern) {
  const std::size_t at = pattern.find('%');
  if (at == std::string::npos) return text == pattern;
  const std::string front = pattern.substr(0, at);
  const std::string back = pattern.substr(at + 2);
  if (pattern[at + 1] == 'm') return text == front + std::strerror(error) + back;
  return text.size() >= front.size() + back.size() && text.compare(0, at, front) == 0 &&
         text.compare(text.size() - back.size(), back.size(), back) == 0 &&
         isTextOfCurl(text.substr(at, text.size() - front.size() - back.size()));
}

// What one of the three functions that catch writes about a transfer that failed so.
std::vector<Line> ofTransfer(bool no_memory) {
  if (no_memory) {
    return {{LOG_ERR, "sso.cpp", NO_MEMORY},
            {LOG_ERR, "sso.cpp", "request token uri " NO_MEMORY "."},
            {LOG_ERR, "azuresso.cpp", "request wellknown uri " NO_MEMORY "."}};
  }
  return {{LOG_ERR, "sso.cpp", MISSING_ADDRESS},
          {LOG_ERR, "sso.cpp", "request token uri " MISSING_ADDRESS "."},
          {LOG_ERR, "azuresso.cpp", "request wellknown uri " MISSING_ADDRESS "."}};
}

}  // namespace

bool is(const test::LogLine& written, const Line& line) {
  const std::string start = std::string(line.file) + ":";
  const std::size_t space = written.text.find(' ');
  return written.priority == line.priority && space != std::string::npos &&
         written.text.compare(0, start.size(), start) == 0 && space > start.size() &&
         std::all_of(written.text.begin() + static_cast<long>(start.size()),
                     written.text.begin() + static_cast<long>(space),
                     [](unsigned char c) { return std::isdigit(c) != 0; }) &&
         isMessage(written.text.substr(space + 1), written.error, line.message);
}

bool isOwn(const test::LogLine& written) {
  const auto matches = [&](const Line& line) { return is(written, line); };
  if (std::any_of(std::begin(kOwn), std::end(kOwn), matches)) return true;
  return std::any_of(std::begin(kGuarded), std::end(kGuarded), [&](const char* file) {
    return std::any_of(std::begin(kOfGuard), std::end(kOfGuard), [&](const Line& line) {
      return matches({line.priority, file, line.message});
    });
  });
}

std::vector<Line> calledFor(const std::string& function, bool all) {
  static const std::map<std::string, std::vector<Line>> lines = {
      {"EVP_PKEY_assign", {{LOG_ERR, "jwt.cpp", "EVP_PKEY_assign_RSA failed"}}},
      {"EVP_PKEY_get_id", {{LOG_ERR, "jwt.cpp", "check key type failed"}}},
      {"EVP_DigestVerifyInit", {{LOG_ERR, "jwt.cpp", "EVP_DigestVerifyInit failed"}}},
      {"EVP_DigestUpdate", {{LOG_ERR, "jwt.cpp", "EVP_DigestVerifyUpdate failed"}}},
      {"EVP_DigestVerifyFinal", {{LOG_ERR, "jwt.cpp", "EVP_DigestVerifyFinal failed"}}},
      {"MD5", {{LOG_ERR, "utils.cpp", "MD5 digest failed %m"}}},
      {"curl_easy_init",
       {{LOG_ERR, "sso.cpp", "bad_alloc. %m"},
        {LOG_ERR, "azuresso.cpp", "curl_easy_init failed. %m"}}},
      // Without an address libcurl says so, if it still says anything else than that it failed.
      {"curl_easy_setopt URL", ofTransfer(false)},
      {"curl_easy_setopt URL+", ofTransfer(true)},
      {"curl_easy_setopt POSTFIELDS+", ofTransfer(true)},
      {"curl_easy_perform", ofTransfer(true)}};
  auto found = lines.find(function + "+");
  if (!all || found == lines.end()) found = lines.find(function);
  return found != lines.end() ? found->second : std::vector<Line>();
}

}  // namespace faults
