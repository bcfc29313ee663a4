// The end of a session.
#pragma once

#include <string>

#include "cgi.h"
#include "sso/profile.h"

// HintCookie returns the text of the Set-Cookie header that keeps an ID token for the logout, or
// deletes the one before: WebSphere Liberty sends the browser back only if it gets the token again
// (OpenID Connect RP-Initiated Logout, id_token_hint). It stays in the browser that it is for.
std::string HintCookie(const std::string& profile, const std::string& token);

// Logout ends the request's session and sends the browser to the provider's logout. Throws Failure,
// and ends nothing, if the request does not come from a page of this device: the browser sends
// the cookie with the form of any other site.
void Logout(const cgi::Request& request, QOVA::SSO::SSOProfile& profile);
