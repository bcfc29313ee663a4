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
  // What to do if the URL leads nowhere; empty: in general words.
  std::string fix = "";
  bool page = false;  // the answer is a page for people
};

// The URL, and the IP address that answered.
Place At(const Destination& destination, const WebAnswer& answer);

// Sends the request, a form if `body` is given, to `url` if that is not the destination's alone.
WebAnswer Send(Checkup& checkup, const Destination& destination, const std::string* body = nullptr,
               const std::string& url = "");

// Reports what the answer shows about the way to the provider. True if it is the provider's.
bool Judge(Checkup& checkup, const Destination& destination, const WebAnswer& answer);

// Both.
bool Exchange(Checkup& checkup, const Destination& destination, const std::string* body,
              WebAnswer& answer, const std::string& url = "");

}  // namespace doctor
