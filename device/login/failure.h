// Why a sign-in failed: a code from a closed list for the person, the exact text for the log.
#pragma once

#include <stdexcept>
#include <string>

// Each code has a sentence in every language of the pages; `kFailureNames` has the same order.
enum class FailureCode {
  kNotSetUp,        // there are no usable settings of a provider
  kDisabled,        // single sign-on is switched off
  kBadRequest,      // the program does not know the request
  kExpired,         // not started in this browser, too old, used already, or another login's state
  kDenied,          // the provider reports access_denied: the person or an administrator said no
  kProviderError,   // the provider reports another error, or answers with nonsense
  kUnreachable,     // no connection to the provider, or no answer
  kTimeout,         // the deadline passed
  kBusy,            // too many sign-ins at once
  kNotVerified,     // the ID token was refused
  kUnknownUser,     // the user name cannot be used on this device
  kSignOutRefused,  // the request to sign out did not come from this device's own page
  kInternal,        // anything else
};

constexpr const char* kFailureNames[] = {
    "not-set-up",     "disabled",         "bad-request", "expired", "denied",
    "provider-error", "unreachable",      "timeout",     "busy",    "not-verified",
    "unknown-user",   "sign-out-refused", "internal"};

// What an error response of the provider says (RFC 6749, sections 4.1.2.1 and 5.2).
struct ProviderError {
  std::string error;
  std::string description;
};

class Failure : public std::runtime_error {
 public:
  Failure(FailureCode failure, const std::string& text, ProviderError answer = {})
      : std::runtime_error(text), code(failure), provider(std::move(answer)) {}

  const char* Name() const { return kFailureNames[static_cast<int>(code)]; }

  const FailureCode code;
  const ProviderError provider;
};
