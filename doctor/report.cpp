#include "doctor/report.h"

#include <algorithm>

#include "doctor/redact.h"
#include "doctor/text.h"

namespace doctor {

namespace {

constexpr int kFailureFound = 1;
constexpr int kNotAllChecked = 3;

void CleanPlace(Place& place) {
  for (std::string* text : {&place.file, &place.key, &place.url, &place.address}) {
    *text = Clean(*text);
  }
}

}  // namespace

void Report::Begin(const std::string& name) {
  topic = name;
}

void Report::Add(Finding finding) {
  finding.cause = CleanWhole(finding.cause);
  finding.action = CleanWhole(finding.action);
  CleanPlace(finding.place);
  for (Said& said : finding.detail) {
    said.text = said.kind == Said::Kind::kDoes ? CleanWhole(said.text) : Clean(said.text);
  }
  if (!finding.because.empty() && !Has(finding.because)) finding.because.clear();
  for (Entry& entry : entries) {
    if (entry.finding.grade != Grade::kGood && entry.finding.id == finding.id &&
        entry.finding.cause == finding.cause && entry.finding.action == finding.action) {
      entry.places.push_back(finding.place);
      return;
    }
  }
  entries.push_back({topic, finding, {finding.place}});
}

void Report::Good(const std::string& id, const std::string& cause, const Place& place) {
  Add({id, Grade::kGood, cause, place});
}

void Report::Skip(const std::string& what, const std::string& because) {
  Add({"check-skipped", Grade::kUnchecked, what + " could not be checked", {}, "", {}, because});
}

void Report::AddRequest(Request request) {
  request.url = Clean(request.url);
  requests.push_back(request);
}

bool Report::Has(const std::string& id) const {
  return std::any_of(entries.begin(), entries.end(),
                     [&id](const Entry& entry) { return entry.finding.id == id; });
}

bool Report::HasAt(const std::string& url) const {
  return std::any_of(entries.begin(), entries.end(), [&url](const Entry& entry) {
    return entry.finding.grade == Grade::kFailure && entry.finding.place.url == url;
  });
}

std::string Report::Obstacle() const {
  for (const Grade grade : {Grade::kFailure, Grade::kUnchecked}) {
    for (const Entry& entry : entries) {
      if (entry.topic == topic && entry.finding.grade == grade) return entry.finding.id;
    }
  }
  return "";
}

size_t Report::Count(Grade grade) const {
  return static_cast<size_t>(
      std::count_if(entries.begin(), entries.end(), [grade](const Entry& entry) {
        return entry.finding.grade == grade && entry.finding.because.empty();
      }));
}

int Report::ExitStatus() const {
  if (Count(Grade::kFailure) > 0) return kFailureFound;
  return Count(Grade::kUnchecked) > 0 ? kNotAllChecked : 0;
}

std::string Report::Verdict() const {
  if (Count(Grade::kFailure) > 0) return "Sign-in fails";
  if (Count(Grade::kUnchecked) > 0) return "No failure was found, but not everything was checked";
  return "No failure was found";
}

std::vector<Entry> Report::Sorted() const {
  std::vector<Entry> sorted = entries;
  std::stable_sort(sorted.begin(), sorted.end(), [](const Entry& one, const Entry& other) {
    return one.finding.grade < other.finding.grade;
  });
  return sorted;
}

}  // namespace doctor
