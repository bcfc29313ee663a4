// What the device's maker may choose: login.conf beside the settings of the providers.
//
// It comes from a file that root alone can write, never from the environment: whoever can start
// the login program could otherwise switch its checks off.
#pragma once

#include <string>
#include <vector>

constexpr char kSettingsFile[] = "/usr/qova/etc/ssoclient/login.conf";

struct Settings {
  int deadline = 20;                 // seconds for the exchange with the provider
  std::string proxy;                 // URL, for libcurl
  std::string no_proxy;              // hosts that are reached without it
  bool nonce_check = true;           // without it, a stolen code is not noticed
  int max_exchanges = 8;             // at the same time
  int session_lifetime = 12 * 3600;  // seconds
  int max_sessions = 1000;
  std::string user_lookup = "none";  // or "nss", or the path of a command
  std::string provider_name;         // on the button that signs in

  std::vector<std::string> complaints;  // what in the file cannot be used
};

// ReadSettings returns the settings; what is missing or cannot be used keeps its default. Throws
// Failure if the file is there and cannot be read, or if others than root can write it.
Settings ReadSettings();
