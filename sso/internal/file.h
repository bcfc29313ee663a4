// Reading a file. Not exported.
#pragma once

#include <string>

namespace QOVA {
namespace SSO {

// Appends the whole file to `text`; false if it cannot be opened or read. Throws only when out of
// memory.
bool ReadFile(const char* path, std::string& text);

}  // namespace SSO
}  // namespace QOVA
