/* Makes a shared library of platform functions from an archive: their addresses, for the check.
 * In the archive they may be hidden. */
#include "platform/platform.h"

struct Table {
  int (*base64_encode)(const char*, size_t, char*, size_t, int);
  int (*base64_decode)(const char*, size_t, char*, size_t*);
  int (*url_encode)(const char*, char*, size_t);
  int (*convert_name)(const char*, char*, size_t);
};

__attribute__((visibility("default"))) const struct Table ssoclient_platform_table = {
    QOVABase64Encode, QOVABase64Decode, QOVACGIURLEncode, QOVAWinsUserNameFqdn2Netbios};
