// What the doctor has found, and how it is told to people and to machines.
#pragma once

#include <json/value.h>

#include <string>
#include <vector>

namespace doctor {

// Said is one thing that the library says or does about a finding.
struct Said {
  enum class Kind { kLogs, kThrows, kDoes };

  Kind kind;
  std::string source;  // kLogs: the unit, "sso.cpp"; kThrows: the class; kDoes: nothing
  std::string text;    // the exact text (of a log line: behind "unit:line "); kDoes: our own words

  static Said Does(const std::string& text) { return {Kind::kDoes, "", text}; }
};

enum class Severity {
  kOk,         // looked at and found right
  kNote,       // worth knowing, nothing to do
  kWarning,    // a login works, but something is unsafe or fragile
  kUnchecked,  // could not be looked at
  kFailure,    // a login would fail
};

struct Finding {
  std::string id;  // stable; what a machine goes by
  Severity severity;
  std::string subject;  // the file, the endpoint, the claim
  std::string seen;
  std::vector<Said> library = {};
  std::string remedy = "";
};

// Report collects findings by topic. Whatever it prints is free of the secrets that it was told.
class Report {
 public:
  // Starts a topic; the findings that follow belong to it.
  void Begin(const std::string& topic);
  void Add(const Finding& finding);

  // Shorthands for what needs neither library text nor remedy.
  void Ok(const std::string& id, const std::string& subject, const std::string& seen);
  void Note(const std::string& id, const std::string& subject, const std::string& seen);

  // Replaces a text by "(hidden)" in all that is printed. Ignores texts of less than 4 bytes,
  // which would make the report unreadable.
  void Hide(const std::string& secret);

  bool Failed() const { return Count(Severity::kFailure) > 0; }

  // 0: nothing found that makes a login fail; 1: a login would fail; 2: something could not be
  // checked, and nothing else makes a login fail.
  int ExitStatus() const;

  void PrintText() const;
  void PrintJson() const;

 private:
  struct Entry {
    std::string topic;
    Finding finding;
  };

  size_t Count(Severity severity) const;
  std::string Clean(std::string text) const;
  void PrintFinding(const Finding& finding) const;
  Json::Value AsJson(const Entry& entry) const;
  std::string Verdict() const;

  std::string topic;
  std::vector<Entry> entries;
  std::vector<std::string> secrets;
};

}  // namespace doctor
