// Faults of a device or its provider, one by one, and what the doctor must say of each.
#pragma once

#include <functional>
#include <ostream>
#include <string>
#include <vector>

#include "doctor_site.h"

namespace test {

// How the library itself bears out what the doctor says.
enum class Proof {
  kSameWords,  // OIDCLogin throws what the finding says, and logs what it says
  kFails,      // OIDCLogin throws something else first
  kSucceeds,   // OIDCLogin signs the user in: the finding is a warning
  kNone,       // the fault shows at the provider, in the browser, or in another program
};

struct SeededFault {
  std::string name;
  std::function<void(Site&)> seed;
  std::string id;
  std::string grade;
  std::string library;  // a text that the library throws or logs; empty: it does neither
  std::string action;   // a part of it
  int status;
  Proof proof;
  Ids caller = {0, 0, 0};
  bool azure = true;
  std::string cause = "";  // a part of it
};

inline std::ostream& operator<<(std::ostream& out, const SeededFault& fault) {
  return out << fault.name;
}

std::vector<SeededFault> allFaults();
std::vector<SeededFault> localFaults();  // those of local_faults.cpp, which are among them
std::vector<SeededFault> wayFaults();    // between device and provider; network_faults.cpp

}  // namespace test
