// The state that goes to the provider and comes back with the code.
#pragma once

#include <json/value.h>

#include <string>

// DecodeState returns the JSON object in a state (base64, RFC 4648), null if it is none.
Json::Value DecodeState(const std::string& state);

// Member returns a member of an object as text, empty if it is missing or no string.
std::string Member(const Json::Value& object, const std::string& name);

// IsOwnPath says whether a text is the path of a page of this very site: anything else could
// lead the browser elsewhere.
bool IsOwnPath(const std::string& text);
