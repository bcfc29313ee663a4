// No secret leaves the doctor. Every text that came from outside (settings, arguments, servers,
// certificates, the library's own words) passes through here before it is cut to length.
#pragma once

#include <string>

namespace doctor {

// Declares a secret, which Clean then replaces by "(hidden)": raw, percent- or form-encoded,
// HTML- or JSON-escaped, in base64 at any alignment, in one of these inside another, and any 8
// consecutive characters of it. Ignores secrets of less than 4 bytes.
void Hide(const std::string& secret);

// The text without the secrets, JSON Web Tokens, values of parameters such as "code" and
// "client_secret", and user parts of URLs. Longer texts are cut after 16 KB.
std::string Clean(const std::string& text);

// Clean, then Clip (text.h): outside text as it is shown.
std::string Shown(const std::string& text, size_t length);

// The text without secrets that appear as a whole: the last step before text of ours is printed,
// whose own words may by chance be parts of a secret.
std::string CleanWhole(const std::string& text);

}  // namespace doctor
