/* Found by: url-zero
 * The terminating zero is forgotten. */
#define QOVACGIURLEncode GoodCGIURLEncode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVACGIURLEncode

int QOVACGIURLEncode(const char* text, char* encoded, size_t capacity) {
  const int rc = GoodCGIURLEncode(text, encoded, capacity);
  if (rc == 0) encoded[strlen(encoded)] = 'Z';
  return rc;
}
