#include "sso/internal/libcurl.h"

#include "sso/common.h"

#ifdef SSOCLIENT_LATE_CURL
#include <dlfcn.h>

#include <cstdint>
#endif

namespace QOVA {
namespace SSO {

#ifdef SSOCLIENT_LATE_CURL

namespace {

#define SONAME "libcurl.so.4"

// The dependency that the dynamic section no longer shows, for those who make packages: an ELF
// note of the form "FDO" 0x407c0c0a, ELF dlopen metadata (systemd.io/ELF_DLOPEN_METADATA).
#define DEPENDENCY "[{\"feature\":\"http\",\"priority\":\"required\",\"soname\":[\"" SONAME "\"]}]"

struct DlopenNote {
  std::uint32_t name_size;
  std::uint32_t json_size;
  std::uint32_t type;
  char name[4];
  alignas(4) char json[sizeof DEPENDENCY];
};

alignas(4) __attribute__((used, section(".note.dlopen"))) const DlopenNote kDlopenNote = {
    sizeof kDlopenNote.name, sizeof kDlopenNote.json, 0x407c0c0a, "FDO", DEPENDENCY};

// Finds one function in `library` and counts those that are missing.
template <typename Function>
int Find(void* library, const char* name, Function& function) {
  function = reinterpret_cast<Function>(dlsym(library, name));
  return function == nullptr ? 1 : 0;
}

// Finds all functions in one library: those of two would not understand each other's handles.
bool FindAll(void* library, Curl& curl) {
  return Find(library, "curl_global_init", curl.global_init) +
             Find(library, "curl_global_cleanup", curl.global_cleanup) +
             Find(library, "curl_easy_init", curl.easy_init) +
             Find(library, "curl_easy_cleanup", curl.easy_cleanup) +
             Find(library, "curl_easy_setopt", curl.easy_setopt) +
             Find(library, "curl_easy_perform", curl.easy_perform) +
             Find(library, "curl_easy_strerror", curl.easy_strerror) ==
         0;
}

// The libcurl that the program has already, by linking or preloading; or else the system's, which
// stays until the program ends.
Curl FindCurl() {
  Curl curl;
  if (FindAll(RTLD_DEFAULT, curl)) return curl;
  void* const library = dlopen(SONAME, RTLD_LAZY | RTLD_LOCAL);
  if (library == nullptr || !FindAll(library, curl)) {
    const char* const text = dlerror();
    throw sso_err_resp(text != nullptr ? text : SONAME);
  }
  return curl;
}

}  // namespace

const Curl& LoadCurl() {
  static const Curl curl = FindCurl();
  return curl;
}

#else

const Curl& LoadCurl() {
  static const Curl curl = {curl_global_init,  curl_global_cleanup, curl_easy_init,
                            curl_easy_cleanup, curl_easy_setopt,    curl_easy_perform,
                            curl_easy_strerror};
  return curl;
}

#endif

void CleanUpCurl() {
  try {
    LoadCurl().global_cleanup();
  } catch (const sso_err_resp&) {
    // No request was made without it either.
  }
}

}  // namespace SSO
}  // namespace QOVA
