/* Found by: url-repeat
 * Takes an old errno for its failure. */
#include <errno.h>
#define QOVACGIURLEncode GoodCGIURLEncode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVACGIURLEncode

int QOVACGIURLEncode(const char* text, char* encoded, size_t capacity) {
  const int rc = GoodCGIURLEncode(text, encoded, capacity);
  return errno == ERANGE ? -1 : rc;
}
