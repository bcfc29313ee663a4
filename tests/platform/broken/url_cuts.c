/* Found by: url-capacity
 * What does not fit is cut. */
#define QOVACGIURLEncode GoodCGIURLEncode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVACGIURLEncode

int QOVACGIURLEncode(const char* text, char* encoded, size_t capacity) {
  if (GoodCGIURLEncode(text, encoded, capacity) == 0) return 0;
  encoded[capacity] = '\0';
  return 0;
}
