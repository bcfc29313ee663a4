/* Found by: name-long
 * A domain is never longer than 255 bytes. */
#define QOVAWinsUserNameFqdn2Netbios GoodWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVAWinsUserNameFqdn2Netbios

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  char domain[256];
  const char* separator = strchr(name, '\\');
  if (separator == NULL) return -1;
  memset(domain, 0, sizeof domain);
  for (size_t i = 0; name + i < separator; ++i) domain[i] = name[i];
  return domain[0] == '\0' ? -1 : GoodWinsUserNameFqdn2Netbios(name, result, size);
}
