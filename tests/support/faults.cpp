#include "support/faults.h"

#include <dlfcn.h>
#include <openssl/bio.h>

#include <cstring>

namespace {

const char* armed = nullptr;
int calls_left = 0;
bool hit = false;

template <typename Function>
Function* real(const char* name) {
  return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

}  // namespace

namespace test {

Fault::Fault(const char* function, int nth) {
  armed = function;
  hit = false;
  calls_left = nth;
}

Fault::~Fault() {
  calls_left = 0;
}

bool Fault::wasHit() const {
  return hit;
}

bool isFromLibrary(const void* caller) {
  Dl_info info;
  return dladdr(caller, &info) != 0 && std::strstr(info.dli_fname, "libssoclient.so") != nullptr;
}

bool failsNow(const char* function, const void* caller) {
  if (calls_left == 0 || std::strcmp(armed, function) != 0 || !isFromLibrary(caller)) return false;
  hit = --calls_left == 0;
  return hit;
}

}  // namespace test

// FAULTY(RESULT, NAME, PARAMETERS, ARGUMENTS, FAILED): comes before the function of that name.
// Weak, so that a test program may have one of its own instead.
#define FAULTY(RESULT, NAME, PARAMETERS, ARGUMENTS, FAILED)                  \
  extern "C" __attribute__((weak)) RESULT NAME PARAMETERS {                  \
    static auto* const next = real<RESULT PARAMETERS>(#NAME);                \
    if (test::failsNow(#NAME, __builtin_return_address(0))) return (FAILED); \
    return next ARGUMENTS;                                                   \
  }

#include "support/faulty_openssl.h"

// BIO_pending is a form of BIO_ctrl; it fails under its own name.
extern "C" long BIO_ctrl(BIO* bio, int command, long number, void* argument) {
  static auto* const next = real<long(BIO*, int, long, void*)>("BIO_ctrl");
  if (command == BIO_CTRL_PENDING && test::failsNow("BIO_pending", __builtin_return_address(0)))
    return -1;
  return next(bio, command, number, argument);
}
