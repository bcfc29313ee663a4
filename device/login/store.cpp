#include "store.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <ctime>
#include <memory>
#include <stdexcept>

namespace {

constexpr char kFolder[] = "/run/ssoclient/";
constexpr size_t kKeyBytes = 32;

// Only a key that could be ours becomes a file name: it comes from the browser.
bool IsKey(const std::string& text) {
  return text.size() == 2 * kKeyBytes &&
         text.find_first_not_of("0123456789abcdef") == std::string::npos;
}

class File {
 public:
  File(const std::string& path, int flags) : fd_(open(path.c_str(), flags | O_CLOEXEC, 0600)) {}
  ~File() {
    if (fd_ >= 0) close(fd_);
  }
  File(const File&) = delete;
  File& operator=(const File&) = delete;
  int fd() const { return fd_; }

 private:
  int fd_;
};

}  // namespace

Store::Store(const std::string& name, int lifetime, int capacity)
    : folder_(kFolder + name + "/"), lifetime_(lifetime), capacity_(capacity) {}

std::string Store::NewKey() {
  unsigned char bytes[kKeyBytes];
  if (getrandom(bytes, sizeof bytes, 0) != static_cast<ssize_t>(sizeof bytes)) {
    throw std::runtime_error("no random bytes");
  }
  std::string key;
  for (const unsigned char byte : bytes) {
    key += "0123456789abcdef"[byte >> 4];
    key += "0123456789abcdef"[byte & 15];
  }
  return key;
}

std::string Store::Path(const std::string& key) const {
  return folder_ + key;
}

void Store::Put(const std::string& key, const std::string& text) const {
  if (mkdir(folder_.c_str(), 0700) != 0 && errno != EEXIST) {
    throw std::runtime_error("cannot make " + folder_);
  }
  Sweep();
  const File file(Path(key), O_WRONLY | O_CREAT | O_EXCL);
  if (file.fd() < 0 ||
      write(file.fd(), text.data(), text.size()) != static_cast<ssize_t>(text.size())) {
    throw std::runtime_error("cannot write below " + folder_);
  }
}

std::optional<std::string> Store::Get(const std::string& key) const {
  if (!IsKey(key)) return std::nullopt;
  const File file(Path(key), O_RDONLY | O_NOFOLLOW);
  struct stat status;
  if (file.fd() < 0 || fstat(file.fd(), &status) != 0) return std::nullopt;
  if (status.st_mtime + lifetime_ < time(nullptr)) return std::nullopt;
  std::string text(static_cast<size_t>(status.st_size), '\0');
  const ssize_t size = read(file.fd(), &text[0], text.size());
  if (size != static_cast<ssize_t>(text.size())) return std::nullopt;
  return text;
}

std::optional<std::string> Store::Take(const std::string& key) const {
  std::optional<std::string> text = Get(key);
  // One caller's unlink succeeds; whoever comes later has read in vain.
  if (text && unlink(Path(key).c_str()) != 0) return std::nullopt;
  return text;
}

void Store::Sweep() const {
  const std::unique_ptr<DIR, int (*)(DIR*)> folder(opendir(folder_.c_str()), closedir);
  if (!folder) return;
  int kept = 0;
  while (const dirent* entry = readdir(folder.get())) {
    struct stat status;
    if (!IsKey(entry->d_name) || stat(Path(entry->d_name).c_str(), &status) != 0) continue;
    if (status.st_mtime + lifetime_ < time(nullptr)) {
      unlink(Path(entry->d_name).c_str());
    } else if (++kept >= capacity_) {
      throw std::runtime_error("too many entries below " + folder_);
    }
  }
}
