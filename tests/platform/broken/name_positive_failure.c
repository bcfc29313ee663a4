/* Found by: name-capacity
 * Returns an error number, which is positive. */
#define QOVAWinsUserNameFqdn2Netbios GoodWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVAWinsUserNameFqdn2Netbios

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  return GoodWinsUserNameFqdn2Netbios(name, result, size) < 0 ? 34 : 0;
}
