// The answer of the token endpoint, to both clients. The first byte says in what chunks it comes.
#include "sso/common.h"
#include "support/clients.h"
#include "support/independent.h"
#include "support/target.h"
#include "support/transport.h"

namespace {

using namespace QOVA::SSO;

// Whether the client kept a token. Its old one must be gone in any case.
template <typename Client>
bool keeps(const std::string& response) {
  Client client("older");
  try {
    client.ProcessTokenResponse(R"({"id_token":"old"})");
    client.ProcessTokenResponse(response);
  } catch (const std::invalid_argument& e) {
    fuzz::require(std::string(e.what()) == "parse json falied", "another message");
    fuzz::require(client.GetToken().empty(), "the old token was kept");
    return false;
  } catch (const sso_err_resp& e) {
    const std::string message = e.what();
    fuzz::require(message == "we cannot find key 'id_token' in response!" ||
                      (message.front() == '{' && message.back() == '\n'),
                  "another message");
    fuzz::require(client.GetToken().empty(), "the old token was kept");
    return false;
  }
  Json::Value document;
  if (fuzz::readJson(response, document)) {
    fuzz::require(document["id_token"].isString(), "a token that is not a text");
    fuzz::require(client.GetToken() == document["id_token"].asString(), "another token");
  }
  return true;
}

std::string requested(const fuzz::Answer& answer) {
  fuzz::transport().answers = {answer};
  std::string response;
  fuzz::Azure("").RequestTokenEndpoint(response, "code=x&client_secret=y");
  const auto& request = fuzz::transport().requests.at(0);
  fuzz::require(request.url == fuzz::kTokenURL && request.post && request.verified &&
                    request.body == "code=x&client_secret=y",
                "another request");
  return response;
}

}  // namespace

FUZZ_TARGET(token_response) {
  if (input.empty()) return false;
  const fuzz::Answer answer = fuzz::inChunks(input.substr(1), static_cast<unsigned char>(input[0]));
  const std::string response = requested(answer);
  fuzz::require(response == fuzz::received(answer), "another body");
  const bool azure = keeps<fuzz::Azure>(response);
  const bool websphere = keeps<fuzz::WebSphere>(response);
  fuzz::require(websphere || !azure, "a token for one client alone");
  return azure;
}
