// The part of the exchange that runs in the child process.
#pragma once

#include <json/value.h>
#include <sys/types.h>

#include <string>

#include "settings.h"

struct SignIn {
  std::string code;
  Json::Value state;
  std::string profile;
  Settings settings;
  pid_t parent;
};

// Run signs the user in and returns the name. Throws Failure.
std::string Run(const SignIn& work);
