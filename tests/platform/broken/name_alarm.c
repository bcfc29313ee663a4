/* Found by: name-process
 * Sets an alarm, which ends the program later. */
#include <unistd.h>
#define QOVAWinsUserNameFqdn2Netbios GoodWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVAWinsUserNameFqdn2Netbios

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  alarm(60);
  return GoodWinsUserNameFqdn2Netbios(name, result, size);
}
