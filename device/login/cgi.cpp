#include "cgi.h"

#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <iostream>
#include <stdexcept>

#include "environment.h"
#include "process.h"

namespace cgi {
namespace {

constexpr size_t kLongestForm = 4096;
constexpr char kFormType[] = "application/x-www-form-urlencoded";

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

// A "%" that no two digits follow is kept as it is.
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

void Write(const std::string& answer) {
  process::Answered();
  std::cout << answer << std::flush;
}

}  // namespace

Request ReadRequest() {
  Values variables;
  for (const char* name : kRequestVariables) variables[name] = Environment(name);
  clearenv();
  setenv("PATH", kPath, 1);
  Request request;
  request.method = variables["REQUEST_METHOD"];
  request.script = variables["SCRIPT_NAME"];
  request.address = variables["REMOTE_ADDR"];
  request.query_text = variables["QUERY_STRING"];
  request.query = ReadQuery(request.query_text);
  request.cookies = ReadCookies(variables["HTTP_COOKIE"]);
  request.content_type = variables["CONTENT_TYPE"];
  request.content_length = variables["CONTENT_LENGTH"];
  request.host = variables["HTTP_HOST"];
  request.languages = variables["HTTP_ACCEPT_LANGUAGE"];
  request.origin = variables["HTTP_ORIGIN"];
  request.fetch_site = variables["HTTP_SEC_FETCH_SITE"];
  request.fetch_dest = variables["HTTP_SEC_FETCH_DEST"];
  return request;
}

Values ReadForm(const Request& request) {
  // Parameters may follow: "; charset=UTF-8".
  const std::string type = request.content_type.substr(0, request.content_type.find(';'));
  const size_t size = std::strtoul(request.content_length.c_str(), nullptr, 10);
  if (type != kFormType || size > kLongestForm) return {};
  std::string text(size, '\0');
  for (size_t done = 0; done < size;) {
    const ssize_t got = read(STDIN_FILENO, &text[done], size - done);
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) return {};
    done += static_cast<size_t>(got);
  }
  return ReadQuery(text);
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

std::string Cookie(const std::string& name, const std::string& value, int seconds) {
  std::string cookie = name + "=" + value + "; Path=/; Secure; HttpOnly; SameSite=Lax";
  if (value.empty() || seconds > 0) cookie += "; Max-Age=" + std::to_string(seconds);
  return cookie;
}

void Redirect(const std::string& location, const std::vector<std::string>& cookies) {
  // The status comes first: there are servers that look for it nowhere else.
  std::string head = "Status: 302 Found\nCache-Control: no-store\n";
  for (const std::string& cookie : cookies) head += "Set-Cookie: " + OneLine(cookie) + "\n";
  Write(head + "Location: " + OneLine(location) + "\n\n");
}

void Page(const std::string& html, const std::vector<std::string>& headers) {
  // With "no-referrer" a browser would hide where a form comes from: "Origin: null".
  std::string head =
      "Status: 200 OK\nCache-Control: no-store\nContent-Type: text/html; charset=utf-8\n"
      "X-Content-Type-Options: nosniff\nReferrer-Policy: same-origin\n"
      "Content-Security-Policy: default-src 'none'; style-src 'self'; img-src 'self'; "
      "base-uri 'none'; form-action 'self' https:; frame-ancestors 'none'\n";
  for (const std::string& header : headers) head += OneLine(header) + "\n";
  Write(head + "\n" + html);
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
