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
constexpr char kSetClock[] = "Set the clock, best with a time service (NTP): date -u; timedatectl";

std::vector<Said> Expired(const Checkup& checkup, long long ahead) {
  Json::Value claims = GoodClaims(checkup);
  claims["exp"] = static_cast<Json::Int64>(time(nullptr) - ahead + kTokenLife - 1);
  return checkup.library.VerifyOffline(MakeToken(GoodHeader(checkup), claims)).said;
}

void Compare(Checkup& checkup, const Checkup::ServerTime& times) {
  const long long ahead = static_cast<long long>(times.ours) - times.theirs;
  const std::string cause = "This device's clock is " + Span(ahead) +
                            (ahead > 0 ? " ahead of " : " behind ") + "that of " + times.server;
  if (ahead >= kTokenLife) {
    checkup.report.Add(
        {"clock-ahead", Grade::kFailure, cause, {}, kSetClock, Expired(checkup, ahead)});
  } else if (ahead > kTolerable) {
    checkup.report.Warn("clock-ahead", cause, {}, kSetClock,
                        {Said::Does("treats tokens as expired that much too early")});
  } else if (ahead < -kTolerable) {
    checkup.report.Warn("clock-behind", cause, {}, kSetClock,
                        {Said::Does("accepts tokens for that much too long")});
  } else {
    checkup.report.Good("clock", Time(times.ours) + ", like that of " + times.server);
  }
}

}  // namespace

void CheckClock(Checkup& checkup) {
  const time_t now = time(nullptr);
  if (now < kLongAgo) {
    checkup.report.Fail("clock-unset", "This device's clock was never set: it says " + Time(now),
                        {}, kSetClock,
                        {Said::Does("finds the server's certificate not yet valid")});
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
    checkup.report.Good("clock", Time(now) + "; no server to compare it with");
  }
}

}  // namespace doctor
