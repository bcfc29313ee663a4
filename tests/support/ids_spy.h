// Stands between the library and the calls that read and change process ids: records them, in
// order, and can let one of them fail. Link support/ids_spy.cpp into the test program.
#pragma once

#include <sys/types.h>

#include <cstddef>
#include <functional>
#include <string>
#include <vector>

namespace test {

class IdsSpy {
 public:
  IdsSpy();  // records from here on; one at a time
  ~IdsSpy();
  IdsSpy(const IdsSpy&) = delete;
  IdsSpy& operator=(const IdsSpy&) = delete;

  std::vector<std::string> all;      // "geteuid", "setresgid(-1, 0, -1)", ...
  std::vector<std::string> changes;  // those that change ids

  // The failing-th change (counted from 1) is not carried out; it fails with this errno.
  std::size_t failing = 0;
  int error = 0;
  bool allAfter = false;  // so do all changes after it
  // Called after the given change was carried out.
  std::function<void(std::size_t change)> afterwards;

  // Answers of geteuid and getegid, in order, instead of the real ones; when they have run out,
  // the real ones.
  std::vector<uid_t> users;
  std::vector<gid_t> groups;

  // The buffers that strerror_r was given: their size, and whether all of it was zero.
  struct Buffer {
    std::size_t size;
    bool zero;
    int error;
  };
  std::vector<Buffer> buffers;
};

}  // namespace test
