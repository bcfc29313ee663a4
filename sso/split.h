// Splitting a text into a fixed number of pieces.
#pragma once

#include <array>
#include <boost/algorithm/string/classification.hpp>
#include <boost/algorithm/string/find_iterator.hpp>
#include <boost/algorithm/string/finder.hpp>
#include <boost/range/iterator_range.hpp>
#include <string>

namespace QOVA {
namespace SSO {

template <size_t N>
using Pieces = std::array<boost::iterator_range<std::string::const_iterator>, N>;

// Splits `text` at every `separator`; adjacent ones are not merged, and empty pieces count.
// False unless there are exactly N pieces. The pieces point into `text`; no more than N are ever
// held, however many separators a hostile text has.
template <size_t N>
bool Split(const std::string& text, const char* separator, Pieces<N>& pieces) {
  size_t count = 0;
  auto piece = boost::algorithm::make_split_iterator(
      text, boost::algorithm::token_finder(boost::algorithm::is_any_of(separator)));
  for (; !piece.eof(); ++piece) {
    if (count == N) return false;
    pieces[count++] = *piece;
  }
  return count == N;
}

}  // namespace SSO
}  // namespace QOVA
