// How many exchanges run at the same time, whoever started them.
#pragma once

#include <memory>

#include "store.h"

// TakeSlot returns a slot; it is free again when the object and all child processes that were
// started meanwhile are gone. Throws Failure if there is none.
std::unique_ptr<store::File> TakeSlot(int slots);
