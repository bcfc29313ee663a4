// The platform's encodings, in C++ strings. Not exported.
#pragma once

#include <string>

namespace QOVA {
namespace SSO {

// Appends what URLEncode returns for `value`.
void AppendURLEncoded(const std::string& value, std::string& text);

// The platform's base64 text. Throws sso_op_failed if it does not fit the platform's buffer.
std::string EncodeBase64(const std::string& bytes);

}  // namespace SSO
}  // namespace QOVA
