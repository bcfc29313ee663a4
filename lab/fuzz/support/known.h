// Keys, tokens and documents of an honest provider, the same in every run.
#pragma once

#include <string>

namespace fuzz {

// The key pair of RFC 7515, appendix A.2.1, under the key id "key-1".
extern const char kModulus[];
extern const char kExponent[];
constexpr char kKeyID[] = "key-1";

// RSASSA-PKCS1-v1_5 under that key; `digest` is "SHA256", "SHA384" or "SHA512".
std::string sign(const std::string& data, const std::string& digest = "SHA256");

// Claims that both clients accept, and the users they name.
extern const char kClaims[];
constexpr char kAzureUser[] = "WERK.EXAMPLE.NET\\alice";
constexpr char kWebSphereUser[] = "alice";

// Whole tokens over a header and claims as JSON text. The HMAC is under kSecret.
std::string rsaToken(const std::string& header, const std::string& claims);
std::string hmacToken(const std::string& header, const std::string& claims);

// The honest answers: of the token endpoint, of discovery, of the key set.
std::string tokenResponse(const std::string& token);
extern const char kDiscovery[];
constexpr char kKeysURL[] = "https://provider.example/keys";
std::string keySet();

}  // namespace fuzz
