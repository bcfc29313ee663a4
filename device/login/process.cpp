#include "process.h"

#include <dirent.h>
#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>

#include "random.h"

namespace process {
namespace {

constexpr int kFirstDeadline = 30;         // until the settings are read
constexpr rlim_t kChildMemory = 64 << 20;  // beyond what it has when it starts
#ifdef __SANITIZE_ADDRESS__                // whose shadow takes terabytes
constexpr bool kLimitMemory = false;
#else
constexpr bool kLimitMemory = true;
#endif
constexpr rlim_t kChildFile = 1 << 20;

volatile sig_atomic_t answered = 0;
char reference[9] = "22222222";  // made early: a signal handler cannot

// A line to the system log, without syslog(): that waits as long as the log's socket is full. This
// waits half a second at most.
void LogQuickly(const char* name, const char* text) {
  char line[256];
  const int size = std::snprintf(line, sizeof line, "<11>login.cgi: sign-in failed [%s]: %s: %s",
                                 reference, name, text);
  const int log = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
  sockaddr_un address{AF_UNIX, "/dev/log"};
  if (connect(log, reinterpret_cast<sockaddr*>(&address), sizeof address) == 0) {
    pollfd room{log, POLLOUT, 0};
    for (int i = 0; i < 5 && send(log, line, static_cast<size_t>(size), MSG_NOSIGNAL) < 0; ++i) {
      poll(&room, 1, 100);
    }
  }
}

void OnDeadline(int) {
  alarm(2);  // the web server may not read: the next signal has no handler
  EndNow("timeout", "the program's deadline passed");
}

void ResetSignals() {
  for (int number = 1; number < NSIG; ++number) signal(number, SIG_DFL);
  sigset_t none;
  sigemptyset(&none);
  sigprocmask(SIG_SETMASK, &none, nullptr);
}

// What an older kernel needs in place of close_range.
void CloseOneByOne() {
  const std::unique_ptr<DIR, int (*)(DIR*)> folder(opendir("/proc/self/fd"), closedir);
  if (!folder) return;
  while (const dirent* entry = readdir(folder.get())) {
    const int file = std::atoi(entry->d_name);
    if (file > STDERR_FILENO && file != dirfd(folder.get())) close(file);
  }
}

// Descriptors 0 to 2 are open, all others closed: no file of the program gets a standard number.
void ResetDescriptors() {
  int file = open("/dev/null", O_RDWR);
  while (file >= 0 && file <= STDERR_FILENO) file = open("/dev/null", O_RDWR);
#ifdef SYS_close_range
  if (syscall(SYS_close_range, STDERR_FILENO + 1, ~0U, 0) == 0) return;
#endif
  CloseOneByOne();
}

void Limit(int resource, rlim_t value) {
  rlimit limit;
  if (getrlimit(static_cast<__rlimit_resource_t>(resource), &limit) != 0) return;
  if (limit.rlim_max == RLIM_INFINITY || limit.rlim_max > value) limit.rlim_max = value;
  limit.rlim_cur = limit.rlim_max;
  setrlimit(static_cast<__rlimit_resource_t>(resource), &limit);
}

// The address space that is in use, in bytes.
rlim_t AddressSpace() {
  unsigned long pages = 0;
  if (std::FILE* const file = std::fopen("/proc/self/statm", "re")) {
    if (std::fscanf(file, "%lu", &pages) != 1) pages = 0;
    std::fclose(file);
  }
  return pages * static_cast<rlim_t>(sysconf(_SC_PAGESIZE));
}

}  // namespace

void Settle() {
  ResetSignals();
  ResetDescriptors();
  umask(077);
  Limit(RLIMIT_CORE, 0);
  KeepPrivate();
  const std::string random = Reference();
  std::memcpy(reference, random.c_str(), sizeof reference);
  SetDeadline(kFirstDeadline);
}

void KeepPrivate() {
  prctl(PR_SET_DUMPABLE, 0, 0, 0, 0);
}

void SetDeadline(int seconds) {
  struct sigaction action {};
  action.sa_handler = OnDeadline;
  action.sa_flags = static_cast<int>(SA_RESETHAND | SA_NODEFER);
  sigaction(SIGALRM, &action, nullptr);
  alarm(static_cast<unsigned>(seconds));
}

void Answered() {
  answered = 1;
}

void EndNow(const char* name, const char* text) {
  if (answered == 0) {
    char page[256];
    const int size = std::snprintf(page, sizeof page,
                                   "Status: 302 Found\nCache-Control: no-store\nLocation: "
                                   "/webman/ssoclient/relay.html#reason=%s.%s&success=false\n\n",
                                   name, reference);
    (void)!write(STDOUT_FILENO, page, static_cast<size_t>(size));
  }
  LogQuickly(name, text);
  _exit(1);
}

void Confine(pid_t parent, int seconds) {
  signal(SIGALRM, SIG_DFL);
  alarm(static_cast<unsigned>(seconds) + 1);
  Limit(RLIMIT_CPU, static_cast<rlim_t>(seconds));
  Limit(RLIMIT_FSIZE, kChildFile);
  if (kLimitMemory) Limit(RLIMIT_AS, AddressSpace() + kChildMemory);
  DieWithParent(parent);
}

void DieWithParent(pid_t parent) {
  prctl(PR_SET_PDEATHSIG, SIGKILL, 0, 0, 0);
  if (getppid() != parent) _exit(1);  // it ended before the call
}

void SetProxy(const Settings& settings) {
  if (!settings.proxy.empty()) setenv("all_proxy", settings.proxy.c_str(), 1);
  if (!settings.no_proxy.empty()) setenv("no_proxy", settings.no_proxy.c_str(), 1);
}

}  // namespace process
