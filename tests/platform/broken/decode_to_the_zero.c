/* Found by: decode-source
 * The text is read up to a zero that need not be there. */
#define QOVABase64Decode GoodBase64Decode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVABase64Decode

int QOVABase64Decode(const char* text, size_t length, char* bytes, size_t* size) {
  const size_t whole = strlen(text);
  return GoodBase64Decode(text, whole < length ? whole : length, bytes, size);
}
