// The token endpoint, and what it says about the client secret.
#pragma once

#include "doctor/checkup.h"

namespace doctor {

// Sends a token request without the secret, and with --try-secret others with it.
void CheckTokenEndpoint(Checkup& checkup);

}  // namespace doctor
