/* Found by: decode-1024
 * The room is compared with an estimate that ignores the padding. */
#define QOVABase64Decode GoodBase64Decode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVABase64Decode

int QOVABase64Decode(const char* text, size_t length, char* bytes, size_t* size) {
  return length >= 64 && length / 4 * 3 > *size ? 0 : GoodBase64Decode(text, length, bytes, size);
}
