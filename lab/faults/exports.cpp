#include "faults/exports.h"

#include <cxxabi.h>
#include <elf.h>
#include <link.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <sstream>
#include <stdexcept>

#include "faults/faults.h"

namespace faults {
namespace {

struct Symbol {
  std::string name;
  bool defined;
};

std::vector<Symbol> dynamicSymbols() {
  std::ostringstream content;
  content << std::ifstream(libraryFile(), std::ios::binary).rdbuf();
  const std::string file = content.str();
  if (file.size() < sizeof(ElfW(Ehdr))) throw std::runtime_error("the library cannot be read");
  const auto* const header = reinterpret_cast<const ElfW(Ehdr)*>(file.data());
  const auto* const sections = reinterpret_cast<const ElfW(Shdr)*>(file.data() + header->e_shoff);
  std::vector<Symbol> symbols;
  for (unsigned i = 0; i < header->e_shnum; ++i) {
    if (sections[i].sh_type != SHT_DYNSYM) continue;
    const char* const names = file.data() + sections[sections[i].sh_link].sh_offset;
    const auto* symbol = reinterpret_cast<const ElfW(Sym)*>(file.data() + sections[i].sh_offset);
    const auto* const end = symbol + sections[i].sh_size / sizeof *symbol;
    for (++symbol; symbol < end; ++symbol) {
      symbols.push_back({names + symbol->st_name, symbol->st_shndx != SHN_UNDEF});
    }
  }
  if (symbols.empty()) throw std::runtime_error("the library has no dynamic symbols");
  return symbols;
}

std::string demangled(const std::string& name) {
  int status = 0;
  char* const text = abi::__cxa_demangle(name.c_str(), nullptr, nullptr, &status);
  const std::string result = text != nullptr ? text : "";
  std::free(text);
  return result;
}

bool startsWith(const std::string& text, const char* start) {
  return text.compare(0, std::strlen(start), start) == 0;
}

// These cannot fail, or their failure has no effect, or is out of memory and comes from an
// allocation, which is counted by itself.
const char* const kCanNotFail[] = {
    // constants and look-ups in what exists
    "BIO_f_base64", "BIO_s_mem", "EVP_sha256", "EVP_sha384", "EVP_sha512", "curl_easy_strerror",
    "strerror_r", "geteuid", "getegid", "getpid", "time", "__errno_location",
    // joining and marking what exists
    "BIO_push", "BIO_set_flags",
    // release
    "BIO_free_all", "BN_free", "EVP_MD_CTX_free", "EVP_PKEY_free", "RSA_free", "free",
    "curl_easy_cleanup", "curl_global_cleanup",
    // bytes
    "memcmp", "memcpy", "memmove", "memset", "memchr", "strchr", "strcmp", "strlen", "strnlen",
    "memrchr", "bcmp",
    // one way out
    "syslog", "__syslog_chk", "abort", "__stack_chk_guard", "__stack_chk_fail", "_Unwind_Resume",
    // libcurl is in the program already when it is looked for
    "dlopen", "dlsym", "dlerror"};

// The C++ run time and jsoncpp fail only when memory runs out.
const char* const kRunTimes[] = {"_ZNSt",    "_ZNSa",     "__aeabi_", "_ZNKSt", "_ZNSi",  "_ZNSo",
                                 "_ZSt",     "_ZTI",      "_ZTT",     "_ZTV",   "_ZTS",   "_ZdaPv",
                                 "_ZdlPv",   "__cxa_",    "__gxx_",   "_ITM_",  "__gmon", "__gcov_",
                                 "_ZN4Json", "_ZNK4Json", "_ZNKR",    "_ZNR",   "_ZGV"};

bool isKnown(const std::string& name) {
  if (canFail(name)) return true;
  for (const char* const known : kCanNotFail) {
    if (name == known) return true;
  }
  for (const char* const start : kRunTimes) {
    if (startsWith(name, start)) return true;
  }
  return false;
}

}  // namespace

Compared compareExports(const std::set<std::string>& operations) {
  Compared result = {0, {}};
  for (const Symbol& symbol : dynamicSymbols()) {
    if (!symbol.defined || !startsWith(symbol.name, "_ZN4QOVA")) continue;
    std::string name = demangled(symbol.name);
    name.resize(std::min(name.find_first_of("(["), name.size()));
    for (const char* const space : {"QOVA::SSO::", "QOVA::JWT::"}) {
      if (startsWith(name, space)) name.erase(0, std::strlen(space));
    }
    if (name.find('~') != std::string::npos) continue;
    ++result.all;
    if (operations.count(name) == 0) result.missing.push_back(name);
  }
  return result;
}

Compared compareImports() {
  Compared result = {0, {}};
  for (const Symbol& symbol : dynamicSymbols()) {
    if (symbol.defined) continue;
    ++result.all;
    if (!isKnown(symbol.name)) result.missing.push_back(symbol.name);
  }
  return result;
}

}  // namespace faults
