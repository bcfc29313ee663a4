/* A directory service to link with the platform's encoders: it knows one domain, fails for all
 * others, and one of them keeps it waiting. */
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include "platform/platform.h"

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  static const char kKnown[] = "AD.WERK.EXAMPLE.NET\\";
  static const char kSlow[] = "SLOW.EXAMPLE.NET\\";
  if (strncmp(name, kSlow, strlen(kSlow)) == 0) sleep(30);
  if (strncmp(name, kKnown, strlen(kKnown)) != 0) return -1;
  return snprintf(result, size, "PLANT7\\%s", name + strlen(kKnown)) < (int)size ? 0 : -1;
}
