#include "support/log.h"

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <regex>

#include "support/support_call.h"

namespace {

bool spoils = false;

std::vector<test::LogLine>& recorded() {
  static std::vector<test::LogLine> lines;
  return lines;
}

void record(int priority, const char* format, va_list arguments) {
  const int error = errno;
  const test::SupportCall call;
  va_list again;
  va_copy(again, arguments);
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
  const int size = std::vsnprintf(nullptr, 0, format, arguments);
  std::string text(static_cast<std::size_t>(size < 0 ? 0 : size) + 1, '\0');
  errno = error;  // for %m
  std::vsnprintf(&text[0], text.size(), format, again);
#pragma GCC diagnostic pop
  va_end(again);
  text.pop_back();
  recorded().push_back({priority, text, error});
  errno = spoils ? EOVERFLOW : error;
}

}  // namespace

// The dynamic linker finds these before those of the C library, for the library under test too.
// Programs compiled with _FORTIFY_SOURCE call the checked names.
extern "C" {

__attribute__((visibility("default"))) void vsyslog(int priority, const char* format,
                                                    va_list arguments) {
  record(priority, format, arguments);
}

__attribute__((visibility("default"))) void __vsyslog_chk(int priority, int, const char* format,
                                                          va_list arguments) {
  record(priority, format, arguments);
}

__attribute__((visibility("default"))) void syslog(int priority, const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  record(priority, format, arguments);
  va_end(arguments);
}

__attribute__((visibility("default"))) void __syslog_chk(int priority, int, const char* format,
                                                         ...) {
  va_list arguments;
  va_start(arguments, format);
  record(priority, format, arguments);
  va_end(arguments);
}

}  // extern "C"

namespace test {

Log::Log() {
  clear();
}

Log::~Log() {
  spoils = false;
}

void Log::spoilErrno() {
  spoils = true;
}

void Log::clear() {
  recorded().clear();
}

const std::vector<LogLine>& Log::lines() const {
  return recorded();
}

testing::AssertionResult Log::is(const std::vector<Expected>& expected) const {
  bool same = lines().size() == expected.size();
  for (std::size_t i = 0; same && i < expected.size(); ++i) {
    std::smatch found;
    same = lines()[i].priority == expected[i].priority &&
           std::regex_search(lines()[i].text, found, std::regex("^[a-z_]+\\.cpp:[1-9][0-9]* ")) &&
           found.str().compare(0, expected[i].file.size() + 1, expected[i].file + ":") == 0 &&
           found.suffix() == expected[i].message;
  }
  if (same) return testing::AssertionSuccess();
  auto result = testing::AssertionFailure();
  result << "the log is\n";
  for (const LogLine& line : lines()) result << "  " << line.priority << " " << line.text << "\n";
  result << "and should be\n";
  for (const Expected& line : expected) {
    result << "  " << line.priority << " " << line.file << ":<line> " << line.message << "\n";
  }
  return result;
}

}  // namespace test
