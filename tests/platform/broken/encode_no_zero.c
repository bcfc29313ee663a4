/* Found by: encode-zero
 * The terminating zero is left to whoever cleared the buffer. */
#define QOVABase64Encode GoodBase64Encode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVABase64Encode

int QOVABase64Encode(const char* source, size_t length, char* text, size_t capacity, int option) {
  char copy[2048];
  const int ok = GoodBase64Encode(source, length, copy, capacity < 2048 ? capacity : 2048, option);
  if (ok) memcpy(text, copy, strlen(copy));
  return ok;
}
