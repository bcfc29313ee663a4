/* Found by: decode-behind
 * A terminating zero is written behind the bytes. */
#define QOVABase64Decode GoodBase64Decode
#include "platform/encoding.c"
#include "platform/passthrough.c"
#undef QOVABase64Decode

int QOVABase64Decode(const char* text, size_t length, char* bytes, size_t* size) {
  const int ok = GoodBase64Decode(text, length, bytes, size);
  if (ok) bytes[*size] = '\0';
  return ok;
}
