// The key set of the Azure client.
#pragma once

#include <string>

#include "doctor/checkup.h"

namespace doctor {

// Fetches the key set and finds the keys that the library can use. The identifier of one of them;
// empty if there is none.
std::string CheckKeySet(Checkup& checkup, const std::string& uri);

// True if the key has strings "n" and "e" that make up an RSA key.
bool IsUsableKey(const Json::Value& key);

// The first key that can be used, and the first with this identifier; null if there is none.
Json::Value AnyUsableKey(const Json::Value& key_set);
Json::Value KeyNamed(const Json::Value& key_set, const std::string& kid);

}  // namespace doctor
