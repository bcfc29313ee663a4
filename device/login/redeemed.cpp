#include "redeemed.h"

#include <cstdint>
#include <stdexcept>

#include "identity.h"
#include "store.h"

namespace {

constexpr int kSets = 4096;
constexpr int kSlots = 8;

struct Mark {
  std::uint64_t ticket;
  std::int64_t expiry;
};

struct Set {
  Mark marks[kSlots];
};

}  // namespace

bool UseUp(const std::string& ticket, time_t expiry) {
  const std::uint64_t number = std::stoull(ticket.substr(0, 16), nullptr, 16);
  const off_t offset = static_cast<off_t>(number % kSets * sizeof(Set));
  const AsRoot root;
  const store::File file(store::Folder("", 0755) + "redeemed", store::File::Wait::kYes);
  Set set{};  // of zeros, where the file does not reach yet
  file.Read(&set, sizeof set, offset);
  Mark* oldest = set.marks;
  for (Mark& mark : set.marks) {
    if (mark.ticket == number && mark.expiry == expiry) return false;
    if (mark.expiry < oldest->expiry) oldest = &mark;
  }
  *oldest = {number, expiry};
  if (!file.Write(&set, sizeof set, offset)) throw std::runtime_error("cannot mark the ticket");
  return true;
}
