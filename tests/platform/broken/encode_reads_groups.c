/* Found by: encode-source
 * Three bytes are read at once, also where the source has only one left. */
#define QOVABase64Encode GoodBase64Encode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVABase64Encode

int QOVABase64Encode(const char* source, size_t length, char* text, size_t capacity, int option) {
  volatile char last = 0;
  if (length % 3 == 1) last = source[length + 1];
  (void)last;
  return GoodBase64Encode(source, length, text, capacity, option);
}
