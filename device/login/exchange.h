// The exchange of a code for a user's name.
#pragma once

#include <json/value.h>

#include <string>

#include "settings.h"

struct SignedIn {
  std::string user;
  std::string token;  // the ID token; empty if it is very long
};

// Exchange signs a user in. `state` is the decoded state of this login, and
// `profile` the name of the provider's profile.
//
// The library waits for the provider as long as the provider likes, and takes whatever it sends.
// This happens in a child process with limits of time and memory, which gives up root before it
// talks to the network. Throws Failure, whose texts are free of code, client secret and tokens.
SignedIn Exchange(const std::string& code, const Json::Value& state, const std::string& profile,
                  const Settings& settings);
