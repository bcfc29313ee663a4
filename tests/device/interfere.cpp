// Preloaded by the dynamic loader: system calls that fail when a file of the test says so.
#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <stdlib.h>
#include <sys/random.h>
#include <unistd.h>

namespace {

int calls = 0;

// The number in a file; 0 if there is none.
int Number(const char* path) {
  char text[16] = {};
  const int file = open(path, O_RDONLY | O_CLOEXEC);
  if (file < 0) return 0;
  const ssize_t size = read(file, text, sizeof text - 1);
  close(file);
  return size > 0 ? atoi(text) : 0;
}

}  // namespace

extern "C" {

ssize_t getrandom(void* buffer, size_t size, unsigned flags) noexcept {
  if (Number("/run/stage/no-getrandom") != 0) {
    errno = ENOSYS;
    return -1;
  }
  using Function = ssize_t (*)(void*, size_t, unsigned);
  return reinterpret_cast<Function>(dlsym(RTLD_NEXT, "getrandom"))(buffer, size, flags);
}

// Of the calls that give root back, the one with that number fails.
int setresuid(uid_t real, uid_t effective, uid_t saved) noexcept {
  const bool lowers = real == static_cast<uid_t>(-1) && effective != 0;
  if (lowers && ++calls == Number("/run/stage/stay-root")) {
    errno = EAGAIN;
    return -1;
  }
  using Function = int (*)(uid_t, uid_t, uid_t);
  return reinterpret_cast<Function>(dlsym(RTLD_NEXT, "setresuid"))(real, effective, saved);
}
}
