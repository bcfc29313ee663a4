/* Found by: name-people
 * Accounts are cut to 20 characters, as old directories want them. */
#define QOVAWinsUserNameFqdn2Netbios GoodWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVAWinsUserNameFqdn2Netbios

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  const char* account = strchr(name, '\\');
  const size_t length = account == NULL ? 0 : (size_t)(account - name) + 1 + 20;
  if (account == NULL || length >= size) return -1;
  strncpy(result, name, length);
  result[strlen(name) < length ? strlen(name) : length] = '\0';
  return 0;
}
