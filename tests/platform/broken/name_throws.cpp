// Found by: name-odd
// An exception of the standard library leaves the function.
#include <cstring>
#include <string>

#include "platform/platform.h"

extern "C" int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  const std::string text = name;
  const std::string account = text.substr(text.find('\\'));  // throws where there is none
  if (account.empty() || text.size() >= size) return -1;
  memcpy(result, text.c_str(), text.size() + 1);
  return 0;
}
