/* Found by: name-repeat
 * After a failure the next result is the one before. */
#define QOVAWinsUserNameFqdn2Netbios GoodWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVAWinsUserNameFqdn2Netbios

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  static char kept[1024];
  static int failed;
  const int rc = GoodWinsUserNameFqdn2Netbios(name, result, size);
  if (rc < 0) failed = 1;
  if (rc < 0 || strlen(result) >= sizeof kept) return rc;
  if (failed && kept[0] != '\0' && strlen(kept) < size)
    strcpy(result, kept);
  else
    strcpy(kept, result);
  failed = 0;
  return rc;
}
