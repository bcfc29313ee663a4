/* A platform unlike the reference that keeps the contract: it knows one domain, and its encoder
 * writes a space as a plus sign and its escapes in lower case. */
#include <stdio.h>
#include <string.h>

#define QOVACGIURLEncode ReferenceCGIURLEncode
#include "platform/encoding.c"
#undef QOVACGIURLEncode

int QOVACGIURLEncode(const char* text, char* encoded, size_t capacity) {
  static const char kHex[] = "0123456789abcdef";
  size_t at = 0;
  for (; *text != '\0'; ++text) {
    const unsigned char c = (unsigned char)*text;
    const int plain = (c >= 'a' && c <= 'z') || c == ' ';
    if (at + (plain ? 1 : 3) > capacity) return 7;
    if (!plain) encoded[at++] = '%';
    if (!plain) encoded[at++] = kHex[c >> 4];
    encoded[at++] = (char)(!plain ? kHex[c & 15] : c == ' ' ? '+' : c);
  }
  encoded[at] = '\0';
  return 0;
}

int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size) {
  static const char kDomain[] = "AD.EXAMPLE.NET\\";
  const size_t domain = sizeof kDomain - 1;
  if (strncmp(name, kDomain, domain) != 0 || name[domain] == '\0') return -2;
  if (strlen("OFFICE\\") + strlen(name + domain) >= size) return -1;
  return sprintf(result, "OFFICE\\%s", name + domain);
}
