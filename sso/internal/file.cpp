#include "sso/internal/file.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>

namespace QOVA {
namespace SSO {

namespace {

// An open file.
class File {
 public:
  explicit File(const char* path) : descriptor(open(path, O_RDONLY | O_CLOEXEC)) {}
  ~File() {
    if (descriptor >= 0) close(descriptor);
  }
  File(const File&) = delete;
  File& operator=(const File&) = delete;

  // Appends all that is left of the file to `text`.
  bool ReadAll(std::string& text) const {
    char chunk[4096];
    for (;;) {
      const ssize_t count = read(descriptor, chunk, sizeof chunk);
      if (count == 0) return true;
      if (count > 0) {
        text.append(chunk, static_cast<size_t>(count));
      } else if (errno != EINTR) {
        return false;  // not open, a directory, or a broken read
      }
    }
  }

 private:
  const int descriptor;
};

}  // namespace

bool ReadFile(const char* path, std::string& text) {
  return File(path).ReadAll(text);
}

}  // namespace SSO
}  // namespace QOVA
