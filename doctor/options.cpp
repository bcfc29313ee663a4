#include "doctor/options.h"

#include <getopt.h>
#include <grp.h>
#include <pwd.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <iostream>

namespace doctor {

namespace {

constexpr int kLongestTimeout = 300;

constexpr char kHelp[] =
    R"(Usage: ssoclient-doctor [OPTION]...
Finds out why users cannot sign in to this device, and what to do about it. Run it as root.

  --user NAME        the user that the web server runs as (default with --program: www-data)
  --program FILE     the login program; runs it as that user, with a request that changes nothing
  --name USER        converts the user name USER (account@dns.domain) as a sign-in does
  --token            reads an ID token from standard input and reports what each check says
  --try-secret       sends the client secret to the token endpoint, and reports if it is accepted
  --offline          sends nothing
  --timeout SECONDS  the time for each request, 1 to 300 (default: 10)
  --explain TEXT     explains the codes and messages in a pasted text ("-": standard input)
  --verbose          shows all findings, their identifiers, and what the library logs and throws
  --json             writes the findings as JSON
  -h, --help         prints this help
  --version          prints the version

Without --try-secret no credentials leave the device. No secret, code or token is printed.

Exit status: 0 if no failure was found, 1 if a failure was found, 2 for a wrong command line, 3 if
something could not be checked and no failure was found.
)";

int ParseTimeout(const char* text) {
  char* end = nullptr;
  const long value = std::strtol(text, &end, 10);
  if (end == text || *end != '\0' || value < 1 || value > kLongestTimeout) {
    throw UsageError("--timeout requires a number of seconds from 1 to 300");
  }
  return static_cast<int>(value);
}

constexpr struct option kOptions[] = {{"user", required_argument, nullptr, 'u'},
                                      {"program", required_argument, nullptr, 'p'},
                                      {"name", required_argument, nullptr, 'n'},
                                      {"token", no_argument, nullptr, 't'},
                                      {"try-secret", no_argument, nullptr, 's'},
                                      {"offline", no_argument, nullptr, 'o'},
                                      {"timeout", required_argument, nullptr, 'T'},
                                      {"explain", required_argument, nullptr, 'e'},
                                      {"verbose", no_argument, nullptr, 'V'},
                                      {"json", no_argument, nullptr, 'j'},
                                      {"help", no_argument, nullptr, 'h'},
                                      {"version", no_argument, nullptr, 'v'},
                                      {nullptr, 0, nullptr, 0}};

// Errors in the command line are written as JSON too, wherever --json is.
bool WantsJson(int argc, char** argv) {
  for (int i = 1; i < argc; ++i) {
    if (std::strcmp(argv[i], "--json") == 0) return true;
  }
  return false;
}

void CheckCombination(const Options& options) {
  if (options.offline && options.try_secret) {
    throw UsageError("--offline and --try-secret exclude each other");
  }
  const bool other = !options.user.empty() || !options.program.empty();
  if (other && geteuid() != 0) throw UsageError("--user and --program need root");
  if (!options.user.empty() && getpwnam(options.user.c_str()) == nullptr) {
    throw UsageError("there is no user '" + options.user + "'");
  }
}

}  // namespace

bool ParseOptions(int argc, char** argv, Options& options) {
  options.json = WantsJson(argc, argv);
  opterr = 0;
  for (int option; (option = getopt_long(argc, argv, "h", kOptions, nullptr)) != -1;) {
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
      case 'T':
        options.timeout = ParseTimeout(optarg);
        break;
      case 'e':
        options.explain = optarg;
        break;
      case 'V':
        options.verbose = true;
        break;
      case 'j':
        break;
      case 'h':
        std::cout << kHelp;
        return false;
      case 'v':
        std::cout << "ssoclient-doctor " << SSOCLIENT_VERSION << '\n';
        return false;
      default:
        throw UsageError("unknown option, or an argument is missing or too many: '" +
                         std::string(argv[optind - 1]) + "'");
    }
  }
  if (optind < argc) throw UsageError("unexpected argument '" + std::string(argv[optind]) + "'");
  CheckCombination(options);
  return true;
}

}  // namespace doctor
