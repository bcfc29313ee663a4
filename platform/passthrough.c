/* The name conversion of the reference platform: names are passed through as they are. */
#include <string.h>

#include "platform/platform.h"

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  const size_t length = strlen(name);
  if (length >= size) return -1;
  memcpy(result, name, length + 1);
  return 0;
}
