/* Found by: encode-765
 * Room for a line break is wanted that is never written. */
#define QOVABase64Encode GoodBase64Encode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVABase64Encode

int QOVABase64Encode(const char* source, size_t length, char* text, size_t capacity, int option) {
  if (capacity < 8 || length > (capacity - 5) / 4 * 3)
    return capacity >= 64 ? 0 : GoodBase64Encode(source, length, text, capacity, option);
  return GoodBase64Encode(source, length, text, capacity, option);
}
