/* The reference platform under its own names, for the spy to forward to. */
#define QOVABase64Encode ReferenceBase64Encode
#define QOVABase64Decode ReferenceBase64Decode
#define QOVACGIURLEncode ReferenceCGIURLEncode
#define QOVAWinsUserNameFqdn2Netbios ReferenceWinsUserNameFqdn2Netbios
#include "platform/encoding.c"
#include "platform/passthrough.c"
