// The tickets that were used up and have not expired yet, in a file of fixed size.
#pragma once

#include <ctime>
#include <string>

// UseUp marks a ticket as used; false if it was used before. `ticket` is its seal, and the mark is
// kept until `expiry`.
//
// There is room for 32,768 tickets, in sets of eight. When a set is full, the mark that would
// expire first is dropped: such a ticket could come back from the browser that owned it, with a
// code that the provider has accepted once already.
bool UseUp(const std::string& ticket, time_t expiry);
