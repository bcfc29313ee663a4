/* Found by: decode-alphabet
 * Characters outside the alphabet are skipped. */
#define QOVABase64Decode GoodBase64Decode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVABase64Decode

int QOVABase64Decode(const char* text, size_t length, char* bytes, size_t* size) {
  static char kept[1 << 18];
  size_t count = 0;
  for (size_t i = 0; i < length && count < sizeof kept; ++i) {
    if (text[i] != '=' && SixBits(text[i]) < 0) continue;
    kept[count++] = text[i];
  }
  return GoodBase64Decode(kept, count, bytes, size);
}
