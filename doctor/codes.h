// What providers answer when they refuse, and what to do about it. The one source for the doctor
// and for docs/messages.md.
#pragma once

#include <cstddef>
#include <string_view>

namespace doctor {

// The rows of a constant table.
template <typename Row>
struct Rows {
  const Row* begin() const { return first; }
  const Row* end() const { return first + count; }
  size_t size() const { return count; }

  const Row* first;
  size_t count;
};

enum class CodeSource { kEntra, kLiberty, kOAuth };

// Where a code is met: the bits of Code::met.
constexpr unsigned kPage = 1;        // on the provider's own page; the browser does not come back
constexpr unsigned kRedirect = 2;    // as "error" at the redirect URI
constexpr unsigned kToken = 4;       // in the answer of the token endpoint
constexpr unsigned kLogout = 8;      // at the end-session endpoint
constexpr unsigned kServerLog = 16;  // in the provider's log only

// No code proves that a secret is right: providers differ in the order of their checks.
enum class SecretVerdict { kUnknown, kRefused };

struct Code {
  CodeSource source;
  const char* name;
  unsigned met;
  const char* meaning;
  const char* action;
  SecretVerdict secret = SecretVerdict::kUnknown;
};

// Specific codes first, the plain OAuth errors last.
Rows<Code> Codes();

// The code of that name, in any case of letters; nullptr if it is not in the table.
const Code* FindCode(std::string_view name);

}  // namespace doctor
