// The pages that the programs write themselves, in the language of the browser.
//
// The words are those of www/texts.js, which the relay page shows too: they are compiled in.
#pragma once

#include <string>
#include <utility>

namespace page {

// Words are the texts of one language, ready to be put into a page.
class Words {
 public:
  // Takes the language that the browser likes best of those there are; English if there is none.
  explicit Words(const std::string& accepted_languages);

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

// Frame returns a page around `body`, which is HTML.
std::string Frame(const Words& words, const std::string& title, const std::string& body);

// SigningIn returns the page that a browser shows while it waits for the answer of `url`.
// `languages` is the browser's Accept-Language.
std::string SigningIn(const std::string& url, const std::string& languages);

}  // namespace page
