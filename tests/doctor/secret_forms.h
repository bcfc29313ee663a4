// A secret in the encodings in which a server may repeat it.
#pragma once

#include <string>
#include <vector>

namespace test {

constexpr char kOddSecret[] = "q7Z~+/=w.<k>&\"9 x\\Lr_'T-5%M8vB\xc3\xa9";

// One encoding each.
std::vector<std::string> secretForms();
// With one encoding in another.
std::vector<std::string> allSecretForms();

// The first 8 characters in a row of the form that are in the text; empty if there are none.
std::string windowIn(const std::string& text, const std::string& form);

// Text of a server that holds no part of a form.
std::string filler(size_t length);

}  // namespace test
