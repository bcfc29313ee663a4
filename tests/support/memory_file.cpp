#include "support/memory_file.h"

#include <sys/mman.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>

namespace test {
namespace {

void require(bool good, const char* what) {
  if (!good) throw std::system_error(errno, std::generic_category(), what);
}

}  // namespace

MemoryFile::MemoryFile() : file(memfd_create("test", MFD_CLOEXEC)) {
  require(file >= 0, "memfd_create");
}

MemoryFile::~MemoryFile() {
  close(file);
}

void MemoryFile::put(const std::string& text) const {
  for (std::size_t done = 0; done < text.size();) {
    const ssize_t n = write(file, text.data() + done, text.size() - done);
    require(n > 0, "write");
    done += static_cast<std::size_t>(n);
  }
}

std::string MemoryFile::contents() const {
  std::string text;
  char piece[65536];
  for (ssize_t n; (n = pread(file, piece, sizeof piece, static_cast<off_t>(text.size()))) > 0;) {
    text.append(piece, static_cast<std::size_t>(n));
  }
  return text;
}

void MemoryFile::putPart(const std::string& part) const {
  put(std::to_string(part.size()) + "\n" + part);
}

std::vector<std::string> MemoryFile::parts() const {
  const std::string text = contents();
  std::vector<std::string> parts;
  for (std::size_t at = 0; at < text.size();) {
    const std::size_t line = text.find('\n', at);
    const std::size_t size = std::stoul(text.substr(at, line - at));
    parts.push_back(text.substr(line + 1, size));
    at = line + 1 + size;
  }
  return parts;
}

}  // namespace test
