#include "doctor/privileges.h"

#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <regex>

namespace doctor {

namespace {

namespace fs = std::filesystem;

struct Process {
  std::string name;
  uid_t user = 0;
  bool no_new_privileges = false;
};

// Of /proc/NUMBER or /proc/self.
Process ReadProcess(const std::string& folder) {
  Process process;
  std::ifstream status(folder + "/status");
  for (std::string key; status >> key;) {
    if (key == "Name:") status >> process.name;
    if (key == "Uid:") status >> process.user;
    if (key == "NoNewPrivs:") status >> process.no_new_privileges;
    std::getline(status, key);
  }
  return process;
}

// The last setting in the file counts.
void ReadUnit(const fs::path& file, NoNewPrivileges& found) {
  static const std::regex kLine("^NoNewPrivileges[ \t]*=[ \t]*([A-Za-z0-9]*)[ \t\r]*$");
  static const std::regex kTrue("1|yes|true|on|y|t", std::regex::icase);
  std::ifstream unit(file);
  std::smatch match;
  for (std::string line; std::getline(unit, line);) {
    if (!std::regex_match(line, match, kLine)) continue;
    found = {};
    if (std::regex_match(match[1].str(), kTrue)) {
      found = {"the unit " + file.filename().string() + " of the web server", file};
    }
  }
}

// The units of web servers, and what is added to them; /etc goes before /usr/lib.
NoNewPrivileges FindInUnits() {
  static const std::regex kServer(
      "(apache2|httpd|nginx|lighttpd|caddy|fcgiwrap|spawn-fcgi|thttpd|hiawatha|cherokee|uhttpd)"
      "(@.*)?\\.service(\\.d)?");
  NoNewPrivileges found;
  std::error_code error;
  for (const char* folder : {"/usr/lib/systemd/system", "/lib/systemd/system",
                             "/etc/systemd/system", "/run/systemd/system"}) {
    for (const auto& entry : fs::directory_iterator(folder, error)) {
      if (!std::regex_match(entry.path().filename().string(), kServer)) continue;
      if (!entry.is_directory(error)) {
        ReadUnit(entry.path(), found);
        continue;
      }
      for (const auto& part : fs::directory_iterator(entry.path(), error)) {
        if (part.path().extension() == ".conf") ReadUnit(part.path(), found);
      }
    }
  }
  return found;
}

}  // namespace

NoNewPrivileges FindNoNewPrivileges(uid_t user) {
  NoNewPrivileges found;
  std::error_code error;
  bool without = false;
  for (const auto& entry : fs::directory_iterator("/proc", error)) {
    const std::string number = entry.path().filename();
    if (number.find_first_not_of("0123456789") != std::string::npos) continue;
    const Process process = ReadProcess(entry.path());
    if (process.name.empty() || process.user != user || user == 0) continue;
    without = without || !process.no_new_privileges;
    found.where = "the process " + number + " (" + process.name + ") of the web server's user";
  }
  if (without) return {};
  if (!found.where.empty()) return found;
  if (ReadProcess("/proc/self").no_new_privileges) return {"this command itself", ""};
  return FindInUnits();
}

}  // namespace doctor
