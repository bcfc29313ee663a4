/* Found by: name-people
 * Every domain counts as the device's own. */
#define QOVAWinsUserNameFqdn2Netbios GoodWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVAWinsUserNameFqdn2Netbios

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  const char* account = strchr(name, '\\');
  return account == NULL ? -1 : GoodWinsUserNameFqdn2Netbios(account + 1, result, size);
}
