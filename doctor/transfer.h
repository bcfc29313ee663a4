// From a request's outcome to findings: name, connection, TLS, and the certificates.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "doctor/checkup.h"
#include "doctor/web.h"

namespace doctor {

// What is asked, and what it means if no answer comes.
struct Destination {
  std::string subject;  // "token endpoint"
  std::string url;
  Severity grave;  // of a request that fails
  // What the library says about the same request; asked only if it may end in good time.
  std::function<std::vector<Said>()> library;
};

// Adds what the request showed about the way to the server. True if an HTTP answer came.
bool ReportTransfer(Checkup& checkup, const Destination& destination, const WebAnswer& answer);

}  // namespace doctor
