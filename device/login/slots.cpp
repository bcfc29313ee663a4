#include "slots.h"

#include <string>

#include "failure.h"
#include "identity.h"

std::unique_ptr<store::File> TakeSlot(int slots) {
  const AsRoot root;
  const std::string folder = store::Folder("slots", 0700);
  for (int i = 0; i < slots; ++i) {
    auto slot = std::make_unique<store::File>(folder + std::to_string(i), store::File::Wait::kNo);
    if (slot->Locked()) return slot;
  }
  throw Failure(FailureCode::kBusy, std::to_string(slots) + " exchanges are running already");
}
