/* Found by: url-long
 * An own buffer is large enough for usual texts. */
#define QOVACGIURLEncode GoodCGIURLEncode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVACGIURLEncode

int QOVACGIURLEncode(const char* text, char* encoded, size_t capacity) {
  char own[4096];
  char* end = own;
  for (const char* c = text; *c != '\0'; ++c) end += IsUnreserved((unsigned char)*c) ? 1 : 3;
  if ((size_t)(end - own) > capacity) return -1;
  if (GoodCGIURLEncode(text, own, (size_t)-1) != 0) return -1;
  strcpy(encoded, own);
  return 0;
}
