/* Found by: encode-capacity
 * What does not fit is cut. */
#define QOVABase64Encode GoodBase64Encode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVABase64Encode

int QOVABase64Encode(const char* source, size_t length, char* text, size_t capacity, int option) {
  while (length > 0 && (length + 2) / 3 * 4 + 1 > capacity) --length;
  return GoodBase64Encode(source, length, text, capacity, option);
}
