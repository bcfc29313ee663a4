#include "identity.h"

#include <unistd.h>

#include <stdexcept>

#include "process.h"

namespace {

constexpr id_t kKeep = static_cast<id_t>(-1);

uid_t web_user = kKeep;
gid_t web_group = kKeep;

}  // namespace

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
  web_user = uid;
  web_group = gid;
  CheckIdentity();
}

void CheckIdentity() {
  if (web_user == kKeep) return;  // StepDown refused
  process::KeepPrivate();         // each change of ids undoes it
  if (geteuid() == web_user && getegid() == web_group) return;
  process::EndNow("internal", "the effective ids were not put back");
}

void DropRoot() {
  if (setresgid(web_group, web_group, web_group) != 0 ||
      setresuid(web_user, web_user, web_user) != 0) {
    process::EndNow("internal", "cannot give up the saved identity root");
  }
  CheckIdentity();
}

AsRoot::AsRoot() {
  if (setresuid(kKeep, 0, kKeep) != 0) throw std::runtime_error("cannot become root");
}

AsRoot::~AsRoot() {
  (void)!setresuid(kKeep, web_user, kKeep);
  CheckIdentity();
}
