#include "support/curl_spy.h"

#include <dlfcn.h>

#include <cerrno>
#include <cstdarg>

#include "support/support_call.h"

#undef curl_easy_setopt

namespace {

test::CurlSpy* spy = nullptr;

template <typename Function>
Function next(const char* name) {
  return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

// What libcurl calls itself, from within a call, is its own business.
class Inside {
 public:
  Inside() { spy = nullptr; }
  ~Inside() { spy = outside; }
  Inside(const Inside&) = delete;
  Inside& operator=(const Inside&) = delete;

 private:
  test::CurlSpy* outside = spy;
};

void note(const std::string& call) {
  if (spy != nullptr) spy->calls.push_back(call);
}

}  // namespace

#define SPY extern "C" __attribute__((visibility("default")))

SPY CURLcode curl_global_init(long flags) {
  const test::SupportCall call;
  note("global_init " + std::to_string(flags));
  test::CurlSpy* const told = spy;
  const Inside inside;
  const CURLcode result = next<CURLcode (*)(long)>("curl_global_init")(flags);
  return told != nullptr && told->globalInitResult != CURLE_OK ? told->globalInitResult : result;
}

SPY void curl_global_cleanup() {
  const test::SupportCall call;
  note("global_cleanup");
  const Inside inside;
  next<void (*)()>("curl_global_cleanup")();
}

SPY CURL* curl_easy_init() {
  const test::SupportCall call;
  note("easy_init");
  if (spy != nullptr && spy->noHandle) {
    errno = ENOMEM;
    return nullptr;
  }
  const Inside inside;
  return next<CURL* (*)()>("curl_easy_init")();
}

SPY void curl_easy_cleanup(CURL* handle) {
  const test::SupportCall call;
  if (handle != nullptr) note("easy_cleanup");
  const Inside inside;
  next<void (*)(CURL*)>("curl_easy_cleanup")(handle);
}

SPY CURLcode curl_easy_perform(CURL* handle) {
  const test::SupportCall call;
  note("perform");
  if (spy != nullptr && spy->onPerform) return spy->onPerform(handle);
  const Inside inside;
  return next<CURLcode (*)(CURL*)>("curl_easy_perform")(handle);
}

SPY CURLcode curl_easy_setopt(CURL* handle, CURLoption option, ...) {
  const test::SupportCall call;
  note(std::string("setopt ") + curl_easy_option_by_id(option)->name);
  const auto real = next<CURLcode (*)(CURL*, CURLoption, ...)>("curl_easy_setopt");
  va_list arguments;
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wvarargs"  // libcurl declares it so: the last name is an enum
  va_start(arguments, option);
#pragma GCC diagnostic pop
  CURLcode result;
  if (option < CURLOPTTYPE_OBJECTPOINT) {
    const long number = va_arg(arguments, long);
    if (spy != nullptr) spy->numbers[option] = number;
    result = real(handle, option, number);
  } else {
    void* const pointer = va_arg(arguments, void*);
    if (spy != nullptr) spy->pointers[option] = pointer;
    result = real(handle, option, pointer);
  }
  va_end(arguments);
  return spy != nullptr && spy->setoptResult != CURLE_OK ? spy->setoptResult : result;
}

namespace test {

CurlSpy::CurlSpy() {
  spy = this;
}
CurlSpy::~CurlSpy() {
  spy = nullptr;
}

}  // namespace test
