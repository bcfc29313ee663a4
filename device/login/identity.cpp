#include "identity.h"

#include <unistd.h>

#include <stdexcept>

void StepDown() {
  const uid_t uid = getuid();
  const gid_t gid = getgid();
  if (geteuid() != 0) throw std::runtime_error("login program is not installed set-id root");
  if (uid == 0) throw std::runtime_error("web server runs as root");
  // The group first: without the effective user root it could not be changed any more.
  if (setresgid(gid, gid, 0) != 0 || setresuid(uid, uid, 0) != 0) {
    throw std::runtime_error("cannot give up the effective identity root");
  }
}
