// Some of what the library calls is deprecated.
#define OPENSSL_API_COMPAT 0x10100000L

#include "faults/faults.h"

#include <curl/curl.h>
#include <dlfcn.h>
#include <fcntl.h>
#include <link.h>
#include <openssl/bio.h>
#include <openssl/md5.h>
#include <sys/random.h>
#include <unistd.h>

#include <cerrno>
#include <cstdarg>
#include <cstdint>
#include <cstring>
#include <new>

#include "support/support_call.h"

#undef curl_easy_setopt

// glibc's own, by the names that a program's replacements can call.
extern "C" void* __libc_malloc(std::size_t size);
extern "C" void* __libc_calloc(std::size_t count, std::size_t size);
extern "C" void* __libc_realloc(void* memory, std::size_t size);
extern "C" void* __libc_memalign(std::size_t alignment, std::size_t size);
extern "C" void __libc_free(void* memory);

namespace {

using faults::Kind;

bool armed = false;
faults::Plan plan = {Kind::kMemory, 0, false};
faults::Seen last = {false, "", 0, 0};
long counts[2] = {0, 0};
long idsChanges = 0;

faults::Called called[64];
std::size_t calledNames = 0;

void tally(const char* name) {
  std::size_t i = 0;
  while (i < calledNames && std::strcmp(called[i].name, name) != 0) ++i;
  if (i == sizeof called / sizeof *called) return;
  if (i == calledNames) called[calledNames++] = {name, 0};
  ++called[i].times;
}

// Whether this call is one to fail.
bool fails(Kind kind, const char* name) {
  if (!armed || test::support_calls != 0) return false;
  const long count = ++counts[kind == Kind::kCall];
  tally(name);
  if (plan.nth == 0 || plan.kind != kind) return false;
  if (count < plan.nth || (count > plan.nth && !plan.allAfter)) return false;
  if (count == plan.nth) last = {true, name, last.idsChange, last.looks};
  return true;
}

// --- memory

struct Block {
  void* memory;
  const void* caller;
};
constexpr std::size_t kSlots = 1 << 18;
Block blocks[kSlots];  // a hash table; kGone marks a slot that was emptied
void* const kGone = blocks;
long live = 0;
std::size_t used = 0;

std::size_t slotOf(const void* memory) {
  return (reinterpret_cast<std::uintptr_t>(memory) >> 4) * 2654435761u % kSlots;
}

bool tracked = true;

void sweep();

void* note(void* memory, const void* caller) {
  if (!tracked || !armed || test::support_calls != 0 || memory == nullptr) return memory;
  if (used > kSlots / 2) sweep();
  std::size_t slot = slotOf(memory);
  while (blocks[slot].memory != nullptr && blocks[slot].memory != kGone) slot = (slot + 1) % kSlots;
  if (blocks[slot].memory == nullptr) ++used;
  blocks[slot] = {memory, caller};
  ++live;
  return memory;
}

// Takes out the slots that were emptied.
void sweep() {
  static Block all[kSlots];
  std::memcpy(all, blocks, sizeof all);
  std::memset(blocks, 0, sizeof blocks);
  used = 0;
  for (const Block& block : all) {
    if (block.memory == nullptr || block.memory == kGone) continue;
    std::size_t slot = slotOf(block.memory);
    while (blocks[slot].memory != nullptr) slot = (slot + 1) % kSlots;
    blocks[slot] = block;
    ++used;
  }
  if (used > kSlots / 4) abort();  // too small a table
}

void forget(const void* memory) {
  if (live == 0 || memory == nullptr) return;
  for (std::size_t slot = slotOf(memory); blocks[slot].memory != nullptr;
       slot = (slot + 1) % kSlots) {
    if (blocks[slot].memory != memory) continue;
    blocks[slot].memory = kGone;
    --live;
    return;
  }
}

void* exhausted() {
  errno = ENOMEM;
  return nullptr;
}

void* newOrThrow(std::size_t size, const void* caller) {
  if (fails(Kind::kMemory, "operator new")) {
    errno = ENOMEM;
    throw std::bad_alloc();
  }
  void* const memory = __libc_malloc(size == 0 ? 1 : size);
  if (memory == nullptr) throw std::bad_alloc();
  return note(memory, caller);
}

void* newOrNull(std::size_t size, const void* caller) {
  if (fails(Kind::kMemory, "operator new")) return nullptr;
  return note(__libc_malloc(size == 0 ? 1 : size), caller);
}

void release(void* memory) {
  forget(memory);
  __libc_free(memory);
}

// --- the library's own calls

struct Range {
  std::uintptr_t begin = 0;
  std::uintptr_t end = 0;
  std::string file;
};
Range library;

int findLibrary(dl_phdr_info* info, std::size_t, void*) {
  if (std::strstr(info->dlpi_name, "libssoclient.so") == nullptr) return 0;
  library.file = info->dlpi_name;
  for (int i = 0; i < info->dlpi_phnum; ++i) {
    const auto& header = info->dlpi_phdr[i];
    if (header.p_type != PT_LOAD || (header.p_flags & PF_X) == 0) continue;
    library.begin = info->dlpi_addr + header.p_vaddr;
    library.end = library.begin + header.p_memsz;
  }
  return 1;
}

bool isLibrary(const void* caller) {
  const auto address = reinterpret_cast<std::uintptr_t>(caller);
  return address >= library.begin && address < library.end;
}

bool failsFor(const void* caller, const char* name) {
  return isLibrary(caller) && fails(Kind::kCall, name);
}

// The functions below and what is behind them, looked up before the first run.
struct Behind {
  const char* name;
  void** address;
};
constexpr std::size_t kMost = 64;
Behind behind[kMost];
std::size_t behindCount = 0;

struct Registered {
  Registered(const char* name, void** address) { behind[behindCount++] = {name, address}; }
};

#define CALLER __builtin_return_address(0)
#define SPY extern "C" __attribute__((visibility("default")))

}  // namespace

