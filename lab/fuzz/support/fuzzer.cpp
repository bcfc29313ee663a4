// The fuzzer's entry into the one target that this program holds.
#include <cstddef>
#include <cstdint>
#include <string>

#include "support/target.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::runOne(fuzz::targets().front(), std::string(reinterpret_cast<const char*>(data), size));
  return 0;
}
