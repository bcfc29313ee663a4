// The identity of the login program.
#pragma once

// StepDown makes the web server's user and group the effective ids and keeps root as the saved
// ones, which is what the library needs to read the root-only settings for a moment.
//
// Two ways lead here, because a saved id does not survive exec: the program is installed
// set-user-id root (mode 4750, its group the web server's), or device/launcher started it, with
// root as the real identity. Throws std::runtime_error when it was installed or started in another
// way.
void StepDown();
