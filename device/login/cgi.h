// The common gateway interface (RFC 3875), as far as a login program needs it.
#pragma once

#include <map>
#include <string>
#include <vector>

namespace cgi {

using Values = std::map<std::string, std::string>;

// Request is what the browser asked for. Of a parameter or cookie that comes more than once the
// first counts.
struct Request {
  std::string method;
  Values query;
  Values cookies;
  std::string languages;  // Accept-Language
};

// ReadRequest takes the request from the environment that the web server set. The body is not
// read.
Request ReadRequest();

// ReadQuery takes a query apart: names and values, decoded.
Values ReadQuery(const std::string& text);

// Value returns the value of a name, empty if there is none.
std::string Value(const Values& values, const std::string& name);

// Cookie returns the text of a Set-Cookie header for this host alone, kept until the browser
// ends; an empty value deletes the cookie.
std::string Cookie(const std::string& name, const std::string& value);

// BeginRedirect writes the head of a redirect but for its Location, which must follow. A second
// call writes nothing: the head is out. Throws std::invalid_argument, before anything is
// written, if a cookie holds a control character: a line break would start a header of its own.
void BeginRedirect(const std::vector<std::string>& cookies);

// Redirect sends the browser to `location` and ends the header. Throws as BeginRedirect does,
// for the location too.
void Redirect(const std::string& location, const std::vector<std::string>& cookies);

// EscapeHTML returns `text` so that it stands for itself in a page.
std::string EscapeHTML(const std::string& text);

}  // namespace cgi
