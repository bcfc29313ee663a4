// The steps of a login, each one request of the browser.
#pragma once

#include <string>
#include <vector>

#include "cgi.h"
#include "failure.h"

// Attempt is what is known of a request while it is served: what a failure needs to say.
struct Attempt {
  cgi::Request request;
  std::string reference;
  std::string profile;
  std::string origin;                // the page to come back to; a path of this site, or empty
  std::vector<std::string> cookies;  // to be set with the answer
};

// Serve serves the request. Throws what goes wrong.
void Serve(Attempt& attempt);

// Fail logs what went wrong and sends the browser to the relay page with the failure's code and the
// attempt's reference.
void Fail(const Attempt& attempt, const Failure& failure);
