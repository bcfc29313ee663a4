/* A libwbclient that knows one domain. */
#include <stdbool.h>
#include <stdint.h>
#include <stdlib.h>
#include <string.h>
#include <strings.h>
#include <sys/types.h>
#include <wbclient.h>

wbcErr wbcDomainInfo(const char* domain, struct wbcDomainInfo** info) {
  if (strcasecmp(domain, "ad.example.net") != 0) return WBC_ERR_DOMAIN_NOT_FOUND;
  *info = calloc(1, sizeof **info);
  if (*info == NULL) return WBC_ERR_NO_MEMORY;
  (*info)->dns_name = (char*)"ad.example.net";
  (*info)->short_name = (char*)"OFFICE";
  return WBC_ERR_SUCCESS;
}

void wbcFreeMemory(void* memory) {
  free(memory);
}
