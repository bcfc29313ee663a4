/* Found by: name-odd
 * Counts on a backslash. */
#define QOVAWinsUserNameFqdn2Netbios GoodWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVAWinsUserNameFqdn2Netbios

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  const char* account = strchr(name, '\\');
  return account[1] == '\0' ? -1 : GoodWinsUserNameFqdn2Netbios(name, result, size);
}
