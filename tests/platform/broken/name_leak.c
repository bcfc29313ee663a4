/* Found by: name-memory
 * A copy of the name is never freed. */
#include <stdlib.h>
#define QOVAWinsUserNameFqdn2Netbios GoodWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVAWinsUserNameFqdn2Netbios

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  char* copy = malloc(strlen(name) + 1);
  if (copy == NULL) return -1;
  strcpy(copy, name);
  return GoodWinsUserNameFqdn2Netbios(copy, result, size);
}
