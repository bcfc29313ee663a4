/* Found by: name-repeat
 * Remembers a name by its address. */
#define QOVAWinsUserNameFqdn2Netbios GoodWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVAWinsUserNameFqdn2Netbios

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  static const char* known;
  static char kept[1024];
  if (name == known && strlen(kept) < size) return (int)(strcpy(result, kept) == NULL);
  const int rc = GoodWinsUserNameFqdn2Netbios(name, result, size);
  if (rc == 0 && strlen(result) < sizeof kept) {
    known = name;
    strcpy(kept, result);
  }
  return rc;
}
