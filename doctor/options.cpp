#include "doctor/options.h"

#include <getopt.h>

#include <cstdlib>
#include <iostream>

namespace doctor {

namespace {

constexpr int kLongestTimeout = 300;

constexpr char kHelp[] =
    R"(Usage: ssoclient-doctor [OPTION]...
Tells what the single sign-on of this device will do, and why a login would fail.

  --user NAME      the user that the login program runs as; looks with its rights too
  --program FILE   the login program; looks whether it can read the settings
  --name USER      converts the user name USER (account@dns.domain), as a login would
  --token          reads an ID token from standard input and tells what each check says
  --try-secret     sends the client secret, with a false code, to the token endpoint
  --offline        sends nothing at all
  --timeout N      gives each request N seconds (1 to 300; 10)
  --explain TEXT   explains the codes and messages in a pasted text ("-": standard input)
  --json           writes the findings as JSON
  --help           prints this help
  --version        prints the version

Without --try-secret no credentials leave the device. No secret, code or token is printed.

Exit status: 0 if nothing was found that makes a login fail, 1 if a login would fail, 2 for a
wrong command line or if something could not be checked and nothing else makes a login fail.
)";

bool ParseTimeout(const char* text, int& seconds) {
  char* end = nullptr;
  const long value = std::strtol(text, &end, 10);
  if (end == text || *end != '\0' || value < 1 || value > kLongestTimeout) return false;
  seconds = static_cast<int>(value);
  return true;
}

Usage Wrong(const std::string& what) {
  std::cerr << "ssoclient-doctor: " << what << " (--help tells the options)\n";
  return Usage::kWrong;
}

constexpr struct option kOptions[] = {
    {"user", required_argument, nullptr, 'u'},    {"program", required_argument, nullptr, 'p'},
    {"name", required_argument, nullptr, 'n'},    {"token", no_argument, nullptr, 't'},
    {"try-secret", no_argument, nullptr, 's'},    {"offline", no_argument, nullptr, 'o'},
    {"timeout", required_argument, nullptr, 'T'}, {"explain", required_argument, nullptr, 'e'},
    {"json", no_argument, nullptr, 'j'},          {"help", no_argument, nullptr, 'h'},
    {"version", no_argument, nullptr, 'v'},       {nullptr, 0, nullptr, 0}};

}  // namespace

Usage ParseOptions(int argc, char** argv, Options& options) {
  for (int option; (option = getopt_long(argc, argv, "", kOptions, nullptr)) != -1;) {
    switch (option) {
      case 'u':
        options.user = optarg;
        break;
      case 'p':
        options.program = optarg;
        break;
      case 'n':
        options.name = optarg;
        break;
      case 't':
        options.token = true;
        break;
      case 's':
        options.try_secret = true;
        break;
      case 'o':
        options.offline = true;
        break;
      case 'e':
        options.explain = optarg;
        break;
      case 'j':
        options.json = true;
        break;
      case 'T':
        if (!ParseTimeout(optarg, options.timeout))
          return Wrong("--timeout wants 1 to 300 seconds");
        break;
      case 'h':
        std::cout << kHelp;
        return Usage::kDone;
      case 'v':
        std::cout << "ssoclient-doctor " << SSOCLIENT_VERSION << '\n';
        return Usage::kDone;
      default:
        return Usage::kWrong;  // getopt_long has said what
    }
  }
  if (optind < argc) return Wrong("unexpected argument '" + std::string(argv[optind]) + "'");
  if (options.offline && options.try_secret)
    return Wrong("--offline and --try-secret exclude each other");
  return Usage::kRun;
}

}  // namespace doctor
