// Tokens of the doctor's own, to ask the library about one check after the other.
#pragma once

#include <json/value.h>

#include <string>

#include "doctor/checkup.h"

namespace doctor {

// Header and claims that pass all checks of the chosen client as it is configured, for the next
// hour: only the signature does not.
Json::Value GoodHeader(const Checkup& checkup);
Json::Value GoodClaims(const Checkup& checkup);

// A token in compact form. Its signature is a constant that belongs to nothing.
std::string MakeToken(const Json::Value& header, const Json::Value& claims);

// The same with the HMAC under `secret` (HS256).
std::string MakeSignedToken(const Json::Value& header, const Json::Value& claims,
                            const std::string& secret);

// A claim or header member as it is shown: "aud" of the token is ...
std::string Seen(const Json::Value& claims, const char* name);

}  // namespace doctor
