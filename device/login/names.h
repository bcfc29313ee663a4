// User names: which ones this device can use.
#pragma once

#include <string>

#include "settings.h"

// CheckUserName throws Failure for a name that is empty, longer than 256 bytes, "." or "..", no
// UTF-8, or that holds control characters or begins or ends with a blank. `what` names the text.
// Nothing is cut or repaired: the name would then be somebody else's.
void CheckUserName(const std::string& name, const char* what);

// LookUp asks the device for a user: by the name service switch, or by a command that gets the name
// as its argument and ends with status 0 if there is such a user. Throws Failure if there is none,
// or nobody can be asked.
void LookUp(const std::string& name, const Settings& settings);