// BEHIND(NAME): next_NAME() is the real function of that name; it may be called before main.
#define BEHIND(NAME)                                                         \
  static void* address_##NAME;                                               \
  static const Registered registered_##NAME(#NAME, &address_##NAME);         \
  static auto next_##NAME() {                                                \
    if (address_##NAME == nullptr) address_##NAME = dlsym(RTLD_NEXT, #NAME); \
    return reinterpret_cast<decltype(&NAME)>(address_##NAME);                \
  }                                                                          \
  static_assert(true, "takes a semicolon")

// FAULTY(RESULT, NAME, PARAMETERS, ARGUMENTS, FAILED): comes before the function of that name.
#define FAULTY(RESULT, NAME, PARAMETERS, ARGUMENTS, FAILED) \
  BEHIND(NAME);                                             \
  SPY RESULT NAME PARAMETERS {                              \
    if (failsFor(CALLER, #NAME)) return (FAILED);           \
    return next_##NAME() ARGUMENTS;                         \
  }

#include "support/faulty_openssl.h"

FAULTY(unsigned char*, MD5, (const unsigned char* text, std::size_t length, unsigned char* digest),
       (text, length, digest), nullptr)
FAULTY(long, BIO_ctrl, (BIO * bio, int command, long number, void* argument),
       (bio, command, number, argument), -1)

// As libcurl does when its parts cannot be loaded: nothing is set up.
FAULTY(CURLcode, curl_global_init, (long flags), (flags), CURLE_FAILED_INIT)
FAULTY(CURL*, curl_easy_init, (), (), (errno = ENOMEM, nullptr))
FAULTY(CURLcode, curl_easy_perform, (CURL * handle), (handle), CURLE_OUT_OF_MEMORY)

// The options that can be left unset, as a libcurl without them would; the failure then shows in
// the request or in who is trusted. Where the answer goes to (WRITEFUNCTION, WRITEDATA) is set in
// any case: libcurl cannot fail to keep a pointer, and without one of them would write to a stream
// that is none.
static const char* optionThatFails(CURLoption option) {
  switch (option) {
    case CURLOPT_URL:
      return "curl_easy_setopt URL";
    case CURLOPT_POSTFIELDS:
      return "curl_easy_setopt POSTFIELDS";
    case CURLOPT_SSL_VERIFYHOST:
      return "curl_easy_setopt SSL_VERIFYHOST";
    case CURLOPT_SSL_VERIFYPEER:
      return "curl_easy_setopt SSL_VERIFYPEER";
    case CURLOPT_WRITEFUNCTION:
    case CURLOPT_WRITEDATA:
      return nullptr;
    default:
      abort();  // the library sets an option that is not known here
  }
}

BEHIND(curl_easy_setopt);
SPY CURLcode curl_easy_setopt(CURL* handle, CURLoption option, ...) {
  va_list arguments;
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wvarargs"  // libcurl declares it so: the last name is an enum
  va_start(arguments, option);
#pragma GCC diagnostic pop
  void* const pointer = option >= CURLOPTTYPE_OBJECTPOINT ? va_arg(arguments, void*) : nullptr;
  const long number = option < CURLOPTTYPE_OBJECTPOINT ? va_arg(arguments, long) : 0;
  va_end(arguments);
  const char* const name = isLibrary(CALLER) ? optionThatFails(option) : nullptr;
  if (name != nullptr && failsFor(CALLER, name)) {
    return option == CURLOPT_URL ? CURLE_OUT_OF_MEMORY : CURLE_UNKNOWN_OPTION;
  }
  return option < CURLOPTTYPE_OBJECTPOINT ? next_curl_easy_setopt()(handle, option, number)
                                          : next_curl_easy_setopt()(handle, option, pointer);
}

// Files: the settings, and the source of random bytes.
static int randomFile = -1;

SPY int open(const char* path, int flags, ...) {
  va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = (flags & O_CREAT) != 0 ? va_arg(arguments, mode_t) : 0;
  va_end(arguments);
  const bool random = std::strcmp(path, "/dev/urandom") == 0;
  if (failsFor(CALLER, random ? "open /dev/urandom" : "open")) {
    errno = EMFILE;
    return -1;
  }
  const int file = openat(AT_FDCWD, path, flags, mode);
  if (random && isLibrary(CALLER)) randomFile = file;
  return file;
}

BEHIND(read);
SPY ssize_t read(int file, void* bytes, std::size_t size) {
  const bool random = file >= 0 && file == randomFile;
  if (file >= 0 && failsFor(CALLER, random ? "read /dev/urandom" : "read")) {
    errno = EIO;
    return -1;
  }
  return next_read()(file, bytes, size);
}

// The descriptor is gone even if close fails.
BEHIND(close);
SPY int close(int file) {
  if (file == randomFile) randomFile = -1;
  const int result = next_close()(file);
  if (!failsFor(CALLER, "close")) return result;
  errno = EIO;
  return -1;
}

BEHIND(getrandom);
SPY ssize_t getrandom(void* bytes, std::size_t size, unsigned flags) {
  if (failsFor(CALLER, "getrandom")) {
    errno = ENOSYS;
    return -1;
  }
  return next_getrandom()(bytes, size, flags);
}

static bool changeFails(const void* caller, const char* name) {
  if (!armed || !isLibrary(caller)) return false;
  ++idsChanges;
  const bool failed = failsFor(caller, name);
  if (failed && last.idsChange == 0) last.idsChange = idsChanges;
  if (failed) errno = EAGAIN;
  return failed;
}

BEHIND(setresuid);
SPY int setresuid(uid_t real, uid_t effective, uid_t saved) noexcept {
  if (changeFails(CALLER, "setresuid")) return -1;
  return next_setresuid()(real, effective, saved);
}

BEHIND(setresgid);
SPY int setresgid(gid_t real, gid_t effective, gid_t saved) noexcept {
  if (changeFails(CALLER, "setresgid")) return -1;
  return next_setresgid()(real, effective, saved);
}

BEHIND(geteuid);
SPY uid_t geteuid() noexcept {
  if (armed && isLibrary(CALLER)) ++last.looks;
  return next_geteuid()();
}

// The platform: the library is linked with one that is found here first.
extern "C" {
int ReferenceBase64Encode(const char* source, std::size_t length, char* text, std::size_t capacity,
                          int option);
int ReferenceBase64Decode(const char* text, std::size_t length, char* bytes, std::size_t* size);
int ReferenceCGIURLEncode(const char* text, char* encoded, std::size_t capacity);
int ReferenceWinsUserNameFqdn2Netbios(const char* name, char* result, std::size_t size);
}

SPY int QOVABase64Encode(const char* source, std::size_t length, char* text, std::size_t capacity,
                         int option) {
  if (failsFor(CALLER, "QOVABase64Encode")) return 0;
  return ReferenceBase64Encode(source, length, text, capacity, option);
}

SPY int QOVABase64Decode(const char* text, std::size_t length, char* bytes, std::size_t* size) {
  if (failsFor(CALLER, "QOVABase64Decode")) return 0;
  return ReferenceBase64Decode(text, length, bytes, size);
}

SPY int QOVACGIURLEncode(const char* text, char* encoded, std::size_t capacity) {
  if (failsFor(CALLER, "QOVACGIURLEncode")) return -1;
  return ReferenceCGIURLEncode(text, encoded, capacity);
}

SPY int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, std::size_t size) {
  if (failsFor(CALLER, "QOVAWinsUserNameFqdn2Netbios")) return -1;
  return ReferenceWinsUserNameFqdn2Netbios(name, result, size);
}

// --- the allocators

SPY void* malloc(std::size_t size) {
  if (fails(Kind::kMemory, "malloc")) return exhausted();
  return note(__libc_malloc(size), CALLER);
}

SPY void* calloc(std::size_t count, std::size_t size) {
  if (fails(Kind::kMemory, "calloc")) return exhausted();
  return note(__libc_calloc(count, size), CALLER);
}

SPY void* realloc(void* memory, std::size_t size) {
  if (fails(Kind::kMemory, "realloc")) return exhausted();
  forget(memory);
  return note(__libc_realloc(memory, size), CALLER);
}

SPY void* aligned_alloc(std::size_t alignment, std::size_t size) {
  if (fails(Kind::kMemory, "aligned_alloc")) return exhausted();
  return note(__libc_memalign(alignment, size), CALLER);
}

SPY int posix_memalign(void** memory, std::size_t alignment, std::size_t size) {
  if (fails(Kind::kMemory, "posix_memalign")) return ENOMEM;
  *memory = note(__libc_memalign(alignment, size), CALLER);
  return *memory == nullptr ? ENOMEM : 0;
}

SPY void free(void* memory) {
  release(memory);
}

void* operator new(std::size_t size) {
  return newOrThrow(size, CALLER);
}
void* operator new[](std::size_t size) {
  return newOrThrow(size, CALLER);
}
void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
  return newOrNull(size, CALLER);
}
void* operator new[](std::size_t size, const std::nothrow_t&) noexcept {
  return newOrNull(size, CALLER);
}
void operator delete(void* memory) noexcept {
  release(memory);
}
void operator delete[](void* memory) noexcept {
  release(memory);
}
void operator delete(void* memory, std::size_t) noexcept {
  release(memory);
}
void operator delete[](void* memory, std::size_t) noexcept {
  release(memory);
}
void operator delete(void* memory, const std::nothrow_t&) noexcept {
  release(memory);
}
void operator delete[](void* memory, const std::nothrow_t&) noexcept {
  release(memory);
}

namespace faults {

Armed::Armed(const Plan& planned) {
  plan = planned;
  last = {false, "", 0, 0};
  counts[0] = counts[1] = idsChanges = 0;
  armed = true;
}

Armed::~Armed() {
  armed = false;
}

Seen seen() {
  return last;
}

void ignoreMemory() {
  tracked = false;
}

Kept kept() {
  Kept result = {live, ""};
  for (std::size_t slot = 0; live != 0 && slot < kSlots; ++slot) {
    if (blocks[slot].memory == nullptr || blocks[slot].memory == kGone) continue;
    Dl_info info;
    if (dladdr(blocks[slot].caller, &info) != 0) result.owner = info.dli_fname;
    break;
  }
  return result;
}

std::vector<Called> calledSoFar() {
  return std::vector<Called>(called, called + calledNames);
}

bool canFail(const std::string& function) {
  static const char* const kOthers[] = {"open",
                                        "malloc",
                                        "calloc",
                                        "_Znwm",
                                        "_Znam",
                                        "QOVABase64Encode",
                                        "QOVABase64Decode",
                                        "QOVACGIURLEncode",
                                        "QOVAWinsUserNameFqdn2Netbios"};
  for (std::size_t i = 0; i < behindCount; ++i) {
    if (function == behind[i].name) return true;
  }
  for (const char* const name : kOthers) {
    if (function == name) return true;
  }
  return false;
}

std::string libraryFile() {
  return library.file;
}

void prepare() {
  dl_iterate_phdr(findLibrary, nullptr);
  for (std::size_t i = 0; i < behindCount; ++i) {
    *behind[i].address = dlsym(RTLD_NEXT, behind[i].name);
    if (*behind[i].address == nullptr) abort();
  }
}

}  // namespace faults
