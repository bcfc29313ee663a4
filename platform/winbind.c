/* The name conversion through Samba's winbind, for a device that is a member of a Windows domain:
 * winbind knows each domain by its DNS name and by its NetBIOS name. */
#include <stdbool.h>
#include <stdio.h>
#include <string.h>

/* wbclient.h needs these two and does not include them. */
#include <stdint.h>
#include <sys/types.h>
#include <wbclient.h>

#include "platform/platform.h"

/* Room for a domain in a request to winbind. A longer name would be cut on its way. */
enum { kDomainSize = 256 };

/* Not strcasecmp(): which names are equal must not depend on the locale. */
static char Lower(char c) {
  return (char)(c >= 'A' && c <= 'Z' ? c - 'A' + 'a' : c);
}

static bool SameName(const char* a, const char* b) {
  for (; *a != '\0' && Lower(*a) == Lower(*b); ++a, ++b) continue;
  return *a == *b;
}

/* Winbind takes a NetBIOS name for the domain too. Only the DNS name will do: the name that the
 * provider has vouched for is a DNS name, and another domain may have it as its NetBIOS name. */
static bool IsDomain(const struct wbcDomainInfo* info, const char* domain) {
  return info->dns_name != NULL && SameName(info->dns_name, domain) && info->short_name != NULL &&
         info->short_name[0] != '\0';
}

/* Writes DOMAIN\account, or nothing at all when it does not fit. */
static int Join(const char* domain, const char* account, char* result, size_t size) {
  if (strlen(domain) + 1 + strlen(account) >= size) return -1;
  return snprintf(result, size, "%s\\%s", domain, account);
}

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  char domain[kDomainSize];
  struct wbcDomainInfo* info = NULL;
  const char* separator = strchr(name, '\\');
  if (separator == NULL || separator == name) return -1;
  /* Neither domain nor account holds a backslash: with two, it is unclear which is which. */
  if (strchr(separator + 1, '\\') != NULL) return -1;

  const size_t length = (size_t)(separator - name);
  if (length >= sizeof domain) return -1;
  memcpy(domain, name, length);
  domain[length] = '\0';

  /* The domain alone, never the user: on a domain controller winbind answers questions about a
   * user with the DNS form. */
  if (!WBC_ERROR_IS_OK(wbcDomainInfo(domain, &info)) || info == NULL) return -1;
  const int rc = IsDomain(info, domain) ? Join(info->short_name, separator + 1, result, size) : -1;
  wbcFreeMemory(info);
  return rc;
}
