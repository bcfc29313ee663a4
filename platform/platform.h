/* What the library needs from the device it runs on: four C functions.
 *
 * One of the implementations in this folder (SSOCLIENT_PLATFORM) is linked into the library unless
 * the build is given a device's own platform library (SSOCLIENT_PLATFORM_LIBRARY; README.md in
 * this folder). A function that is missing there is an error when the library is linked.
 *
 * None of them may throw, keep a pointer that it was given, change its input, or write behind the
 * capacity that it was told. A result depends on the arguments alone. None may change the process
 * (ids, locale, signals, environment, working directory) or print: a CGI program's output is the
 * answer to a browser. The library calls them from one thread. platform/check/ checks all of this.
 */
#ifndef SSOCLIENT_PLATFORM_H
#define SSOCLIENT_PLATFORM_H

#include <stddef.h>

#ifdef __cplusplus
extern "C" {
#endif

/* QOVABase64Encode writes the standard base64 text (RFC 4648, section 4: alphabet with "+" and
 * "/", padding, no line breaks) of the `length` bytes at `source` into `text`, and a terminating
 * zero behind it. Nothing behind the source may be read. `capacity` is the size of `text` and
 * counts that zero. `option` is the platform's own; the library passes 1.
 *
 * Returns 0 on failure, any other value on success. A text that does not fit with its zero is a
 * failure, never cut. Encoding nothing succeeds with an empty text.
 */
int QOVABase64Encode(const char* source, size_t length, char* text, size_t capacity, int option);

/* QOVABase64Decode writes the bytes that the `length` characters at `text` stand for (standard
 * base64 with padding, as QOVABase64Encode writes it) into `bytes`. The text need not end in a
 * zero, and it comes from the browser: it may be of any length and hold anything. `*size` holds the
 * capacity of `bytes` on entry and the number of decoded bytes on return. No terminating zero is
 * written.
 *
 * Returns a value other than 0 on success, 0 for what is not base64 or does not fit.
 */
int QOVABase64Decode(const char* text, size_t length, char* bytes, size_t* size);

/* QOVACGIURLEncode writes `text`, percent-encoded, into `encoded`, and a terminating zero behind
 * it. The result must be safe as a value in the query of a URL and in a form body; encoding every
 * byte outside the unreserved set of RFC 3986 (letters, digits, "-", ".", "_", "~") serves.
 * `capacity` is the number of characters that fit; it does NOT count the terminating zero, for
 * which there is room in any case. The library passes three times the length of the text.
 *
 * Returns 0 on success, any other value on failure.
 */
int QOVACGIURLEncode(const char* text, char* encoded, size_t capacity);

/* QOVAWinsUserNameFqdn2Netbios converts `name`, a domain user of the form DNS-DOMAIN\account, into
 * the form that the device's directory service knows, normally NETBIOS-DOMAIN\account, and writes
 * it with a terminating zero into `result`, which has room for `size` bytes, the zero counted.
 *
 * The name comes from the provider: it may be long and hold any byte but zero, and is never to be
 * used as a format or in a command.
 *
 * Returns a negative value on failure. A result that does not fit is a failure, never cut: one
 * person must not be known by two names, nor two people by one.
 */
int QOVAWinsUserNameFqdn2Netbios(const char* name, char* result, size_t size);

#ifdef __cplusplus
}
#endif

#endif
