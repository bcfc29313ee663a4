#include "doctor/paths.h"

#include <fcntl.h>
#include <unistd.h>
#include <climits>

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <vector>

#include "doctor/json.h"

namespace doctor {

namespace {

constexpr int kDeepestLink = 16;
constexpr int kSeconds = 10;

// "/", "/usr", "/usr/bin"
std::vector<std::string> Steps(const std::string& path) {
  std::vector<std::string> steps = {"/"};
  for (size_t at = 1; at < path.size();) {
    const size_t end = std::min(path.find('/', at), path.size());
    if (end > at) steps.push_back(path.substr(0, end));
    at = end + 1;
  }
  return steps;
}

std::string Target(const std::string& link) {
  char text[PATH_MAX];
  const ssize_t size = readlink(link.c_str(), text, sizeof text);
  const std::string target(text, size > 0 ? static_cast<size_t>(size) : 0);
  return target.empty() || target[0] == '/' ? target : link.substr(0, link.rfind('/') + 1) + target;
}

// In a sticky folder nobody can replace the files of root, which are looked at next.
bool IsOpen(const struct stat& status) {
  if (status.st_uid != 0) return true;
  if (S_ISLNK(status.st_mode)) return false;
  if (S_ISDIR(status.st_mode) && (status.st_mode & S_ISVTX) != 0) return false;
  return (status.st_mode & S_IWOTH) != 0 || ((status.st_mode & S_IWGRP) != 0 && status.st_gid != 0);
}

std::optional<Spot> Walk(const std::string& path, int links) {
  for (const std::string& step : Steps(path)) {
    Spot spot{step};
    if (lstat(step.c_str(), &spot.status) != 0) return std::nullopt;
    if (IsOpen(spot.status)) return spot;
    if (!S_ISLNK(spot.status.st_mode) || links == 0) continue;
    if (const auto behind = Walk(Target(step), links - 1)) return behind;
  }
  return std::nullopt;
}

}  // namespace

std::string Spot::Owner() const {
  return "owner " + std::to_string(status.st_uid) + ", group " + std::to_string(status.st_gid) +
         ", mode " + Mode(status);
}

std::optional<Spot> WritableByOthers(const std::string& path) {
  return Walk(path, kDeepestLink);
}

std::optional<Spot> ClosedTo(const Caller& caller, const std::string& path, int mode) {
  // Behind links first: what is closed there keeps the link itself from being passed.
  std::error_code error;
  const std::string real = std::filesystem::canonical(path, error);
  std::vector<std::string> steps = Steps(real);
  for (const std::string& step : Steps(path)) steps.push_back(step);
  const Reply reply = Ask(
      [&] {
        for (const std::string& step : steps) {
          const bool last = step == path || step == real;
          if (faccessat(AT_FDCWD, step.c_str(), last ? mode : X_OK, AT_EACCESS) != 0) {
            return Json::Value(step);
          }
        }
        return Json::Value();
      },
      kSeconds, &caller);
  if (!reply.result.isString()) return std::nullopt;
  Spot spot{reply.result.asString()};
  return stat(spot.path.c_str(), &spot.status) == 0 ? std::optional<Spot>(spot) : std::nullopt;
}

std::string Mode(const struct stat& status) {
  char text[16];
  std::snprintf(text, sizeof text, "%04o", static_cast<unsigned>(status.st_mode & 07777));
  return text;
}

}  // namespace doctor
