// What the library under test exports and imports, as its own dynamic symbols say.
#pragma once

#include <set>
#include <string>
#include <vector>

namespace faults {

struct Compared {
  long all;
  std::vector<std::string> missing;
};

// The exported functions; missing are those that are not among the operations. Destructors are
// part of every run.
Compared compareExports(const std::set<std::string>& operations);

// The imported functions; missing are those that the driver does not make fail and that are not
// known to be unable to, or to fail only when memory runs out.
Compared compareImports();

}  // namespace faults
