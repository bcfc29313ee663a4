// ssoclient-doctor: tells an administrator what the single sign-on of a device will do, and why a
// login would fail.
#include <csignal>
#include <cstdio>
#include <exception>
#include <iostream>

#include "doctor/checkup.h"
#include "doctor/explain.h"
#include "doctor/options.h"
#include "doctor/report.h"

namespace {

constexpr int kWrongUsage = 2;

int Examine(const doctor::Options& options) {
  doctor::Report report;
  doctor::Checkup checkup(options, report);
  doctor::FindCaller(checkup);
  doctor::CheckFiles(checkup);
  doctor::CheckIdentity(checkup);
  doctor::CheckSettings(checkup);
  doctor::CheckEndpoints(checkup);
  doctor::CheckClock(checkup);
  doctor::CheckName(checkup);
  doctor::CheckToken(checkup);
  options.json ? report.PrintJson() : report.PrintText();
  std::cout.flush();
  return std::cout ? report.ExitStatus() : kWrongUsage;
}

}  // namespace

int main(int argc, char** argv) {
  std::signal(SIGPIPE, SIG_IGN);
  doctor::Options options;
  switch (doctor::ParseOptions(argc, argv, options)) {
    case doctor::Usage::kDone:
      return 0;
    case doctor::Usage::kWrong:
      return kWrongUsage;
    case doctor::Usage::kRun:
      break;
  }
  try {
    if (options.explain) return doctor::RunExplain(*options.explain, options.json);
    return Examine(options);
  } catch (const std::exception& e) {
    std::cerr << "ssoclient-doctor: " << e.what() << '\n';
    return kWrongUsage;
  }
}
