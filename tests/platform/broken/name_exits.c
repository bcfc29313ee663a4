/* Found by: name-odd
 * Ends the program where a name has no domain. */
#include <stdlib.h>
#define QOVAWinsUserNameFqdn2Netbios GoodWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVAWinsUserNameFqdn2Netbios

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  if (strchr(name, '\\') == NULL) exit(1);
  return GoodWinsUserNameFqdn2Netbios(name, result, size);
}
