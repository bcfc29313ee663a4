// Bad answers of a provider, made from a seed: what each connection of a login meets, and in what
// the login has to end.
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <vector>

#include "support/hostile.h"
#include "support/tokens.h"

namespace hostile {

// What honest answers are made of. Made once, before the server starts.
struct World {
  std::string base;  // the provider's address, without a path
  test::RsaKey key = test::anyRsaKey();
  test::RsaKey foreign;
  std::string secret = "s3cret of the device";
  int closedPort = 1;
};

// The end of a login: the exception's kind, and its message if that is settled.
struct Outcome {
  enum class Kind {
    kSignedIn,
    kInvalid,       // std::invalid_argument
    kResponse,      // QOVA::SSO::sso_err_resp
    kNotSupported,  // QOVA::JWT::jwt_not_support
    kUnverified,    // QOVA::JWT::jwt_verify_failed
    kJson,          // Json::LogicError
    kLogic,         // std::logic_error
  };
  Kind kind;
  std::string message;  // empty: any
};

struct Case {
  std::string kind;
  bool azure = true;
  std::array<test::Script, 3> scripts;  // code exchange, discovery document, key set
  std::vector<Outcome> outcomes;        // one of them
};

// The kinds of cases there are; the case of an index is of the kind index % kinds().
std::size_t kinds();
// The last so many kinds are right, and sign in.
std::size_t controls();
Case makeCase(const World& world, std::uint64_t seed, std::uint64_t index);

}  // namespace hostile
