// The pages that the programs write themselves, in the language of the browser.
//
// The words are those of www/texts.js, which the relay page shows too: they are compiled in.
#pragma once

#include <string>
#include <utility>
#include <vector>

#include "cgi.h"

namespace page {

// Words are the texts of one language, ready to be put into a page.
class Words {
 public:
  // Takes the language that the browser likes best of those there are; English if there is none.
  explicit Words(const cgi::Request& request);

  const std::string& language() const { return language_; }

  // Get returns a text. A part "{name}" of it is replaced by `value`, which must be HTML.
  std::string Get(const std::string& text, const std::string& name = "",
                  const std::string& value = "") const;

  // Failure returns what went wrong and what the person can do, for the code of a failure; for an
  // unknown code a general sentence.
  std::pair<std::string, std::string> Failure(const std::string& code) const;

 private:
  std::string language_;
};

// Outcome is how a login failed: a code of failure.h and the reference number of the log line.
struct Outcome {
  std::string code;
  std::string reference;
};

// ReadOutcome reads "CODE.REFERENCE"; both are empty for anything else.
Outcome ReadOutcome(const std::string& text);

// Write writes a whole answer: the head with `headers` (names and values), and a page around
// `body`, which is HTML. Throws std::invalid_argument, before anything is written, if a header
// holds a control character.
void Write(const Words& words, const std::string& title, const std::string& body,
           const std::vector<std::pair<std::string, std::string>>& headers);

// Wait writes a page that shows that the sign-in goes on, and that goes to `onward`, a relative
// URL, at once. The browser shows it until the answer from there comes.
void Wait(const cgi::Request& request, const std::string& onward);

}  // namespace page
