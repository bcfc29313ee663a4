// ssoclient-doctor: finds out why users cannot sign in to this device, and what to do about it.
#include <csignal>
#include <cstdio>
#include <exception>
#include <iostream>

#include "doctor/checkup.h"
#include "doctor/explain.h"
#include "doctor/options.h"
#include "doctor/redact.h"
#include "doctor/report.h"
#include "doctor/terminal.h"
#include "doctor/text.h"

namespace {

constexpr int kWrongUsage = 2;
constexpr int kNotChecked = 3;

struct Check {
  const char* topic;
  void (*run)(doctor::Checkup&);
};

// In the order of a sign-in.
constexpr Check kChecks[] = {{"Files", doctor::CheckFiles},
                             {"Login program", doctor::CheckLoginSettings},
                             {"Identity", doctor::CheckIdentity},
                             {"Login program", doctor::CheckStore},
                             {"Settings", doctor::CheckSettings},
                             {"Network", doctor::CheckEndpoints},
                             {"Login program", doctor::CheckDeadline},
                             {"Clock", doctor::CheckClock},
                             {"User name", doctor::CheckName},
                             {"Token", doctor::CheckToken}};

// A check that ends early is a finding; the others still run.
void Run(const Check& check, doctor::Checkup& checkup) {
  checkup.report.Begin(check.topic);
  doctor::Progress(std::string("Checking: ") + check.topic);
  try {
    check.run(checkup);
  } catch (const std::exception& e) {
    checkup.report.Add({"check-failed",
                        doctor::Grade::kUnchecked,
                        "This check ended early: " + doctor::Shown(e.what(), 200),
                        {},
                        "Free memory and processes on the device and try again."});
  }
}

int Examine(const doctor::Options& options) {
  doctor::Report report;
  doctor::Checkup checkup(options, report);
  doctor::FindCaller(checkup);
  for (const Check& check : kChecks) Run(check, checkup);
  doctor::Progress("");
  options.json ? doctor::PrintJson(report) : doctor::PrintText(report, options.verbose);
  std::cout.flush();
  return std::cout ? report.ExitStatus() : kNotChecked;
}

// What keeps the doctor from its work, on one line or in JSON.
int GiveUp(const doctor::Options& options, const std::string& why, int status) {
  if (options.json) {
    doctor::PrintJsonError(why, status);
  } else {
    std::cerr << "ssoclient-doctor: " << doctor::Printable(doctor::Clean(why))
              << (status == kWrongUsage ? " (try --help)\n" : "\n");
  }
  return status;
}

}  // namespace

int main(int argc, char** argv) {
  std::signal(SIGPIPE, SIG_IGN);
  doctor::Options options;
  try {
    if (!doctor::ParseOptions(argc, argv, options)) return 0;
    if (options.explain) return doctor::RunExplain(*options.explain, options.json);
    return Examine(options);
  } catch (const doctor::UsageError& e) {
    return GiveUp(options, e.what(), kWrongUsage);
  } catch (const std::exception& e) {
    return GiveUp(options, e.what(), kNotChecked);
  }
}
