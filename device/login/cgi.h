// The common gateway interface (RFC 3875), as far as a login program needs it.
#pragma once

#include <map>
#include <string>
#include <vector>

namespace cgi {

using Values = std::map<std::string, std::string>;

// Request is what the browser asked for. If a parameter or cookie is sent more than once, the
// first one counts.
struct Request {
  std::string method;
  std::string script;   // the path of this program
  std::string address;  // the client's
  Values query;
  std::string query_text;  // as it was sent
  Values cookies;
  std::string content_type;  // of the body, which is not read yet
  std::string content_length;
  std::string host;
  std::string languages;   // Accept-Language
  std::string origin;      // Origin: which site's page sent a form
  std::string fetch_site;  // Sec-Fetch-Site, Sec-Fetch-Dest: what browsers say about the request
  std::string fetch_dest;
};

// ReadRequest takes the request from the environment that the web server set, and leaves an
// environment that holds nothing but PATH.
Request ReadRequest();

// ReadForm reads the values of the form that was posted; none if it is no form, or a large one.
Values ReadForm(const Request& request);

// ReadQuery takes a query apart: names and values, decoded.
Values ReadQuery(const std::string& text);

// Value returns the value of a name, empty if there is none.
std::string Value(const Values& values, const std::string& name);

// Cookie returns the text of a Set-Cookie header for this host alone, kept for `seconds`, or until
// the browser ends if that is 0; an empty value deletes the cookie.
std::string Cookie(const std::string& name, const std::string& value, int seconds = 0);

// Redirect sends the browser to `location`. Throws std::invalid_argument, before anything is
// written, if a cookie or the location holds a control character: a line break would begin
// another header.
void Redirect(const std::string& location, const std::vector<std::string>& cookies);

// Page sends a page that no other site can show in a frame, and that runs no scripts. `headers`
// are lines of the head, which throw as those of Redirect do.
void Page(const std::string& html, const std::vector<std::string>& headers);

// EscapeHTML returns `text` so that a page shows it as it is.
std::string EscapeHTML(const std::string& text);

}  // namespace cgi
