#include "support/device.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/syscall.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstring>

#include "support/target.h"

namespace fuzz {
namespace {

constexpr char kFolder[] = "/usr/qova/etc/ssoclient/";

int openFile(const std::string& name) {
  const auto& folders = device().folders;
  if (std::find(folders.begin(), folders.end(), name) != folders.end()) {
    return static_cast<int>(syscall(SYS_openat, AT_FDCWD, "/", O_RDONLY | O_DIRECTORY));
  }
  const auto found = device().files.find(name);
  if (found == device().files.end()) {
    errno = ENOENT;
    return -1;
  }
  const int file = memfd_create("configuration", MFD_CLOEXEC);
  const std::string& text = found->second;
  require(write(file, text.data(), text.size()) == static_cast<ssize_t>(text.size()), "write");
  lseek(file, 0, SEEK_SET);
  return file;
}

// The text of a log line is made and dropped: the address check sees its arguments.
void record(const char* format, va_list arguments) {
  char line[2048];
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
  std::vsnprintf(line, sizeof line, format, arguments);
#pragma GCC diagnostic pop
  ++device().logLines;
}

}  // namespace

Device& device() {
  static Device one;
  return one;
}

void Device::reset() {
  files.clear();
  folders.clear();
  handedOut.clear();
  logLines = 0;
}

std::size_t Device::openFiles() const {
  return static_cast<std::size_t>(std::count_if(
      handedOut.begin(), handedOut.end(), [](int file) { return fcntl(file, F_GETFD) >= 0; }));
}

void writeSettings() {
  device().files["azure.conf"] = R"({"azure_sso_enable":true,"azure_client_id":"device-17",
    "azure_client_secret":"the secret of device-17","azure_tenant_id":"tenant-4",
    "azure_wellknown":"https://provider.example/wellknown",
    "azure_authorization_endpoint":"https://provider.example/authorize",
    "azure_token_endpoint":"https://provider.example/token",
    "azure_logout_endpoint":"https://provider.example/logout",
    "azure_redirect_uri":"https://device.example/webman/login.cgi"})";
  device().files["websphere.conf"] = R"({"websphere_client_id":"device-17",
    "websphere_client_secret":"the secret of device-17",
    "websphere_authorization_endpoint":"https://provider.example/authorize",
    "websphere_token_endpoint":"https://provider.example/token",
    "websphere_redirect_uri":"https://device.example/webman/login.cgi"})";
}

}  // namespace fuzz

// The linker takes these before those of the C library.
extern "C" {

int open(const char* path, int flags, ...) {
  va_list arguments;
  va_start(arguments, flags);
  const int mode = (flags & O_CREAT) != 0 ? va_arg(arguments, int) : 0;
  va_end(arguments);
  if (std::strncmp(path, fuzz::kFolder, sizeof fuzz::kFolder - 1) != 0) {
    return static_cast<int>(syscall(SYS_openat, AT_FDCWD, path, flags, mode));
  }
  const int file = fuzz::openFile(path + sizeof fuzz::kFolder - 1);
  if (file >= 0) fuzz::device().handedOut.push_back(file);
  return file;
}

std::time_t time(std::time_t* result) noexcept {
  if (result != nullptr) *result = fuzz::kNow;
  return fuzz::kNow;
}

void syslog(int, const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  fuzz::record(format, arguments);
  va_end(arguments);
}

void __syslog_chk(int, int, const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  fuzz::record(format, arguments);
  va_end(arguments);
}

}  // extern "C"
