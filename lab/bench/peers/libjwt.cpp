// Tokens checked by libjwt.
#include <jwt.h>

#include "operation.h"

namespace {

using bench::Material;
using bench::Operation;

void decode(const std::string& token, const std::string& key) {
  jwt_t* jwt = nullptr;
  const auto* const bytes = reinterpret_cast<const unsigned char*>(key.data());
  const int size = static_cast<int>(key.size());
  bench::require(jwt_decode(&jwt, token.c_str(), size > 0 ? bytes : nullptr, size) == 0 &&
                     jwt_get_grant(jwt, "aud") != nullptr,
                 "libjwt");
  jwt_free(jwt);
}

auto check(const std::string& name, const std::string& key_name) {
  return [=](const Material& material) -> Operation {
    return [token = material[name], key = material[key_name]] { decode(token, key); };
  };
}

auto parse(const std::string& name) {
  return [=](const Material& material) -> Operation {
    return [token = material[name]] { decode(token, ""); };
  };
}

}  // namespace

int main(int count, char** arguments) {
  bench::Makers makers = {{"parse", parse("rs256")}};
  // It has one call for everything.
  for (const std::string way : {"", "check-"}) {
    for (const std::string bits : {"256", "384", "512"}) {
      makers[way + "rs" + bits] = check("rs" + bits, "pem");
      makers[way + "hs" + bits] = check("hs" + bits, "secret");
    }
    for (const std::string name : {"rs256-65536", "rs256-1048576"}) {
      makers[way + name] = check(name, "pem");
    }
  }
  return bench::run(count, arguments, makers);
}
