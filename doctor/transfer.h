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
  std::string what;  // "token endpoint"
  std::string url;
  Grade grave;  // of a request that fails
  // What the library says about the same request; asked only if it may end in good time.
  std::function<std::vector<Said>()> library;
};

// The URL, and the IP address that answered.
Place At(const Destination& destination, const WebAnswer& answer);

// Sends the request (a form if `body` is given), and adds it and what it shows about the way to
// the server to the report. True if an HTTP answer came.
bool Exchange(Checkup& checkup, const Destination& destination, const std::string* body,
              WebAnswer& answer);

}  // namespace doctor
