#include "doctor/report.h"

#include <algorithm>
#include <cctype>
#include <cstring>
#include <iostream>

#include "doctor/json.h"
#include "doctor/text.h"

namespace doctor {

namespace {

constexpr size_t kShortestSecret = 4;
constexpr char kHidden[] = "(hidden)";

struct Name {
  const char* text;
  const char* machine;
};

Name NameOf(Severity severity) {
  switch (severity) {
    case Severity::kOk:
      return {"ok", "ok"};
    case Severity::kNote:
      return {"note", "note"};
    case Severity::kWarning:
      return {"WARNING", "warning"};
    case Severity::kUnchecked:
      return {"NOT CHECKED", "unchecked"};
    case Severity::kFailure:
      break;
  }
  return {"FAILURE", "failure"};
}

// What the library says, as a line for people.
std::string Line(const Said& said) {
  switch (said.kind) {
    case Said::Kind::kLogs:
      return "logs " + Quote(said.text) + " (" + said.source + ")";
    case Said::Kind::kThrows:
      return "throws " + said.source + " " + Quote(Printable(said.text));
    case Said::Kind::kDoes:
      break;
  }
  return said.text;
}

// Takes out what looks like a JSON Web Token, whoever wrote it: "eyJ" is how {" begins in base64.
void HideTokens(std::string& text) {
  for (size_t at = 0; (at = text.find("eyJ", at)) != std::string::npos;) {
    size_t end = at;
    size_t dots = 0;
    while (end < text.size() && (std::isalnum(static_cast<unsigned char>(text[end])) != 0 ||
                                 std::strchr("-_.", text[end]) != nullptr)) {
      if (text[end++] == '.') ++dots;
    }
    if (dots >= 2) text.replace(at, end - at, kHidden);
    at += dots >= 2 ? sizeof kHidden - 1 : 3;
  }
}

std::string Plural(size_t count, const std::string& word) {
  return std::to_string(count) + " " + word + (count == 1 ? "" : "s");
}

}  // namespace

void Report::Begin(const std::string& name) {
  topic = name;
}

void Report::Add(const Finding& finding) {
  entries.push_back({topic, finding});
}

void Report::Ok(const std::string& id, const std::string& subject, const std::string& seen) {
  Add({id, Severity::kOk, subject, seen});
}

void Report::Note(const std::string& id, const std::string& subject, const std::string& seen) {
  Add({id, Severity::kNote, subject, seen});
}

void Report::Hide(const std::string& secret) {
  if (secret.size() < kShortestSecret) return;
  secrets.push_back(secret);
  // The longest first: a secret may be a part of another.
  std::sort(secrets.begin(), secrets.end(), [](const std::string& a, const std::string& b) {
    return a.size() != b.size() ? a.size() > b.size() : a < b;
  });
}

size_t Report::Count(Severity severity) const {
  return static_cast<size_t>(
      std::count_if(entries.begin(), entries.end(),
                    [severity](const Entry& entry) { return entry.finding.severity == severity; }));
}

int Report::ExitStatus() const {
  if (Failed()) return 1;
  return Count(Severity::kUnchecked) > 0 ? 2 : 0;
}

std::string Report::Clean(std::string text) const {
  for (const std::string& secret : secrets) {
    for (size_t at = 0; (at = text.find(secret, at)) != std::string::npos;) {
      text.replace(at, secret.size(), kHidden);
      at += sizeof kHidden - 1;
    }
  }
  HideTokens(text);
  return text;
}

std::string Report::Verdict() const {
  if (Failed()) return "A login would fail";
  if (Count(Severity::kUnchecked) > 0)
    return "Nothing wrong was seen, but not all could be checked";
  return "Nothing was found that makes a login fail";
}

void Report::PrintFinding(const Finding& finding) const {
  const auto line = [this](const char* label, const std::string& text) {
    std::cout << "               " << label << Printable(Clean(text)) << '\n';
  };
  const std::string subject = finding.subject.empty() ? "" : finding.subject + ": ";
  std::string name = NameOf(finding.severity).text;
  name.resize(13, ' ');
  std::cout << "  " << name << Printable(Clean(subject + finding.seen));
  if (finding.severity > Severity::kNote) std::cout << "  [" << finding.id << "]";
  std::cout << '\n';
  for (const Said& said : finding.library) line("library  ", Line(said));
  if (!finding.remedy.empty()) line("remedy   ", finding.remedy);
}

void Report::PrintText() const {
  std::string last;
  for (const Entry& entry : entries) {
    if (entry.topic != last) std::cout << (last.empty() ? "" : "\n") << entry.topic << '\n';
    last = entry.topic;
    PrintFinding(entry.finding);
  }
  std::cout << '\n'
            << Verdict() << ": " << Plural(Count(Severity::kFailure), "failure") << ", "
            << Plural(Count(Severity::kWarning), "warning") << ", " << Count(Severity::kUnchecked)
            << " not checked.\n";
}

Json::Value Report::AsJson(const Entry& entry) const {
  Json::Value value(Json::objectValue);
  value["id"] = entry.finding.id;
  value["topic"] = entry.topic;
  value["severity"] = NameOf(entry.finding.severity).machine;
  value["subject"] = Clean(entry.finding.subject);
  value["seen"] = Clean(entry.finding.seen);
  value["remedy"] = Clean(entry.finding.remedy);
  Json::Value& library = value["library"] = Json::Value(Json::arrayValue);
  for (const Said& said : entry.finding.library) {
    Json::Value line(Json::objectValue);
    if (said.kind == Said::Kind::kLogs) {
      line["logs"] = Clean(said.text);
      line["unit"] = said.source;
    } else if (said.kind == Said::Kind::kThrows) {
      line["throws"] = Clean(said.text);
      line["class"] = said.source;
    } else {
      line["does"] = Clean(said.text);
    }
    library.append(line);
  }
  return value;
}

void Report::PrintJson() const {
  Json::Value value(Json::objectValue);
  value["tool"] = "ssoclient-doctor";
  value["version"] = SSOCLIENT_VERSION;
  value["verdict"] = Verdict();
  value["exit_status"] = ExitStatus();
  Json::Value& findings = value["findings"] = Json::Value(Json::arrayValue);
  for (const Entry& entry : entries) findings.append(AsJson(entry));
  std::cout << WriteJson(value, JsonStyle::kForPeople) << '\n';
}

}  // namespace doctor
