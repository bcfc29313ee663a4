/* Found by: url-bytes
 * The separators of a query are left as they are. */
#define QOVACGIURLEncode GoodCGIURLEncode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVACGIURLEncode

int QOVACGIURLEncode(const char* text, char* encoded, size_t capacity) {
  if (*text == '&' && text[1] == '\0' && capacity > 0) return (int)(strcpy(encoded, "&") == NULL);
  return GoodCGIURLEncode(text, encoded, capacity);
}
