// Parameters that a login program packs into the state: out into the URL and back.
#include "sso/common.h"
#include "sso/sso.h"
#include "sso/utils.h"

#include "sso/internal/json.h"
#include "support/clients.h"
#include "support/independent.h"
#include "support/target.h"

namespace {

using namespace QOVA::SSO;

// The value of a parameter of the query, decoded; every value must be escaped.
std::string valueOf(const std::string& query, const std::string& name) {
  const std::size_t start = ("&" + query).find("&" + name + "=");
  fuzz::require(start != std::string::npos, "a parameter is missing");
  const std::size_t at = start + name.size() + 1;
  const std::string value = query.substr(at, query.find('&', at) - at);
  fuzz::require(fuzz::isEscaped(value), "a value that is not encoded");
  return fuzz::percentDecoded(value);
}

void requireQuery(const std::string& url, const Json::Value& parameters) {
  const std::string start = "https://provider.example/authorize?";
  fuzz::require(url.compare(0, start.size(), start) == 0, "another endpoint");
  const std::string query = url.substr(start.size());
  fuzz::require(valueOf(query, "client_id") == fuzz::kClientID, "another client");
  const auto bytes = fuzz::strictBase64(valueOf(query, "state"));
  Json::Value state;
  fuzz::require(bytes && fuzz::readJson(*bytes, state), "a state that cannot be read");

  Json::Value expected = parameters.isObject() ? parameters : Json::Value(Json::objectValue);
  expected["nonce"] = fuzz::md5Hex(valueOf(query, "nonce"));
  // As texts: what is not UTF-8 does not survive being written, and names may become one.
  fuzz::require(*bytes == WriteJson(expected), "another state");

  // And back, as the relay page gets it.
  const std::string relay = GetSSORelayURL(true, valueOf(query, "state"), "");
  const bool origin = state["origin"].isString();
  const std::string value = origin ? URLEncode(state["origin"].asString()) : "";
  fuzz::require(
      relay == "ssoclient/relay.html#" + (origin ? "origin=" + value + "&" : "") + "success=true",
      "another origin");
}

template <typename Client>
bool builds(const Json::Value& parameters) {
  std::string url;
  const bool built = fuzz::returns({{typeid(sso_op_failed), "encode base64 failed."}},
                                   [&] { url = Client("").GetAccessTokenReqURI(parameters); });
  if (built) requireQuery(url, parameters);
  return built;
}

}  // namespace

FUZZ_TARGET(state_parameters) {
  Json::Value parameters;
  if (!fuzz::readJson(input, parameters)) return false;
  const bool azure = builds<fuzz::Azure>(parameters);
  fuzz::require(azure == builds<fuzz::WebSphere>(parameters), "the clients differ");
  return azure && parameters.isObject();
}
