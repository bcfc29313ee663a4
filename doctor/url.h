// A URL in its parts, as libcurl reads it.
#pragma once

#include <string>

namespace doctor {

class ParsedUrl {
 public:
  explicit ParsedUrl(const std::string& url);

  bool valid() const { return is_valid; }
  const std::string& scheme() const { return scheme_part; }
  const std::string& host() const { return host_part; }
  const std::string& password() const { return password_part; }
  bool has_query() const { return query; }
  bool has_fragment() const { return fragment; }

 private:
  bool is_valid = false;
  bool query = false;
  bool fragment = false;
  std::string scheme_part;
  std::string host_part;
  std::string password_part;
};

}  // namespace doctor
