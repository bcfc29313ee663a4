// The report, for people and for machines.
#include <json/value.h>

#include <iostream>

#include "doctor/json.h"
#include "doctor/redact.h"
#include "doctor/report.h"
#include "doctor/terminal.h"
#include "doctor/text.h"

namespace doctor {

namespace {

constexpr size_t kIndent = 13;  // the longest label and two blanks

struct GradeName {
  const char* label;
  const char* machine;
  const char* colour;
};

GradeName NameOf(Grade grade) {
  switch (grade) {
    case Grade::kFailure:
      return {"FAILURE", "failure", "\x1b[1;31m"};
    case Grade::kWarning:
      return {"WARNING", "warning", "\x1b[1;33m"};
    case Grade::kUnchecked:
      return {"NOT CHECKED", "unchecked", "\x1b[1;36m"};
    case Grade::kGood:
      break;
  }
  return {"GOOD", "good", "\x1b[1;32m"};
}

std::string Line(const Said& said) {
  switch (said.kind) {
    case Said::Kind::kLogs:
      return "The library logs " + Quote(said.text) + " (" + said.source + ").";
    case Said::Kind::kThrows:
      return "The library throws " + said.source + " " + Quote(Printable(said.text)) + ".";
    case Said::Kind::kDoes:
      break;
  }
  return "The library " + said.text + ".";
}

std::string PlaceText(const Place& place) {
  std::string text = place.file;
  if (!place.key.empty()) text += (text.empty() ? "" : ", ") + place.key;
  if (!place.url.empty()) text += (text.empty() ? "" : ", ") + place.url;
  if (!place.address.empty()) text += " (" + place.address + ")";
  return text;
}

std::string RequestText(const Request& request, bool verbose) {
  const std::string time = std::to_string(request.milliseconds) + " ms";
  if (!verbose) return request.what + " " + time;
  return request.method + " " + request.url +
         (request.address.empty() ? "" : " (" + request.address + ")") + ": " +
         (request.status == 0 ? "no answer" : "HTTP " + std::to_string(request.status)) + ", " +
         time;
}

class TextReport {
 public:
  TextReport(const Report& to_print, bool with_details)
      : report(to_print), verbose(with_details), colour(HasColour()), width(TerminalWidth()) {}

  void Print() const {
    for (const Entry& entry : report.Sorted()) {
      const bool folded = entry.finding.grade == Grade::kGood || !entry.finding.because.empty();
      if (verbose || !folded) PrintEntry(entry);
    }
    PrintGood();
    PrintRequests();
    PrintVerdict();
  }

 private:
  void Paragraph(const std::string& text) const {
    std::cout << std::string(kIndent, ' ') << Wrap(Printable(text), kIndent, width);
  }

  void Label(Grade grade, const std::string& text) const {
    const GradeName name = NameOf(grade);
    std::string label = name.label;
    label.resize(kIndent, ' ');
    std::cout << (colour ? name.colour + label + "\x1b[0m" : label)
              << Wrap(Printable(text), kIndent, width);
  }

  void PrintEntry(const Entry& entry) const {
    const Finding& finding = entry.finding;
    Label(finding.grade, finding.cause + ".");
    for (const Place& place : entry.places) {
      const std::string text = PlaceText(place);
      if (!text.empty()) Paragraph(text);
    }
    if (!finding.action.empty()) Paragraph("-> " + finding.action);
    if (!verbose) return;
    for (const Said& said : finding.detail) Paragraph(Line(said));
    Paragraph("[" + finding.id + "] " + entry.topic +
              (finding.because.empty() ? "" : "; a consequence of [" + finding.because + "]"));
  }

  void PrintGood() const {
    const size_t count = report.Count(Grade::kGood);
    if (verbose || count == 0) return;
    std::string topics;
    std::string last;
    for (const Entry& entry : report.Sorted()) {
      if (entry.finding.grade != Grade::kGood || entry.topic == last) continue;
      last = entry.topic;
      topics += (topics.empty() ? "" : ", ") + last;
    }
    Label(Grade::kGood, std::to_string(count) + " checks: " + topics + ".");
  }

