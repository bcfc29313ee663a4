/* The encodings of platform.h: standard base64, and percent-encoding as in RFC 3986. */
#include <string.h>

#include "platform/platform.h"

static const char kBase64[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

int QOVABase64Encode(const char* source, size_t length, char* text, size_t capacity, int option) {
  const unsigned char* in = (const unsigned char*)source;
  (void)option;
  if (capacity == 0 || length > (capacity - 1) / 4 * 3) return 0;
  for (; length >= 3; length -= 3, in += 3) {
    *text++ = kBase64[in[0] >> 2];
    *text++ = kBase64[(in[0] & 3) << 4 | in[1] >> 4];
    *text++ = kBase64[(in[1] & 15) << 2 | in[2] >> 6];
    *text++ = kBase64[in[2] & 63];
  }
  if (length > 0) {
    const int second = length == 2 ? in[1] : 0;
    *text++ = kBase64[in[0] >> 2];
    *text++ = kBase64[(in[0] & 3) << 4 | second >> 4];
    *text++ = (char)(length == 2 ? kBase64[(second & 15) << 2] : '=');
    *text++ = '=';
  }
  *text = '\0';
  return 1;
}

/* The six bits that a character stands for, or -1. */
static int SixBits(char c) {
  const char* found = c == '\0' ? NULL : strchr(kBase64, c);
  return found == NULL ? -1 : (int)(found - kBase64);
}

/* Decodes a group of four characters, `count` bytes of it (1 to 3). Returns 0 for a character
 * outside the alphabet. */
static int DecodeGroup(const char* text, size_t count, char* bytes) {
  unsigned long group = 0;
  for (size_t i = 0; i < 4; ++i) {
    const int bits = i <= count ? SixBits(text[i]) : 0;
    if (bits < 0) return 0;
    group = group << 6 | (unsigned)bits;
  }
  for (size_t i = 0; i < count; ++i) bytes[i] = (char)(group >> (16 - 8 * i) & 0xff);
  return 1;
}

int QOVABase64Decode(const char* text, size_t length, char* bytes, size_t* size) {
  size_t written = 0;
  if (length % 4 != 0) return 0;
  for (size_t at = 0; at < length; at += 4) {
    size_t count = 3;
    if (at + 4 == length && text[at + 3] == '=') count = text[at + 2] == '=' ? 1 : 2;
    if (*size - written < count || !DecodeGroup(text + at, count, bytes + written)) return 0;
    written += count;
  }
  *size = written;
  return 1;
}

/* Not isalnum(): the escapes must not depend on the locale. */
static int IsUnreserved(unsigned char c) {
  return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '-' ||
         c == '.' || c == '_' || c == '~';
}

int QOVACGIURLEncode(const char* text, char* encoded, size_t capacity) {
  static const char kHex[] = "0123456789ABCDEF";
  for (; *text != '\0'; ++text) {
    const unsigned char c = (unsigned char)*text;
    const size_t width = IsUnreserved(c) ? 1 : 3;
    if (capacity < width) return -1;
    capacity -= width;
    if (width == 1) {
      *encoded++ = *text;
      continue;
    }
    *encoded++ = '%';
    *encoded++ = kHex[c >> 4];
    *encoded++ = kHex[c & 15];
  }
  *encoded = '\0';
  return 0;
}
