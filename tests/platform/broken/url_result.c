/* Found by: url-bytes
 * Returns the number of characters that were written. */
#define QOVACGIURLEncode GoodCGIURLEncode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVACGIURLEncode

int QOVACGIURLEncode(const char* text, char* encoded, size_t capacity) {
  return GoodCGIURLEncode(text, encoded, capacity) == 0 ? (int)strlen(encoded) : -1;
}
