// Random text that nobody can guess.
#pragma once

#include <cstddef>
#include <string>

// RandomBytes throws std::runtime_error if the system has none.
std::string RandomBytes(size_t size);

// Hex returns the lower-case hexadecimal digits of bytes.
std::string Hex(const std::string& bytes);

// Reference returns what a person can read out to an administrator: eight digits and letters,
// without those that look alike.
std::string Reference();
