// The device's front page, as small as can be: who is signed in, and the way in and out.
#include <iostream>

#include "cgi.h"
#include "session.h"
#include "settings.h"

int main() {
  const std::optional<Session> session = session::Current(cgi::ReadRequest(), ReadSettings());
  const std::string user = session ? session->user : "";
  std::cout << "Status: 200 OK\n"
               "Content-Type: text/html; charset=utf-8\n"
               "Cache-Control: no-store\n"
               "Content-Security-Policy: default-src 'none'; style-src 'self'; base-uri 'none'; "
               "frame-ancestors 'none'\n\n"
               "<!DOCTYPE html>\n<html lang=\"en\">\n<head>\n<meta charset=\"utf-8\">\n"
               "<meta name=\"viewport\" content=\"width=device-width, initial-scale=1\">\n"
               "<title>Device</title>\n"
               "<link rel=\"stylesheet\" href=\"/webman/ssoclient/relay.css\">\n"
               "</head>\n<body>\n<main>\n<h1>Device</h1>\n";
  if (user.empty()) {
    std::cout << "<p>Nobody is signed in.</p>\n"
                 "<p><a id=\"sign-in\" class=\"button\" "
                 "href=\"/webman/login.cgi?action=start&amp;origin=/index.cgi\">"
                 "Sign in with your organisation</a></p>\n";
  } else {
    std::cout << "<p>Signed in as <strong id=\"user\">" << cgi::EscapeHTML(user)
              << "</strong>.</p>\n"
                 "<form id=\"sign-out\" method=\"post\" action=\"/webman/login.cgi?action=logout\">"
                 "<input type=\"hidden\" name=\"token\" value=\""
              << session->token
              << "\">"
                 "<button class=\"button\">Sign out</button></form>\n";
  }
  std::cout << "</main>\n</body>\n</html>\n";
}
