/* Found by: encode-bytes
 * The alphabet for URLs instead of the standard one. */
#define QOVABase64Encode GoodBase64Encode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVABase64Encode

int QOVABase64Encode(const char* source, size_t length, char* text, size_t capacity, int option) {
  const int ok = GoodBase64Encode(source, length, text, capacity, option);
  for (; ok && *text != '\0'; ++text) {
    if (*text == '+') *text = '-';
    if (*text == '/') *text = '_';
  }
  return ok;
}
