/* Found by: decode-long
 * The capacity is not looked at. */
#define QOVABase64Decode GoodBase64Decode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVABase64Decode

int QOVABase64Decode(const char* text, size_t length, char* bytes, size_t* size) {
  *size = length;
  return GoodBase64Decode(text, length, bytes, size);
}
