// The device's front page: who is signed in, the way in and out, and how the last login failed.
#include <ctime>
#include <exception>
#include <optional>
#include <string>
#include <vector>

#include "cgi.h"
#include "page.h"
#include "session.h"
#include "settings.h"

namespace {

constexpr char kStart[] = "/webman/login.cgi?action=start&amp;origin=/index.cgi";
constexpr char kOutcome[] = "__Host-outcome";
constexpr char kSession[] = "__Host-session";

// In the time zone of the device: the page does not know the person's.
std::string Time(time_t seconds) {
  char text[40], machine[40];
  tm local, utc;
  strftime(text, sizeof text, "%Y-%m-%d %H:%M %Z", localtime_r(&seconds, &local));
  strftime(machine, sizeof machine, "%Y-%m-%dT%H:%M:%SZ", gmtime_r(&seconds, &utc));
  return std::string("<time datetime=\"") + machine + "\">" + cgi::EscapeHTML(text) + "</time>";
}

// How the last login or logout failed, for browsers that could not read it on the relay page.
std::string Failure(const page::Words& words, const page::Outcome& outcome) {
  const auto [reason, help] = words.Failure(outcome.code);
  return "<p id=\"reason\">" + reason + "</p>\n<p id=\"help\">" + help + "</p>\n";
}

std::string Reference(const page::Words& words, const page::Outcome& outcome) {
  return "<p id=\"reference\" class=\"note\">" +
         words.Get("reference", "reference", outcome.reference) + "</p>\n";
}

// A failed login of somebody who is signed in is of no interest any more, a failed logout is.
std::string User(const page::Words& words, const Session& session, const page::Outcome& outcome) {
  const bool refused = outcome.code == "sign-out-refused";
  const std::string name =
      "<strong id=\"user\" dir=\"auto\">" + cgi::EscapeHTML(session.user) + "</strong>";
  return "<h1>" + words.Get(refused ? "not-signed-out" : "welcome") + "</h1>\n<p>" +
         words.Get("user", "user", name) + "</p>\n<p id=\"since\" class=\"note\">" +
         words.Get("since", "time", Time(session.since)) + "</p>\n" +
         (refused ? Failure(words, outcome) : "") +
         "<form id=\"sign-out\" class=\"actions\" method=\"post\" "
         "action=\"/webman/login.cgi?action=logout\">\n"
         "<input type=\"hidden\" name=\"token\" value=\"" +
         cgi::EscapeHTML(session.token) + "\">\n<button class=\"button second\">" +
         words.Get("sign-out") + "</button>\n</form>\n" +
         (refused ? Reference(words, outcome) : "");
}

std::string SignIn(const page::Words& words, const std::string& provider,
                   const page::Outcome& outcome, bool ended) {
  const bool failed = !outcome.reference.empty();
  std::string body = "<h1>" + words.Get(failed ? "not-signed-in" : "sign-in") + "</h1>\n";
  body += failed ? Failure(words, outcome)
                 : "<p>" + words.Get(ended ? "session-ended" : "no-user") + "</p>\n";
  body += "<p class=\"actions\"><a id=\"sign-in\" class=\"button\" href=\"" + std::string(kStart) +
          "\">" + words.Get("sign-in-with", "provider", provider) + "</a></p>\n";
  return body + (failed ? Reference(words, outcome) : "");
}

// Nobody can sign in while the settings are refused; the page is shown all the same.
Settings SettingsOrDefaults() {
  try {
    return ReadSettings();
  } catch (const std::exception&) {
    return {};
  }
}

}  // namespace

int main() {
  const cgi::Request request = cgi::ReadRequest();
  const Settings settings = SettingsOrDefaults();
  const page::Words words(request.languages);
  const std::optional<Session> session = session::Current(request, settings);
  const page::Outcome outcome = page::ReadOutcome(cgi::Value(request.cookies, kOutcome));
  const bool ended = !session && request.cookies.count(kSession) != 0;
  // What is shown once is not shown again.
  std::vector<std::string> headers;
  if (request.cookies.count(kOutcome) != 0) {
    headers.push_back("Set-Cookie: " + cgi::Cookie(kOutcome, ""));
  }
  if (ended) headers.push_back("Set-Cookie: " + cgi::Cookie(kSession, ""));
  const std::string provider = settings.provider_name.empty()
                                   ? words.Get("provider")
                                   : cgi::EscapeHTML(settings.provider_name);
  cgi::Page(page::Frame(
                words, words.Get("device"),
                session ? User(words, *session, outcome) : SignIn(words, provider, outcome, ended)),
            headers);
}
