/* Found by: name-pointers
 * Compares a name with the caller's last one. */
#define QOVAWinsUserNameFqdn2Netbios GoodWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVAWinsUserNameFqdn2Netbios

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  static const char* last;
  static int same;
  if (last != NULL) same += last[0] == name[0];
  last = name;
  return GoodWinsUserNameFqdn2Netbios(name, result, size);
}
