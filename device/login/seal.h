// Seals: what only this device can have written.
#pragma once

#include <string>

// Seal returns the HMAC of a text (SHA-256, hexadecimal) under a key that only root can read. It is
// made at first use. Throws std::runtime_error if the key cannot be read or made.
std::string Seal(const std::string& text);

// DigestBytes and Digest return the SHA-256 digest of a text, as it is and hexadecimal.
std::string DigestBytes(const std::string& text);
std::string Digest(const std::string& text);

// SameText compares in a time that does not depend on the texts, only on their length.
bool SameText(const std::string& a, const std::string& b);
