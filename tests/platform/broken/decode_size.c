/* Found by: decode-bytes
 * The size still is the capacity on return. */
#define QOVABase64Decode GoodBase64Decode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVABase64Decode

int QOVABase64Decode(const char* text, size_t length, char* bytes, size_t* size) {
  size_t own = *size;
  return GoodBase64Decode(text, length, bytes, &own);
}
