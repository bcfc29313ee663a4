#include "trial.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <signal.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <memory>
#include <new>
#include <stdexcept>

#include "guarded.h"

#ifdef __SANITIZE_ADDRESS__
// Freed memory is used again soon, so that a check of growth sees growth.
extern "C" const char* __asan_default_options() {
  return "quarantine_size_mb=0:thread_local_quarantine_size_kb=0:detect_leaks=0";
}
#endif

namespace port {

namespace {

// What the line's process leaves for the one that waits for it.
struct Shared {
  Verdict verdict;
  bool concluded;
  char call[400];
  char detail[1000];
};
Shared* shared = nullptr;

void Put(char* place, size_t size, const std::string& text) {
  snprintf(place, size, "%s", text.c_str());
}

[[noreturn]] void Conclude(Verdict verdict, const std::string& detail) {
  shared->verdict = verdict;
  Put(shared->detail, sizeof shared->detail, detail);
  shared->concluded = true;
  _exit(0);  // no cleaning up by the functions under check
}

std::string WithCall(const std::string& detail) {
  if (shared->call[0] == '\0') return detail;
  return std::string(shared->call) + ": " + detail;
}

// The process ends here, so what is not safe in a handler does no lasting harm.
void OnFault(int number, siginfo_t* info, void*) {
  const std::string place = Guarded::Place(info->si_addr);
  Broken(place.empty() ? std::string("crashed (") + strsignal(number) + ")" : place);
}

void CatchFaults() {
  static char stack[65536];  // the functions may have used up the other one
  const stack_t own = {stack, 0, sizeof stack};
  sigaltstack(&own, nullptr);
  struct sigaction action = {};
  action.sa_sigaction = OnFault;
  action.sa_flags = SA_SIGINFO | SA_ONSTACK;
  for (const int number : {SIGSEGV, SIGBUS, SIGFPE, SIGILL}) sigaction(number, &action, nullptr);
}

// A private folder, so that nothing that is run finds or leaves files elsewhere.
class Folder {
 public:
  Folder() {
    if (mkdtemp(path) == nullptr) throw std::runtime_error("no folder below /tmp");
  }
  ~Folder() {
    const std::string command = std::string("rm -rf '") + path + "'";
    if (system(command.c_str()) != 0) fprintf(stderr, "%s is left\n", path);
  }
  Folder(const Folder&) = delete;
  Folder& operator=(const Folder&) = delete;

