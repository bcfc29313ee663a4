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
  const std::string& port() const { return port_part; }  // the scheme's, if the URL has none
  const std::string& path() const { return path_part; }
  const std::string& password() const { return password_part; }
  bool has_query() const { return query; }
  bool has_fragment() const { return fragment; }
  std::string origin() const { return scheme_part + "://" + host_part + ":" + port_part; }

 private:
  bool is_valid = false;
  bool query = false;
  bool fragment = false;
  std::string scheme_part;
  std::string host_part;
  std::string port_part;
  std::string path_part;
  std::string password_part;
};

// What the path of a URL says in the forms of Entra ID, and its end in those of other providers.
struct Shape {
  std::string role;    // the settings key that it is for, without prefix; "other"; "": unknown
  std::string tenant;  // in lower case; empty: not a URL of Entra ID
  int version = 0;     // 1 or 2, of Entra ID
};

Shape ShapeOf(const std::string& url);

// True if both lead to the same endpoint: Entra ID has several names for a tenant.
bool IsSameEndpoint(const std::string& one, const std::string& other);

}  // namespace doctor
