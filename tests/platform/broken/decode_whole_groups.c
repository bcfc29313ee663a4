/* Found by: decode-capacity
 * Three bytes are written for every group, padding or not. */
#define QOVABase64Decode GoodBase64Decode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVABase64Decode

int QOVABase64Decode(const char* text, size_t length, char* bytes, size_t* size) {
  const size_t groups = length / 4;
  const int ok = GoodBase64Decode(text, length, bytes, size);
  if (ok) memset(bytes + *size, 0, 3 * groups - *size);
  return ok;
}
