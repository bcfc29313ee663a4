// The end of a session.
#pragma once

#include "cgi.h"
#include "sso/profile.h"

// Logout ends the request's session and sends the browser to the provider's logout. Throws Failure,
// and ends nothing, if the request does not come from a page of this device: the browser sends
// the cookie with the form of any other site.
void Logout(const cgi::Request& request, QOVA::SSO::SSOProfile& profile);