  char path[32] = "/tmp/ssoclient-port-XXXXXX";
};

template <class Type>
Type* Find(void* library, const char* name) {
  void* symbol = dlsym(library, name);
  if (symbol == nullptr) Broken(std::string(name) + " is missing");
  return reinterpret_cast<Type*>(symbol);
}

// The functions by name, or from the table of a library that was made from an archive.
Platform Load(const std::string& file) {
  void* library = dlopen(file.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (library == nullptr) NotJudged(dlerror());
  using Any = void (*)();
  if (void* table = dlsym(library, "ssoclient_platform_table")) {
    const Any* entries = static_cast<const Any*>(table);
    Platform platform;
    static_assert(sizeof platform == 4 * sizeof(Any), "");
    memcpy(&platform, entries, sizeof platform);
    return platform;
  }
  return {Find<int(const char*, size_t, char*, size_t, int)>(library, "QOVABase64Encode"),
          Find<int(const char*, size_t, char*, size_t*)>(library, "QOVABase64Decode"),
          Find<int(const char*, char*, size_t)>(library, "QOVACGIURLEncode"),
          Find<int(const char*, char*, size_t)>(library, "QOVAWinsUserNameFqdn2Netbios")};
}

[[noreturn]] void Child(const Line& line, const Options& options, const char* folder) {
  setpgid(0, 0);
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  const rlimit none = {0, 0};
  setrlimit(RLIMIT_CORE, &none);
  if (chdir(folder) != 0 || freopen("output", "w", stdout) == nullptr ||
      freopen("errors", "w", stderr) == nullptr) {
    NotJudged("no room below /tmp");
  }
  CatchFaults();
  try {
    const Platform platform = Load(options.file);
    line.check(platform, options);
  } catch (const std::exception& error) {
    Broken(std::string("threw a C++ exception: ") + error.what());
  } catch (...) {
    Broken("threw a C++ exception");
  }
  Conclude(Verdict::kKept, "");
}

// Waits for a process; false if it had to be ended.
bool EndsInTime(pid_t child, unsigned seconds, int& status) {
  using Clock = std::chrono::steady_clock;
  const Clock::time_point end = Clock::now() + std::chrono::seconds(seconds);
  useconds_t pause = 200;
  while (waitpid(child, &status, WNOHANG) == 0) {
    if (Clock::now() > end) {
      kill(-child, SIGKILL);
      waitpid(child, &status, 0);
      return false;
    }
    usleep(pause);
    if (pause < 10000) pause *= 2;
  }
  kill(-child, SIGKILL);  // what it may have started
  return true;
}

// What a sanitizer or the C library printed last before the process ended.
std::string LastWords(const std::string& folder) {
  const std::unique_ptr<FILE, int (*)(FILE*)> file(fopen((folder + "/errors").c_str(), "r"),
                                                   fclose);
  std::string words;
  char line[300];
  while (file != nullptr && fgets(line, sizeof line, file.get()) != nullptr) {
    const std::string text(line, strcspn(line, "\n"));
    for (const char* sign : {"SUMMARY:", "runtime error:", "***"}) {
      if (text.find(sign) != std::string::npos) words = text;
    }
  }
  return words.empty() ? "" : " (" + words + ")";
}

Outcome OutcomeOf(bool in_time, int status, unsigned seconds, const char* folder) {
  if (!in_time) {
    return {Verdict::kBroken,
            WithCall("did not return within " + std::to_string(seconds) + " seconds")};
  }
  if (shared->concluded) return {shared->verdict, shared->detail};
  const std::string end = WIFSIGNALED(status)
                              ? strsignal(WTERMSIG(status))
                              : "exit status " + std::to_string(WEXITSTATUS(status));
  return {Verdict::kBroken, WithCall("ended the process: " + end + LastWords(folder))};
}

}  // namespace

void Broken(const std::string& detail) {
  Conclude(Verdict::kBroken, WithCall(detail));
}

void NotJudged(const std::string& detail) {
  Conclude(Verdict::kNotJudged, detail);
}

void Expect(bool kept, const std::string& detail) {
  if (!kept) Broken(detail);
}

void About(const std::string& call) {
  Put(shared->call, sizeof shared->call, call);
}

std::string Shown(const std::string& text) {
  std::string shown = "\"";
  for (const char c : text.substr(0, 40)) {
    char escaped[8] = {c, '\0'};
    if (c < 0x20 || c > 0x7e) {
      snprintf(escaped, sizeof escaped, "\\x%02x", static_cast<unsigned char>(c));
    }
    shown += escaped;
  }
  return shown + (text.size() > 40 ? "\"... (" + std::to_string(text.size()) + " bytes)" : "\"");
}

Outcome Try(const Line& line, const Options& options) {
  if (shared == nullptr) {
    void* memory =
        mmap(nullptr, sizeof(Shared), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    if (memory == MAP_FAILED) throw std::bad_alloc();
    shared = static_cast<Shared*>(memory);
  }
  *shared = {};
  const Folder folder;
  fflush(stdout);
  const pid_t child = fork();
  if (child < 0) throw std::runtime_error("no process");
  if (child == 0) Child(line, options, folder.path);
  int status = 0;
  const bool in_time = EndsInTime(child, options.seconds, status);
  return OutcomeOf(in_time, status, options.seconds, folder.path);
}

Outcome TryToLoad(const Options& options) {
  const Line nothing = {"load", "", [](const Platform&, const Options&) {}};
  return Try(nothing, options);
}

}  // namespace port
