// What the doctor has found. One cause is one finding.
#pragma once

#include <string>
#include <vector>

#include "doctor/finding.h"

namespace doctor {

// Entry is a finding as it is reported: the same cause may be in several places.
struct Entry {
  std::string topic;
  Finding finding;
  std::vector<Place> places;
};

// Report collects findings by topic, and takes what they quote and name through redact.h.
class Report {
 public:
  // Starts a topic; the findings that follow belong to it.
  void Begin(const std::string& topic);

  // Adds a finding. One that was there before, with the same cause and action, gets its place. A
  // finding whose `because` is not in the report counts like any other.
  void Add(Finding finding);

  // Shorthands, with the members in their order.
  void Fail(const std::string& id, const std::string& cause, const Place& place,
            const std::string& action, const std::vector<Said>& detail = {}) {
    Add({id, Grade::kFailure, cause, place, action, detail});
  }
  void Warn(const std::string& id, const std::string& cause, const Place& place,
            const std::string& action, const std::vector<Said>& detail = {}) {
    Add({id, Grade::kWarning, cause, place, action, detail});
  }
  void Unchecked(const std::string& id, const std::string& cause, const Place& place,
                 const std::string& action, const std::vector<Said>& detail = {}) {
    Add({id, Grade::kUnchecked, cause, place, action, detail});
  }
  void Good(const std::string& id, const std::string& cause, const Place& place = {});

  // Adds that `what` could not be checked, as a consequence of the failure `because`.
  void Skip(const std::string& what, const std::string& because);

  void AddRequest(Request request);

  bool Has(const std::string& id) const;
  // True if there is a failure about the URL.
  bool HasAt(const std::string& url) const;
  // What keeps later checks from their work in the topic that was begun last: its first failure
  // or thing that could not be checked; empty if there is none.
  std::string Obstacle() const;

  // 0: no failure and everything checked; 1: a failure; 3: something could not be checked.
  int ExitStatus() const;
  // What is the case, in a sentence without a full stop.
  std::string Verdict() const;

  size_t Count(Grade grade) const;  // without consequences
  // By grade, within a grade in the order of the checks.
  std::vector<Entry> Sorted() const;
  const std::vector<Request>& Requests() const { return requests; }

 private:
  std::string topic;
  std::vector<Entry> entries;
  std::vector<Request> requests;
};

// print.cpp
void PrintText(const Report& report, bool verbose);
void PrintJson(const Report& report);
// What ended the doctor itself, in JSON.
void PrintJsonError(const std::string& error, int exit_status);

}  // namespace doctor
