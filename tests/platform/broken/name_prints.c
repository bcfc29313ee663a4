/* Found by: name-process
 * A line that was meant for its author. */
#include <stdio.h>
#define QOVAWinsUserNameFqdn2Netbios GoodWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVAWinsUserNameFqdn2Netbios

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  printf("converting %s\n", name);
  return GoodWinsUserNameFqdn2Netbios(name, result, size);
}