  void PrintRequests() const {
    std::string all;
    for (const Request& request : report.Requests()) {
      if (verbose) Paragraph(RequestText(request, true));
      all += (all.empty() ? "" : ", ") + RequestText(request, false);
    }
    if (!verbose && !all.empty()) Paragraph("Requests: " + all + ".");
  }

  void PrintVerdict() const {
    std::cout << '\n'
              << Wrap(report.Verdict() + ": " + Plural(report.Count(Grade::kFailure), "failure") +
                          ", " + Plural(report.Count(Grade::kWarning), "warning") + ", " +
                          std::to_string(report.Count(Grade::kUnchecked)) + " not checked. " +
                          Next(),
                      0, width);
  }

  std::string Next() const {
    if (report.Count(Grade::kFailure) > 0) {
      return "Next: fix the first failure and run ssoclient-doctor again.";
    }
    if (report.Count(Grade::kUnchecked) > 0) {
      return "Next: do what is said at NOT CHECKED and run ssoclient-doctor again.";
    }
    if (report.Count(Grade::kWarning) > 0) return "Next: consider the warnings.";
    return report.Requests().empty() ? "Next: run ssoclient-doctor without --offline."
                                     : "Next: sign in with a browser.";
  }

  const Report& report;
  const bool verbose;
  const bool colour;
  const size_t width;
};

Json::Value AsJson(const Place& place) {
  Json::Value value(Json::objectValue);
  if (!place.file.empty()) value["file"] = place.file;
  if (!place.key.empty()) value["key"] = place.key;
  if (!place.url.empty()) value["url"] = place.url;
  if (!place.address.empty()) value["address"] = place.address;
  return value;
}

Json::Value AsJson(const Said& said) {
  Json::Value value(Json::objectValue);
  switch (said.kind) {
    case Said::Kind::kLogs:
      value["logs"] = said.text;
      value["unit"] = said.source;
      break;
    case Said::Kind::kThrows:
      value["throws"] = said.text;
      value["class"] = said.source;
      break;
    case Said::Kind::kDoes:
      value["does"] = said.text;
  }
  return value;
}

Json::Value AsJson(const Entry& entry) {
  const Finding& finding = entry.finding;
  Json::Value value(Json::objectValue);
  value["id"] = finding.id;
  value["topic"] = entry.topic;
  value["grade"] = NameOf(finding.grade).machine;
  value["cause"] = finding.cause;
  value["action"] = finding.action;
  value["because"] = finding.because;
  Json::Value& places = value["places"] = Json::Value(Json::arrayValue);
  for (const Place& place : entry.places) places.append(AsJson(place));
  Json::Value& detail = value["detail"] = Json::Value(Json::arrayValue);
  for (const Said& said : finding.detail) detail.append(AsJson(said));
  return value;
}

Json::Value AsJson(const Request& request) {
  Json::Value value(Json::objectValue);
  value["what"] = request.what;
  value["method"] = request.method;
  value["url"] = request.url;
  value["address"] = request.address;
  value["status"] = static_cast<Json::Int64>(request.status);
  value["milliseconds"] = static_cast<Json::Int64>(request.milliseconds);
  return value;
}

Json::Value Document(const std::string& verdict, int exit_status) {
  Json::Value value(Json::objectValue);
  value["tool"] = "ssoclient-doctor";
  value["version"] = SSOCLIENT_VERSION;
  value["verdict"] = verdict;
  value["exit_status"] = exit_status;
  value["findings"] = Json::Value(Json::arrayValue);
  value["requests"] = Json::Value(Json::arrayValue);
  return value;
}

}  // namespace

void PrintText(const Report& report, bool verbose) {
  TextReport(report, verbose).Print();
}

void PrintJson(const Report& report) {
  Json::Value value = Document(report.Verdict(), report.ExitStatus());
  for (const Entry& entry : report.Sorted()) value["findings"].append(AsJson(entry));
  for (const Request& request : report.Requests()) value["requests"].append(AsJson(request));
  std::cout << WriteJson(value, JsonStyle::kForPeople) << '\n';
}

void PrintJsonError(const std::string& error, int exit_status) {
  Json::Value value = Document("ssoclient-doctor could not run", exit_status);
  value["error"] = Clean(error);
  std::cout << WriteJson(value, JsonStyle::kForPeople) << '\n';
}

}  // namespace doctor
