/* Found by: name-process
 * A file stays open with every call. */
#include <stdio.h>
#define QOVAWinsUserNameFqdn2Netbios GoodWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVAWinsUserNameFqdn2Netbios

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  if (fopen("/dev/null", "r") == NULL) return -1;
  return GoodWinsUserNameFqdn2Netbios(name, result, size);
}
