/* Found by: encode-lengths
 * A line break after 64 characters, as in certificates. */
#define QOVABase64Encode GoodBase64Encode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVABase64Encode

int QOVABase64Encode(const char* source, size_t length, char* text, size_t capacity, int option) {
  size_t written = 0;
  const int ok = GoodBase64Encode(source, length, text, capacity, option);
  for (; ok && text[written] != '\0'; ++written) {
    if (written % 65 != 64 || strlen(text) + 2 > capacity) continue;
    memmove(text + written + 1, text + written, strlen(text + written) + 1);
    text[written] = '\n';
  }
  return ok;
}
