// URL encoding into a text that is being built. Defined in utils.cpp; not exported.
#pragma once

#include <string>

namespace QOVA {
namespace SSO {

// Appends what URLEncode returns for `value`.
void AppendURLEncoded(const std::string& value, std::string& text);

}  // namespace SSO
}  // namespace QOVA
