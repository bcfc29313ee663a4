// The token endpoint, and what it says about the client secret.
#pragma once

#include <json/value.h>

#include <string>

#include "doctor/checkup.h"
#include "doctor/web.h"

namespace doctor {

// Sends an empty request, and with --try-secret one with the client secret.
void CheckTokenEndpoint(Checkup& checkup);

bool IsRedirect(const WebAnswer& answer);

// "HTTP 302, text/html, to https://..."
std::string Describe(const WebAnswer& answer);

// "error" and "error_description" of an OAuth error response.
std::string ErrorOf(const Json::Value& document);

}  // namespace doctor
