/* Found by: encode-long
 * The length is kept in 16 bits. */
#define QOVABase64Encode GoodBase64Encode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVABase64Encode

int QOVABase64Encode(const char* source, size_t length, char* text, size_t capacity, int option) {
  return GoodBase64Encode(source, (unsigned short)length, text, capacity, option);
}
