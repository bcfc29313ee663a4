// The forms in which people paste an error, and texts that have nothing to do with it.
#pragma once

#include <functional>
#include <ostream>
#include <string>
#include <vector>

#include "doctor/messages.h"

namespace test {

struct Form {
  std::string name;
  bool only_codes;
  // The code or message in this form; empty if it does not come in it.
  std::function<std::string(const std::string&)> write;
};

void PrintTo(const Form& form, std::ostream* out);

std::vector<Form> forms();
std::vector<Form> formsOfMessages();

// The message as the library writes it, with values for its "%s".
std::string asLogged(const doctor::Message& message);

std::vector<std::string> unrelatedTexts();

// The names that --explain finds.
std::vector<std::string> namesIn(const std::string& text);

}  // namespace test
