// The login program: started by the web server for each request of the browser.
//   GET  ?action=start&origin=PATH   starts a login; PATH is the page to come back to
//   GET  ?code=...&state=...         the redirect URI: the provider's answer
//   POST ?action=logout              ends the session here and at the provider
#include <exception>

#include "failure.h"
#include "login.h"
#include "process.h"
#include "random.h"

namespace {

void Answer() {
  Attempt attempt;
  attempt.request = cgi::ReadRequest();  // and nothing else of the environment is left
  process::Settle();
  attempt.reference = Reference();
  try {
    Serve(attempt);
  } catch (const Failure& failure) {
    Fail(attempt, failure);
  } catch (const std::exception& error) {
    Fail(attempt, Failure(FailureCode::kInternal, error.what()));
  }
}

}  // namespace

int main() {
  try {
    Answer();
  } catch (const std::exception& error) {
    process::EndNow("internal", error.what());
  }
}
