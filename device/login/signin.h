// The part of the exchange that runs in the child process.
#pragma once

#include <json/value.h>
#include <sys/types.h>

#include <string>

#include "exchange.h"
#include "settings.h"

struct SignIn {
  std::string code;
  Json::Value state;
  std::string profile;
  Settings settings;
  pid_t parent;
};

// Run signs the user in. Throws Failure.
SignedIn Run(const SignIn& work);
