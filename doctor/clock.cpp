// The clock: the library compares "exp" of a token with it, without leeway.
#include <cstdlib>

#include "doctor/checkup.h"
#include "doctor/claims.h"
#include "doctor/text.h"

namespace doctor {

namespace {

// A clock before this was never set: 2024-01-01.
constexpr time_t kLongAgo = 1704067200;
constexpr long long kTolerable = 60;
// ID tokens commonly live for one hour.
constexpr long long kTokenLife = 3600;

std::vector<Said> Expired(const Checkup& checkup, long long ahead) {
  Json::Value claims = GoodClaims(checkup);
  claims["exp"] = static_cast<Json::Int64>(time(nullptr) - ahead + kTokenLife - 1);
  return checkup.library.VerifyOffline(MakeToken(GoodHeader(checkup), claims)).said;
}

void Compare(Checkup& checkup, const Checkup::ServerTime& times) {
  const long long ahead = static_cast<long long>(times.ours) - times.theirs;
  const std::string remedy = "Set the clock, best by a time service (NTP).";
  const std::string seen = "this device's clock is " + Span(ahead) +
                           (ahead > 0 ? " ahead of " : " behind ") + "that of " + times.server;
  if (ahead >= kTokenLife) {
    checkup.report.Add(
        {"clock-ahead", Severity::kFailure, "clock", seen, Expired(checkup, ahead), remedy});
  } else if (ahead > kTolerable) {
    checkup.report.Add({"clock-ahead",
                        Severity::kWarning,
                        "clock",
                        seen,
                        {Said::Does("takes tokens for expired by so much too early")},
                        remedy});
  } else if (ahead < -kTolerable) {
    checkup.report.Add({"clock-behind",
                        Severity::kWarning,
                        "clock",
                        seen,
                        {Said::Does("takes tokens by so much longer than they are meant to live")},
                        remedy});
  } else {
    checkup.report.Ok("clock", "clock", Time(times.ours) + ", like that of " + times.server);
  }
}

}  // namespace

void CheckClock(Checkup& checkup) {
  checkup.report.Begin("Clock");
  const time_t now = time(nullptr);
  if (now < kLongAgo) {
    checkup.report.Add({"clock-unset",
                        Severity::kFailure,
                        "clock",
                        "it is " + Time(now) + " on this device",
                        {Said::Does("finds the server's certificate not yet valid")},
                        "Set the clock, best by a time service (NTP)."});
    return;
  }
  const Checkup::ServerTime* worst = nullptr;
  const auto skew = [](const Checkup::ServerTime& times) {
    return std::llabs(static_cast<long long>(times.ours) - times.theirs);
  };
  for (const Checkup::ServerTime& times : checkup.server_times) {
    if (worst == nullptr || skew(times) > skew(*worst)) worst = &times;
  }
  if (worst != nullptr) {
    Compare(checkup, *worst);
  } else {
    checkup.report.Note("clock", "clock", Time(now) + "; no server to compare it with");
  }
}

}  // namespace doctor
