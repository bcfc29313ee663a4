/* Found by: url-bytes
 * Bytes above 127 are printed as negative numbers. */
#include <stdio.h>
#define QOVACGIURLEncode GoodCGIURLEncode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVACGIURLEncode

int QOVACGIURLEncode(const char* text, char* encoded, size_t capacity) {
  for (; *text != '\0'; ++text) {
    const int width = IsUnreserved((unsigned char)*text) ? 1 : 3;
    if (capacity < (size_t)width) return -1;
    capacity -= (size_t)width;
    encoded += sprintf(encoded, width == 1 ? "%c" : "%%%02X", *text);
  }
  *encoded = '\0';
  return 0;
}
