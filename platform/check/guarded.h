// Memory for one argument of a call, with its end at an inaccessible page.
#pragma once

#include <cstddef>
#include <string>

namespace port {

constexpr char kUntouched = '\x5a';

// Whatever is touched behind the end ends the process, with a finding that says how far behind.
// Bytes in front are compared by CheckFront.
class Guarded {
 public:
  // `limit` is the most bytes that will be asked for; `what` is used in findings.
  Guarded(const char* what, size_t limit);
  ~Guarded();
  Guarded(const Guarded&) = delete;
  Guarded& operator=(const Guarded&) = delete;

  // `size` untouched bytes. `slack` more may be touched behind them: for checks of another promise.
  char* Room(size_t size, size_t slack = 0);
  // A copy of `bytes`, which cannot be written to. `slack` as above, zeros.
  const char* Copy(const std::string& bytes, size_t slack = 0);

  // Ends the check if something was written in front of the room.
  void CheckFront() const;
  // Nothing may touch it from now on.
  void Lock();

  // Describes an address for a finding; empty if it does not belong to one of these.
  static std::string Place(const void* address);

 private:
  void Protect(int rights);

  const char* const what;
  const size_t page;
  const size_t length;  // without the page behind
  char* const memory;
  char* room;
  size_t given = 0;
  bool writable = true;
};

}  // namespace port
