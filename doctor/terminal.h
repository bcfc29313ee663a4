// The terminal: its width and colours, and what the doctor is waiting for.
#pragma once

#include <string>

namespace doctor {

// The columns of standard output; 0 if it is not a terminal.
size_t TerminalWidth();

// True if standard output is a terminal and NO_COLOR is not set.
bool HasColour();

// Breaks text at blanks into lines of at most `width` columns (0: any) behind `indent` blanks;
// what is longer stays whole. The first line is not indented. Ends with a line break.
std::string Wrap(const std::string& text, size_t indent, size_t width);

// Shows on standard error, if it is a terminal, what the doctor is doing. The next call replaces
// it; an empty text removes it.
void Progress(const std::string& doing);

}  // namespace doctor
