// What the device's maker may choose. The web server sets it in the program's environment; a
// browser cannot, since what it sends arrives under other names.
#pragma once

struct Settings {
  // Whether a login goes through OIDCLogin alone. Then nobody compares the ID token's nonce, and
  // a code that was stolen from another login is not noticed. SSO_LOGIN_ROAD=plain
  bool plain = false;
  // Seconds until a provider that does not answer is given up. SSO_LOGIN_DEADLINE=20
  int deadline = 20;
};

// ReadSettings returns the settings; what is missing or cannot be used keeps its default.
Settings ReadSettings();
