// Splitting a text into a fixed number of pieces.
#pragma once

#include <array>
#include <string>
#include <string_view>

namespace QOVA {
namespace SSO {

template <size_t N>
using Pieces = std::array<std::string_view, N>;

// Splits `text` at every `separator`; adjacent ones are not merged, and empty pieces count.
// False unless there are exactly N pieces. The pieces point into `text`; no more than N are ever
// looked for, however many separators a hostile text has.
template <size_t N>
bool Split(std::string_view text, char separator, Pieces<N>& pieces) {
  size_t count = 0;
  for (;;) {
    const size_t end = text.find(separator);
    pieces[count++] = text.substr(0, end);
    if (end == text.npos) return count == N;
    if (count == N) return false;
    text.remove_prefix(end + 1);
  }
}

}  // namespace SSO
}  // namespace QOVA
