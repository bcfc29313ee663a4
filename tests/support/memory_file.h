// A file without a name, on no file system: what one process leaves there, another reads.
#pragma once

#include <string>
#include <vector>

namespace test {

class MemoryFile {
 public:
  MemoryFile();
  ~MemoryFile();
  MemoryFile(const MemoryFile&) = delete;
  MemoryFile& operator=(const MemoryFile&) = delete;

  int descriptor() const { return file; }
  void put(const std::string& text) const;
  std::string contents() const;

  // Texts of any bytes, each with its length before it, so that they can be told apart.
  void putPart(const std::string& part) const;
  std::vector<std::string> parts() const;

 private:
  int file;
};

}  // namespace test
