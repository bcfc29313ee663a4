// Tokens checked by cjose, their claims read with jansson, as its users do.
#include <cjose/cjose.h>
#include <jansson.h>

#include "operation.h"

namespace {

using bench::Material;
using bench::Operation;

bool hasClaims(cjose_jws_t* jws) {
  uint8_t* text = nullptr;
  size_t size = 0;
  cjose_err error;
  if (!cjose_jws_get_plaintext(jws, &text, &size, &error)) return false;
  json_t* const claims = json_loadb(reinterpret_cast<char*>(text), size, 0, nullptr);
  const bool found = json_object_get(claims, "aud") != nullptr;
  json_decref(claims);
  return found;
}

// Takes the key over.
void verify(const std::string& token, cjose_jwk_t* key, bool claims) {
  cjose_err error;
  cjose_jws_t* const jws = cjose_jws_import(token.data(), token.size(), &error);
  bench::require(
      (key == nullptr || cjose_jws_verify(jws, key, &error)) && (!claims || hasClaims(jws)),
      "cjose");
  cjose_jws_release(jws);
  cjose_jwk_release(key);
}

auto check(const std::string& name, bool claims) {
  return [=](const Material& material) -> Operation {
    return [token = material[name], jwk = material["jwk"], claims] {
      cjose_err error;
      verify(token, cjose_jwk_import(jwk.data(), jwk.size(), &error), claims);
    };
  };
}

auto checkHmac(const std::string& name, bool claims) {
  return [=](const Material& material) -> Operation {
    return [token = material[name], secret = material["secret"], claims] {
      cjose_err error;
      verify(token,
             cjose_jwk_create_oct_spec(reinterpret_cast<const uint8_t*>(secret.data()),
                                       secret.size(), &error),
             claims);
    };
  };
}

auto parse(const std::string& name) {
  return [=](const Material& material) -> Operation {
    return [token = material[name]] { verify(token, nullptr, true); };
  };
}

}  // namespace

int main(int count, char** arguments) {
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
