// What is in a URL, read independently of the library.
#pragma once

#include <algorithm>
#include <string>
#include <utility>
#include <vector>

namespace test {

// The bytes that a percent-encoded text stands for (RFC 3986, section 2.1).
inline std::string percentDecoded(const std::string& text) {
  std::string bytes;
  for (std::size_t i = 0; i < text.size(); ++i) {
    const bool escape = text[i] == '%';
    bytes += escape ? static_cast<char>(std::stoi(text.substr(i + 1, 2), nullptr, 16)) : text[i];
    if (escape) i += 2;
  }
  return bytes;
}

// The names and values, both unchanged, of "name=value&name=value".
inline std::vector<std::pair<std::string, std::string>> parametersOf(const std::string& query) {
  std::vector<std::pair<std::string, std::string>> parameters;
  for (std::size_t at = 0; at <= query.size();) {
    const std::size_t end = std::min(query.find('&', at), query.size());
    const std::string part = query.substr(at, end - at);
    const std::size_t equals = std::min(part.find('='), part.size());
    parameters.emplace_back(part.substr(0, equals),
                            equals < part.size() ? part.substr(equals + 1) : "");
    at = end + 1;
  }
  return parameters;
}

}  // namespace test
