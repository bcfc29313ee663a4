// HTTP transport and encoding helpers.
//
// The HTTP functions set up and tear down libcurl's process-wide state in every call: call them
// from one thread only. They set no time-out; a program that must not wait for a silent
// provider runs them where it can be ended.
#pragma once

#include <string>

#include "sso/common.h"

namespace QOVA {
namespace SSO {

// httpGet sends a GET request to `url` and hands the body of the answer, chunk by chunk, to
// `writeFn`, with the address of `response` as its last argument. `response` is not cleared.
//
// `verifySSL` true keeps libcurl's verification of the server's certificate and host name;
// false switches both off. `writeFn` must not be null; it receives the chunk (not
// zero-terminated), an element size and count, and returns size * count, or less to end the
// transfer. Redirects are not followed. An HTTP error status is not a failure: its body is
// delivered like any other.
//
// Throws sso_err_resp with the text of curl_easy_strerror for any failed transfer, and
// std::bad_alloc if no transfer handle can be made.
SSOCLIENT_API void httpGet(const std::string& url, std::string& response, bool verifySSL,
                           unsigned (*writeFn)(void* data, unsigned size, unsigned count,
                                               void* userData));

// httpPost sends `body` to `url` as a POST request of type application/x-www-form-urlencoded;
// `body` is text up to its first zero byte. Everything else is as for httpGet.
SSOCLIENT_API void httpPost(const std::string& url, const std::string& body, std::string& response,
                            bool verifySSL,
                            unsigned (*writeFn)(void* data, unsigned size, unsigned count,
                                                void* userData));

// URLEncode returns `text` (up to its first zero byte) in the percent-encoded form of the
// device platform (platform/platform.h; RFC 3986 in the reference implementation). When
// encoding fails it returns `text` itself, unchanged; the caller cannot tell.
SSOCLIENT_API std::string URLEncode(const std::string& text);

// MD5Digest returns the MD5 digest (RFC 1321) of the bytes of `text` as 32 lower-case
// hexadecimal digits. It returns an empty string, and writes a line to the system log, when
// the digest cannot be made.
SSOCLIENT_API std::string MD5Digest(std::string text);

}  // namespace SSO
}  // namespace QOVA
