// The answers that the library's are compared with, come by in another way: OpenSSL's one-shot
// calls, its block decoder, libcurl's escape, and strict readings of the standards.
#pragma once

#include <json/value.h>
#include <openssl/evp.h>

#include <optional>
#include <string>
#include <vector>

namespace fuzz {

const unsigned char* bytesOf(const std::string& text);
unsigned char* bytesOf(std::string& text);

std::string base64url(const std::string& bytes);  // RFC 4648, section 5, without padding
// The bytes of base64 text in the one form that a careful encoder writes: no byte outside the
// alphabet, no bits left over, standard or URL alphabet. Empty if it is anything else.
std::optional<std::string> strictBase64url(const std::string& text);
std::optional<std::string> strictBase64(const std::string& text);  // padded
std::string decoded(const std::string& text);                      // of a known good text
// What the most lenient reader could make of it: white space skipped, a pad that is not at the end
// read as zero bits (OpenSSL does), up to the first character that has no business there, left-over
// bits forgotten.
std::string lenientBase64url(const std::string& text);

// n, e and, for a private key, d, as big-endian numbers; the caller owns the key. Null if OpenSSL
// refuses them.
EVP_PKEY* makeRsaKey(const std::vector<std::string>& numbers);

// One-shot verification. `digest` is "SHA256", "SHA384" or "SHA512".
bool verifyRsa(const std::string& n, const std::string& e, const std::string& digest,
               const std::string& data, const std::string& signature);
std::string hmac(const std::string& key, const std::string& data, const std::string& digest);

// The digest of an algorithm name, "RS256" to "HS512"; empty for any other.
std::string digestOf(const std::string& algorithm);

// The three segments of a token; empty unless there are exactly three.
std::vector<std::string> segments(const std::string& token);
// Whether a token's signature holds, by the algorithm in its header, under the device's secret or
// the RSA key with these numbers (base64url). As lenient as a reader may be about the spelling of
// numbers and signature, not about what was signed.
bool isSigned(const std::string& token, const std::string& n, const std::string& e);
bool isHonest(const std::string& token);  // under the honest provider's key or secret

// The other of jsoncpp's two readers; false if it cannot read all of the text.
bool readJson(const std::string& text, Json::Value& value);
std::string textOf(const Json::Value& object, const char* name);  // "" unless it is a string

std::string percentDecoded(const std::string& text);
// Whether the text holds only what may be in the value of a query: unreserved and escapes.
bool isEscaped(const std::string& text);
std::string curlEscaped(const std::string& text);
std::string md5Hex(const std::string& text);

// Up to its first zero byte.
std::string cString(const std::string& text);

}  // namespace fuzz
