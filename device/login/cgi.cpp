#include "cgi.h"

#include <cstdlib>
#include <iostream>
#include <stdexcept>

namespace cgi {
namespace {

std::string Environment(const char* name) {
  const char* value = std::getenv(name);
  return value == nullptr ? "" : value;
}

int HexDigit(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

// A "%" that no two digits follow stands for itself.
std::string Decode(const std::string& text) {
  std::string out;
  for (size_t i = 0; i < text.size(); ++i) {
    const int high = i + 2 < text.size() ? HexDigit(text[i + 1]) : -1;
    const int low = high >= 0 ? HexDigit(text[i + 2]) : -1;
    if (text[i] == '%' && low >= 0) {
      out += static_cast<char>(high * 16 + low);
      i += 2;
    } else {
      out += text[i] == '+' ? ' ' : text[i];
    }
  }
  return out;
}

std::vector<std::string> Split(const std::string& text, char separator) {
  std::vector<std::string> pieces;
  size_t begin = 0;
  for (size_t end; (end = text.find(separator, begin)) != std::string::npos; begin = end + 1) {
    pieces.push_back(text.substr(begin, end - begin));
  }
  pieces.push_back(text.substr(begin));
  return pieces;
}

Values ReadCookies(const std::string& text) {
  Values values;
  for (const std::string& pair : Split(text, ';')) {
    const size_t begin = pair.find_first_not_of(' ');
    const size_t equals = pair.find('=');
    if (equals == std::string::npos || begin >= equals) continue;
    values.emplace(pair.substr(begin, equals - begin), pair.substr(equals + 1));
  }
  return values;
}

const std::string& OneLine(const std::string& text) {
  for (const char c : text) {
    if (static_cast<unsigned char>(c) < 0x20 || c == 0x7f) {
      throw std::invalid_argument("control character in a header");
    }
  }
  return text;
}

}  // namespace

Request ReadRequest() {
  return {Environment("REQUEST_METHOD"), ReadQuery(Environment("QUERY_STRING")),
          ReadCookies(Environment("HTTP_COOKIE")), Environment("HTTP_ACCEPT_LANGUAGE")};
}

Values ReadQuery(const std::string& text) {
  Values values;
  for (const std::string& pair : Split(text, '&')) {
    const size_t equals = pair.find('=');
    if (equals == std::string::npos) continue;
    values.emplace(Decode(pair.substr(0, equals)), Decode(pair.substr(equals + 1)));
  }
  return values;
}

std::string Value(const Values& values, const std::string& name) {
  const auto found = values.find(name);
  return found == values.end() ? "" : found->second;
}

std::string Cookie(const std::string& name, const std::string& value) {
  return name + "=" + value + "; Path=/; Secure; HttpOnly; SameSite=Lax" +
         (value.empty() ? "; Max-Age=0" : "");
}

void BeginRedirect(const std::vector<std::string>& cookies) {
  static bool begun = false;
  if (begun) return;
  std::string head;
  // The status comes first: there are servers that look for it nowhere else.
  head += "Status: 302 Found\nCache-Control: no-store\n";
  for (const std::string& cookie : cookies) head += "Set-Cookie: " + OneLine(cookie) + "\n";
  begun = true;
  std::cout << head;
}

void Redirect(const std::string& location, const std::vector<std::string>& cookies) {
  const std::string line = "Location: " + OneLine(location) + "\n\n";
  BeginRedirect(cookies);
  std::cout << line;
}

std::string EscapeHTML(const std::string& text) {
  std::string out;
  for (const char c : text) {
    switch (c) {
      case '&':
        out += "&amp;";
        break;
      case '<':
        out += "&lt;";
        break;
      case '>':
        out += "&gt;";
        break;
      case '"':
        out += "&quot;";
        break;
      case '\'':
        out += "&#39;";
        break;
      default:
        out += c;
    }
  }
  return out;
}

}  // namespace cgi
