// An operation of the library as the driver of the fault injection runs it: what it does and gives
// when nothing fails, and what else it may give when something does.
#pragma once

#include <functional>
#include <map>
#include <string>
#include <vector>

#include "faults/faults.h"
#include "faults/lines.h"

namespace faults {

// One run of an operation.
class Run {
 public:
  explicit Run(const Plan& planned) : plan(planned) {}

  // The part of the operation during which things fail. An exception that it throws is kept as
  // the outcome, "type: message".
  void armed(const std::function<void()>& call);

  bool returned() const { return back; }
  // What the operation gave, if it returned.
  void gave(const std::string& text);
  // What must hold whatever failed.
  void expect(bool good, const std::string& what);

  // The one error that the operation wrote to the log, after it is over: one of these, or none
  // if there is none here.
  void logged(const std::vector<Line>& any);
  bool hasLine(const std::vector<Line>& any) const;
  const std::vector<test::LogLine>& lines() const { return written; }
  void forgetLines() { written.clear(); }

  const std::string& outcome() const { return result; }
  const std::string& complaints() const { return wrong; }

 private:
  Plan plan;
  bool back = false;
  std::string result;
  std::string wrong;
  std::vector<test::LogLine> written;  // by the armed part
};

using Outcomes = std::vector<std::string>;  // a "*" at the end matches anything

struct Operation {
  // What is called, as the library's headers name it, and perhaps ", " and which variant it takes.
  std::string name;
  std::string good;  // the outcome when nothing fails
  // The outcomes when that function fails; "memory" means any allocation, "several" the
  // functions that fail together, and a "+" behind a name for that function with all that follow.
  // Not listed: the outcome is the good one; when memory runs out it may always be std::bad_alloc.
  std::map<std::string, Outcomes> on;
  std::function<void(Run&)> body;
  std::function<void()> configure = nullptr;  // as root, before anything else; may be missing
  // kStranger: over TLS, with its own certificate for another name.
  enum class Server { kNone, kPlain, kTls, kStranger } server = Server::kNone;
  bool cold = false;   // also in processes that have done nothing before
  bool quiet = false;  // nothing is logged: that is for its callers
};

// What the operations work with. Made in its own process, so that the libraries have done
// nothing yet where the operations run.
struct Fixtures {
  std::map<std::string, std::string> texts;
  const std::string& operator[](const std::string& name) const { return texts.at(name); }
};
Fixtures& fixtures();
void makeFixtures();

// The provider that the operations talk to; restarted when its time is running out.
std::string providerUrl(const std::string& path);
void startProvider(Operation::Server server);
void stopProvider();
void leaveProvider();  // in a child process: to its parent

const std::vector<Operation>& operations();

}  // namespace faults
