// ssoclient-doctor --explain: what the codes and messages in a pasted text mean.
#pragma once

#include <string>
#include <vector>

#include "doctor/codes.h"

namespace doctor {

struct Explanation {
  std::string name;   // the code or the library's text
  std::string where;  // where it is met, or who says it
  std::string meaning;
  std::string action;
  bool secret_refused;
};

// The codes and messages that the text holds. Nothing of the text itself is in the result: it may
// hold secrets, codes and tokens.
std::vector<Explanation> Explain(const std::string& text);

// The codes alone, in the order of the table.
std::vector<const Code*> CodesOf(const std::string& text);

// Explains the text, or standard input if it is "-", on standard output. The exit status: 0 if
// anything was recognised, 1 if not.
int RunExplain(const std::string& text, bool json);

// Where a code is met, in words.
std::string PlacesOf(unsigned met);

}  // namespace doctor
