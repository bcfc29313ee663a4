#include "store.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <stdexcept>

namespace store {
namespace {

constexpr char kRoot[] = "/run/ssoclient";

void Make(const std::string& path, mode_t mode) {
  if (mkdir(path.c_str(), 0700) == 0) {
    if (chmod(path.c_str(), mode) == 0) return;  // whatever the file creation mask is
  } else if (errno == EEXIST) {
    struct stat status;
    const bool ours = lstat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode) &&
                      status.st_uid == 0 && (status.st_mode & 022) == 0;
    if (ours) return;
    throw std::runtime_error(path + " is not a folder that root alone can write to");
  }
  throw std::runtime_error("cannot make " + path);
}

}  // namespace

std::string Folder(const std::string& name, mode_t mode) {
  Make(kRoot, 0755);
  if (name.empty()) return std::string(kRoot) + "/";
  const std::string path = std::string(kRoot) + "/" + name;
  Make(path, mode);
  return path + "/";
}

File::File(const std::string& path, Wait wait)
    : file_(open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600)), locked_(false) {
  if (file_ < 0) throw std::runtime_error("cannot open " + path);
  int result = 0;
  do {
    result = flock(file_, wait == Wait::kYes ? LOCK_EX : LOCK_EX | LOCK_NB);
  } while (result != 0 && errno == EINTR);
  locked_ = result == 0;
}

File::~File() {
  close(file_);
}

bool File::Read(void* bytes, size_t size, off_t offset) const {
  return pread(file_, bytes, size, offset) == static_cast<ssize_t>(size);
}

bool File::Write(const void* bytes, size_t size, off_t offset) const {
  return pwrite(file_, bytes, size, offset) == static_cast<ssize_t>(size);
}

}  // namespace store
