/* Found by: url-texts
 * What looks like an escape is taken over. */
#define QOVACGIURLEncode GoodCGIURLEncode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVACGIURLEncode

int QOVACGIURLEncode(const char* text, char* encoded, size_t capacity) {
  if (strcmp(text, "%41") == 0) return (int)(strcpy(encoded, text) == NULL);
  return GoodCGIURLEncode(text, encoded, capacity);
}
