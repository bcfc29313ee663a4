// Who can change or pass what is on a path.
#pragma once

#include <sys/stat.h>

#include <optional>
#include <string>

#include "doctor/ask.h"

namespace doctor {

struct Spot {
  std::string path;
  struct stat status = {};

  std::string Owner() const;  // "owner 0, group 33, mode 0755"
  // The command after which root alone can change it.
  std::string Command() const { return "chown root " + path + "; chmod go-w " + path; }
};

// The first file or folder on the path, links followed, that users other than root can change, or
// whose contents they can replace.
std::optional<Spot> WritableByOthers(const std::string& path);

// The first on the path that `caller` cannot pass; of the last one, `mode` is asked for (R_OK,
// X_OK).
std::optional<Spot> ClosedTo(const Caller& caller, const std::string& path, int mode);

// "0644"
std::string Mode(const struct stat& status);

}  // namespace doctor
