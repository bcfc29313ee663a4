/* Found by: name-data
 * The name is handed to a shell. */
#include <stdio.h>
#include <stdlib.h>
#define QOVAWinsUserNameFqdn2Netbios GoodWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVAWinsUserNameFqdn2Netbios

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  char command[400];
  snprintf(command, sizeof command, "test -n \"%s\" 2>/dev/null", name);
  return strlen(name) > 300 || system(command) == -1
             ? -1
             : GoodWinsUserNameFqdn2Netbios(name, result, size);
}
