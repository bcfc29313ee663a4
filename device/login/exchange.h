// The exchange of a code for a user's name.
#pragma once

#include <json/value.h>

#include <string>

#include "settings.h"

// Exchange signs a user in and returns the name. `state` is the decoded state of this login.
//
// The library waits for the provider as long as the provider likes, so this happens in a child
// process that ends at the deadline. Throws std::runtime_error with the text of what went wrong,
// free of code, client secret and tokens.
std::string Exchange(const std::string& code, const Json::Value& state, const Settings& settings);
