// Failures on order: every allocation while a call of the library runs, and every call that the
// library itself makes to a function that can fail, is counted, and the n-th of them fails.
#pragma once

#include <string>
#include <vector>

namespace faults {

enum class Kind { kMemory, kCall };

struct Plan {
  Kind kind;
  long nth;       // from 1; 0: nothing fails
  bool allAfter;  // so does everything of that kind after it
};

// While it lives, allocations are counted and kept track of, and fail as planned. One at a time.
class Armed {
 public:
  explicit Armed(const Plan& plan);
  ~Armed();
  Armed(const Armed&) = delete;
  Armed& operator=(const Armed&) = delete;
};

// What the last plan came to.
struct Seen {
  bool hit;          // whether it came to the n-th
  const char* name;  // which function that was
  long idsChange;    // the first change of process ids that failed, from 1; 0: none
  long looks;        // how often the library asked for its effective user id
};
Seen seen();

// Memory that was given out while armed, in any run, and is not back yet.
struct Kept {
  long blocks;
  std::string owner;  // the file of the code that asked for one of them
};
Kept kept();
// From now on it is not kept track of, which takes much of the time of a short process.
void ignoreMemory();

// How often each function was called while armed, over all runs.
struct Called {
  const char* name;
  long times;
};
std::vector<Called> calledSoFar();

// The functions that can be made to fail.
bool canFail(const std::string& function);

// The file name of the library under test, as it was loaded.
std::string libraryFile();

// Looks up everything that comes behind the functions here; before anything else.
void prepare();

}  // namespace faults
