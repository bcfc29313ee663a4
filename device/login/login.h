// The steps of a login, each one request of the browser. They throw what goes wrong.
#pragma once

#include <string>

#include "cgi.h"

// Start sends the browser to the provider.
void Start(const cgi::Request& request);

// Callback takes the provider's answer, signs the user in and sends the browser to the relay page.
void Callback(const cgi::Request& request);

// Logout ends the session and sends the browser to the provider's logout.
void Logout(const cgi::Request& request);

// Fail logs what went wrong and sends the browser to the relay page with a short reason.
void Fail(const cgi::Request& request, const std::string& text);
