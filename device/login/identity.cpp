#include "identity.h"

#include <unistd.h>

#include <stdexcept>

void StepDown() {
  const bool launched = getuid() == 0 && geteuid() != 0;
  if (!launched && geteuid() != 0) {
    throw std::runtime_error("login program is not installed set-id root");
  }
  // Set-id: root is the effective identity; launched: the real one. The other is the web server's.
  const uid_t uid = launched ? geteuid() : getuid();
  const gid_t gid = launched ? getegid() : getgid();
  if (uid == 0) throw std::runtime_error("web server runs as root");
  // The group first: without the effective user root it could not be changed any more.
  if (setresgid(gid, gid, 0) != 0 || setresuid(uid, uid, 0) != 0) {
    throw std::runtime_error("cannot give up the effective identity root");
  }
}
