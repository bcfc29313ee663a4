#include "doctor/claims.h"

#include <openssl/evp.h>
#include <openssl/hmac.h>

#include <ctime>

#include "doctor/json.h"
#include "doctor/redact.h"
#include "doctor/text.h"

namespace doctor {

namespace {

constexpr long long kHour = 3600;

std::string SigningInput(const Json::Value& header, const Json::Value& claims) {
  return EncodeBase64Url(WriteJson(header, JsonStyle::kCompact)) + "." +
         EncodeBase64Url(WriteJson(claims, JsonStyle::kCompact));
}

}  // namespace

Json::Value GoodHeader(const Checkup& checkup) {
  Json::Value header(Json::objectValue);
  header["alg"] = checkup.provider == Provider::kAzure ? "RS256" : "HS256";
  header["kid"] = "ssoclient-doctor";
  return header;
}

Json::Value GoodClaims(const Checkup& checkup) {
  Json::Value claims(Json::objectValue);
  claims["exp"] = static_cast<Json::Int64>(time(nullptr) + kHour);
  claims["aud"] = checkup.settings.client_id;
  claims["tid"] = checkup.tenant;
  return claims;
}

std::string MakeToken(const Json::Value& header, const Json::Value& claims) {
  return SigningInput(header, claims) + ".AAAA";
}

std::string MakeSignedToken(const Json::Value& header, const Json::Value& claims,
                            const std::string& secret) {
  const std::string input = SigningInput(header, claims);
  unsigned char mac[EVP_MAX_MD_SIZE];
  unsigned length = 0;
  if (HMAC(EVP_sha256(), secret.data(), static_cast<int>(secret.size()),
           reinterpret_cast<const unsigned char*>(input.data()), input.size(), mac,
           &length) == nullptr) {
    return MakeToken(header, claims);
  }
  return input + "." + EncodeBase64Url(std::string(reinterpret_cast<char*>(mac), length));
}

std::string Seen(const Json::Value& claims, const char* name) {
  const std::string subject = Quote(name) + " of the token is ";
  if (!claims.isObject() || !claims.isMember(name)) return subject + "missing";
  const Json::Value& value = claims[name];
  if (!value.isConvertibleTo(Json::stringValue)) return subject + TypeName(value);
  return subject + Quote(Shown(value.asString(), 100));
}

}  // namespace doctor
