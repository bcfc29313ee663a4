/* Found by: encode-nothing
 * An empty source counts as a failure. */
#define QOVABase64Encode GoodBase64Encode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVABase64Encode

int QOVABase64Encode(const char* source, size_t length, char* text, size_t capacity, int option) {
  return length == 0 ? 0 : GoodBase64Encode(source, length, text, capacity, option);
}
