// The device as a fuzz target sets it up: its configuration files, its clock, its system log.
// open(), time() and syslog() are defined in the fuzz program; nothing of the machine is touched.
#pragma once

#include <cstddef>
#include <ctime>
#include <map>
#include <string>
#include <vector>

namespace fuzz {

// The clock does not move here, in May 2033.
constexpr std::time_t kNow = 2000000000;

struct Device {
  // "profile.conf" and so on; a file that is not in here does not exist.
  std::map<std::string, std::string> files;
  // Names that are a folder: they can be opened, but not read.
  std::vector<std::string> folders;
  // Lines of the system log since the last reset.
  int logLines = 0;

  void reset();
  std::size_t openFiles() const;

  std::vector<int> handedOut;
};

Device& device();

// The settings that all targets use, unless they are what is fuzzed.
constexpr char kClientID[] = "device-17";
constexpr char kTenant[] = "tenant-4";
constexpr char kSecret[] = "the secret of device-17";
constexpr char kTokenURL[] = "https://provider.example/token";
constexpr char kWellknownURL[] = "https://provider.example/wellknown";
void writeSettings();

}  // namespace fuzz
