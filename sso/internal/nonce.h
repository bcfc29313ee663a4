// The nonce of an authorization request. Not exported.
#pragma once

#include <string>

namespace QOVA {
namespace SSO {

// A fresh random UUID (RFC 4122, version 4) in its 36-character text form.
std::string MakeNonce();

}  // namespace SSO
}  // namespace QOVA
