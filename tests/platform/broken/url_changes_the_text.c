/* Found by: url-source
 * Spaces are replaced in the caller's text. */
#define QOVACGIURLEncode GoodCGIURLEncode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVACGIURLEncode

int QOVACGIURLEncode(const char* text, char* encoded, size_t capacity) {
  for (char* c = (char*)text; *c != '\0'; ++c) *c = (char)(*c == ' ' ? '+' : *c);
  return GoodCGIURLEncode(text, encoded, capacity);
}
