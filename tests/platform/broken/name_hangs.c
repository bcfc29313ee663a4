/* Found by: name-odd
 * Waits for a directory that answers no question about an empty domain. */
#include <unistd.h>
#define QOVAWinsUserNameFqdn2Netbios GoodWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVAWinsUserNameFqdn2Netbios

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  while (name[0] == '\\') pause();
  return GoodWinsUserNameFqdn2Netbios(name, result, size);
}
