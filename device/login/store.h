// Files of the login program below /run/ssoclient: root's, so that no other program that runs as
// the web server's user can change them.
//
// All of it is short-lived and gone when the device starts again. The folder is made when it is
// missing.
#pragma once

#include <sys/types.h>

#include <string>

namespace store {

// Folder is a folder below /run/ssoclient that root writes to; `mode` says who may read it.
// Needs AsRoot. Throws std::runtime_error if it cannot be made, or is somebody else's.
std::string Folder(const std::string& name, mode_t mode);

// File is an open file, locked against other processes until it is closed.
class File {
 public:
  enum class Wait { kYes, kNo };

  // Opens or makes a file that only root can read. Needs AsRoot. Throws std::runtime_error if that
  // fails. Without waiting, Locked() says whether the lock was free.
  File(const std::string& path, Wait wait);
  ~File();
  File(const File&) = delete;
  File& operator=(const File&) = delete;

  bool Locked() const { return locked_; }

  // Reads or writes `size` bytes at an offset; false if that is not possible in full.
  bool Read(void* bytes, size_t size, off_t offset) const;
  bool Write(const void* bytes, size_t size, off_t offset) const;

 private:
  int file_;
  bool locked_;
};

}  // namespace store
