#include "doctor/terminal.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <iostream>
#include <sstream>

#include "doctor/redact.h"
#include "doctor/text.h"

namespace doctor {

namespace {

constexpr size_t kUsualWidth = 80;
constexpr size_t kLeastWidth = 40;

size_t WidthOf(int descriptor) {
  if (isatty(descriptor) == 0) return 0;
  struct winsize size = {};
  if (ioctl(descriptor, TIOCGWINSZ, &size) != 0 || size.ws_col == 0) return kUsualWidth;
  return std::max<size_t>(size.ws_col, kLeastWidth);
}

// Characters, not bytes of UTF-8.
size_t Columns(const std::string& word) {
  return static_cast<size_t>(std::count_if(word.begin(), word.end(), [](char c) {
    return (static_cast<unsigned char>(c) & 0xc0) != 0x80;
  }));
}

}  // namespace

size_t TerminalWidth() {
  return WidthOf(STDOUT_FILENO);
}

bool HasColour() {
  const char* const off = std::getenv("NO_COLOR");
  const char* const terminal = std::getenv("TERM");
  return TerminalWidth() > 0 && (off == nullptr || *off == '\0') &&
         (terminal == nullptr || std::string(terminal) != "dumb");
}

std::string Wrap(const std::string& text, size_t indent, size_t width) {
  if (width == 0) return text + "\n";
  std::istringstream words(text);
  std::string result;
  size_t column = indent;
  for (std::string word; words >> word;) {
    const size_t columns = Columns(word);
    if (column > indent && column + 1 + columns > width) {
      result += "\n" + std::string(indent, ' ');
      column = indent;
    } else if (column > indent) {
      result += ' ';
      ++column;
    }
    result += word;
    column += columns;
  }
  return result + "\n";
}

void Progress(const std::string& doing) {
  const size_t width = WidthOf(STDERR_FILENO);
  if (width == 0) return;
  std::cerr << '\r' << Clip(Printable(Clean(doing)), width - 4) << "\x1b[K"
            << (doing.empty() ? "" : "\r") << std::flush;
}

}  // namespace doctor
