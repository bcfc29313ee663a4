/* Found by: decode-padding
 * Padding that is missing is added. */
#define QOVABase64Decode GoodBase64Decode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVABase64Decode

int QOVABase64Decode(const char* text, size_t length, char* bytes, size_t* size) {
  static char padded[1 << 18];
  if (length + 3 > sizeof padded) return 0;
  memcpy(padded, text, length);
  while (length % 4 != 0) padded[length++] = '=';
  return GoodBase64Decode(padded, length, bytes, size);
}
