// The privilege guard: two halves around the read of a file that only root can read.
//
//   CriticalSection guard(kUnit);
//   guard.Enter(__LINE__);
//   ... the read ...
//   guard.Leave(__LINE__);
//
// Not a scope guard: an exception between the halves leaves the effective ids raised. Only
// exhausted memory can throw there. The ids are those of the whole process.
#pragma once

#include <sys/types.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace QOVA {
namespace SSO {

class CriticalSection {
 public:
  // `name` is the source file name for the log lines.
  explicit CriticalSection(const char* name) : unit(name), uid(geteuid()), gid(getegid()) {}
  CriticalSection(const CriticalSection&) = delete;
  CriticalSection& operator=(const CriticalSection&) = delete;

  // Raises the effective group, then the user id to root. A failure is logged and ends this half;
  // the read is tried all the same. `errno` is 0 or EPERM afterwards.
  void Enter(int line) {
    const Half half = {"ENTERCriticalSection", line};
    if (gid != 0 && !SetGroup(0, half)) return;
    if (uid != 0 && !SetUser(0, half)) return;
    errno = 0;
  }

  // Puts the effective ids back. A failure is logged and ends this half: after a failed group the
  // user stays root, so that a program never goes on as the user with root's group.
  void Leave(int line) {
    const Half half = {"LEAVECriticalSection", line};
    const bool user_changed = uid != geteuid();
    const bool group_changed = gid != getegid();
    // Only root may change the group.
    if (user_changed && !SetUser(0, half)) return;
    if (group_changed && !SetGroup(gid, half)) return;
    if (user_changed && !SetUser(uid, half)) return;
    errno = 0;
  }

 private:
  struct Half {
    const char* name;
    int line;
  };

  static constexpr id_t kKeep = static_cast<id_t>(-1);

  bool SetUser(uid_t id, const Half& half) const {
    return Report("resuid", setresuid(kKeep, id, kKeep), id, half);
  }

  bool SetGroup(gid_t id, const Half& half) const {
    return Report("resgid", setresgid(kKeep, id, kKeep), id, half);
  }

  // Logs a raise to root, and a failure. True if the call succeeded.
  bool Report(const char* call, int result, id_t id, const Half& half) const {
    if (result == 0) {
      if (id == 0) {
        syslog(LOG_AUTH | LOG_INFO, "%s:%d WARNING: set%s(%d, %d, %d)", unit, half.line, call, -1,
               0, -1);
      }
      return true;
    }
    char buffer[1024] = {};
    const char* const text = ErrorText(strerror_r(errno, buffer, sizeof buffer), buffer);
    syslog(LOG_AUTH | LOG_ERR, "%s:%d ERROR: set%s(%d, %d, %d) [%s]", unit, half.line, call, -1,
           static_cast<int>(id), -1, text);
    errno = EPERM;
    syslog(LOG_AUTH | LOG_ERR, "%s:%d ERROR: %s", unit, half.line, half.name);
    errno = EPERM;  // syslog may have changed it
    return false;
  }

  // GNU's strerror_r returns the text and may leave the buffer empty; XSI's fills the buffer.
  static const char* ErrorText(const char* text, const char*) { return text; }
  static const char* ErrorText(int, const char* buffer) { return buffer; }

  const char* const unit;
  const uid_t uid;
  const gid_t gid;
};

}  // namespace SSO
}  // namespace QOVA
