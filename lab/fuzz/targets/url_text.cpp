// Any text, encoded for a URL and digested: against libcurl's escape and OpenSSL's digest.
#include "sso/utils.h"

#include "support/independent.h"
#include "support/target.h"

FUZZ_TARGET(url_text) {
  const std::string encoded = QOVA::SSO::URLEncode(input);
  const std::string text = fuzz::cString(input);
  fuzz::require(encoded == fuzz::curlEscaped(text), "libcurl escapes otherwise");
  fuzz::require(fuzz::percentDecoded(encoded) == text, "another text");
  fuzz::require(QOVA::SSO::MD5Digest(input) == fuzz::md5Hex(input), "another digest");
  return encoded != input;
}
