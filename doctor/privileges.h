// What takes the effect of the set-user-ID bit away from the web server's programs.
#pragma once

#include <sys/types.h>

#include <string>

namespace doctor {

// Where no_new_privs is set for the web server: a process of this user, a unit of systemd, or this
// command itself; empty: nowhere.
struct NoNewPrivileges {
  std::string where;
  std::string file;  // of the unit
};
NoNewPrivileges FindNoNewPrivileges(uid_t user);

}  // namespace doctor
