#include "settings.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <sstream>

#include "failure.h"

namespace {

constexpr off_t kLargest = 65536;
constexpr char kBadValue[] = "bad value";

struct Number {
  const char* key;
  int Settings::*field;
  int least;
  int most;
};

constexpr Number kNumbers[] = {
    {"deadline", &Settings::deadline, 1, 600},
    {"max_exchanges", &Settings::max_exchanges, 1, 1000},
    {"session_lifetime", &Settings::session_lifetime, 60, 30 * 24 * 3600},
    {"max_sessions", &Settings::max_sessions, 1, 100000},
};

struct Text {
  const char* key;
  std::string Settings::*field;
};

constexpr Text kTexts[] = {
    {"proxy", &Settings::proxy},
    {"no_proxy", &Settings::no_proxy},
    {"user_lookup", &Settings::user_lookup},
    {"provider_name", &Settings::provider_name},
};

// False if the value is not a number, or out of range.
bool TakeNumber(const Number& number, const std::string& value, Settings& settings) {
  if (value.empty() || value.size() > 9) return false;
  if (value.find_first_not_of("0123456789") != std::string::npos) return false;
  const int parsed = std::stoi(value);
  if (parsed < number.least || parsed > number.most) return false;
  settings.*number.field = parsed;
  return true;
}

bool TakeNonceCheck(const std::string& value, Settings& settings) {
  settings.nonce_check = value != "no";  // a misspelled "no" must not switch a check off
  return value == "yes" || value == "no";
}

// An empty text if the setting could be used, or else what is wrong with it.
const char* Take(const std::string& key, const std::string& value, Settings& settings) {
  for (const Number& number : kNumbers) {
    if (key == number.key) return TakeNumber(number, value, settings) ? "" : kBadValue;
  }
  for (const Text& text : kTexts) {
    if (key != text.key) continue;
    settings.*text.field = value;
    return "";
  }
  if (key == "nonce_check") return TakeNonceCheck(value, settings) ? "" : kBadValue;
  return "unknown key";
}

std::string Trim(const std::string& text) {
  constexpr char kBlanks[] = " \t\r";
  const size_t begin = text.find_first_not_of(kBlanks);
  if (begin == std::string::npos) return "";
  return text.substr(begin, text.find_last_not_of(kBlanks) - begin + 1);
}

void TakeLine(const std::string& line, int number, Settings& settings) {
  const std::string text = Trim(line);
  if (text.empty() || text[0] == '#') return;
  const size_t equals = text.find('=');
  const std::string key = Trim(text.substr(0, equals));
  const std::string problem =
      equals == std::string::npos ? "no \"=\"" : Take(key, Trim(text.substr(equals + 1)), settings);
  if (problem.empty()) return;
  settings.complaints.push_back(std::string(kSettingsFile) + ", line " + std::to_string(number) +
                                ": " + problem + " (" + key + ")");
}

[[noreturn]] void Refuse(const std::string& problem) {
  throw Failure(FailureCode::kInternal, std::string(kSettingsFile) + ": " + problem);
}

// Whoever can write the file decides who may sign in: nobody but root may.
void CheckOwner(int file) {
  struct stat status;
  if (fstat(file, &status) != 0 || !S_ISREG(status.st_mode)) Refuse("not a regular file");
  if (status.st_uid != 0) Refuse("does not belong to root");
  if ((status.st_mode & 022) != 0) Refuse("others than root can write it");
  if (status.st_size > kLargest) Refuse("too large");
}

// The text of the file; empty if there is none.
std::string ReadFile() {
  const int file = open(kSettingsFile, O_RDONLY | O_CLOEXEC | O_NONBLOCK);
  if (file < 0 && errno == ENOENT) return "";
  if (file < 0) Refuse(std::strerror(errno));
  struct Owner {
    int file;
    ~Owner() { close(file); }
  } const owner{file};
  CheckOwner(file);
  std::string text(static_cast<size_t>(kLargest) + 1, '\0');
  const ssize_t size = read(file, &text[0], text.size());
  if (size < 0 || size > kLargest) Refuse("cannot be read");
  text.resize(static_cast<size_t>(size));
  return text;
}

}  // namespace

Settings ReadSettings() {
  Settings settings;
  std::istringstream lines(ReadFile());
  std::string line;
  for (int number = 1; std::getline(lines, line); ++number) TakeLine(line, number, settings);
  return settings;
}
