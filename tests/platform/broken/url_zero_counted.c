/* Found by: url-capacity
 * The zero is counted in the capacity. */
#define QOVACGIURLEncode GoodCGIURLEncode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVACGIURLEncode

int QOVACGIURLEncode(const char* text, char* encoded, size_t capacity) {
  return capacity == 0 ? -1 : GoodCGIURLEncode(text, encoded, capacity - 1);
}
