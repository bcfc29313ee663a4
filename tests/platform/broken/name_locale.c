/* Found by: name-process
 * Sets the locale for its comparisons. */
#include <locale.h>
#define QOVAWinsUserNameFqdn2Netbios GoodWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVAWinsUserNameFqdn2Netbios

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  setlocale(LC_CTYPE, "C.UTF-8");
  return GoodWinsUserNameFqdn2Netbios(name, result, size);
}
