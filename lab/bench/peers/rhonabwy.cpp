// Tokens checked by rhonabwy.
#include <rhonabwy.h>

#include "operation.h"

namespace {

using bench::Material;
using bench::Operation;

// Parses and, with a key, verifies.
void verify(const std::string& token, jwk_t* key) {
  jwt_t* jwt = nullptr;
  bench::require(r_jwt_init(&jwt) == RHN_OK && r_jwt_parse(jwt, token.c_str(), 0) == RHN_OK &&
                     (key == nullptr || r_jwt_verify_signature(jwt, key, 0) == RHN_OK) &&
                     r_jwt_get_claim_str_value(jwt, "aud") != nullptr,
                 "rhonabwy");
  r_jwt_free(jwt);
}

// The signature alone.
void verifySignature(const std::string& token, jwk_t* key) {
  jws_t* jws = nullptr;
  bench::require(r_jws_init(&jws) == RHN_OK && r_jws_parse(jws, token.c_str(), 0) == RHN_OK &&
                     r_jws_verify_signature(jws, key, 0) == RHN_OK,
                 "rhonabwy");
  r_jws_free(jws);
}

jwk_t* newKey() {
  jwk_t* key = nullptr;
  bench::require(r_jwk_init(&key) == RHN_OK, "rhonabwy");
  return key;
}

auto check(const std::string& name, bool claims) {
  return [=](const Material& material) -> Operation {
    return [token = material[name], jwk = material["jwk"], claims] {
      jwk_t* const key = newKey();
      r_jwk_import_from_json_str(key, jwk.c_str());
      claims ? verify(token, key) : verifySignature(token, key);
      r_jwk_free(key);
    };
  };
}

auto checkHmac(const std::string& name, bool claims) {
  return [=](const Material& material) -> Operation {
    return [token = material[name], secret = material["secret"], claims] {
      jwk_t* const key = newKey();
      r_jwk_import_from_symmetric_key(key, reinterpret_cast<const unsigned char*>(secret.data()),
                                      secret.size());
      claims ? verify(token, key) : verifySignature(token, key);
      r_jwk_free(key);
    };
  };
}

auto parse(const std::string& name) {
  return [=](const Material& material) -> Operation {
    return [token = material[name]] { verify(token, nullptr); };
  };
}

}  // namespace

int main(int count, char** arguments) {
  r_global_init();
  bench::Makers makers = {{"parse", parse("rs256")}};
  for (const bool claims : {false, true}) {
    const std::string way = claims ? "check-" : "";
    for (const std::string bits : {"256", "384", "512"}) {
      makers[way + "rs" + bits] = check("rs" + bits, claims);
      makers[way + "hs" + bits] = checkHmac("hs" + bits, claims);
    }
    for (const std::string name : {"rs256-65536", "rs256-1048576"}) {
      makers[way + name] = check(name, claims);
    }
  }
  return bench::run(count, arguments, makers);
}
