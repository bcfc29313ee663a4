/* Found by: name-process
 * Changes the effective group and does not put it back. */
#include <unistd.h>
#define QOVAWinsUserNameFqdn2Netbios GoodWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVAWinsUserNameFqdn2Netbios

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  if (setegid(getegid() == 0 ? 65534 : 0) != 0) return -1;
  return GoodWinsUserNameFqdn2Netbios(name, result, size);
}
