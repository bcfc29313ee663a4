// The lines that docs/integrating.md shows for state and nonce, against the library's own.
#include "snippets.h"

#include <cstdlib>
#include <iostream>

#include "sso/azuresso.h"

static std::string Decoded(const std::string& text) {
  std::string out;
  for (size_t i = 0; i < text.size(); ++i) {
    if (text[i] != '%') {
      out += text[i];
      continue;
    }
    out += static_cast<char>(std::strtol(text.substr(i + 1, 2).c_str(), nullptr, 16));
    i += 2;
  }
  return out;
}

static std::string Value(const std::string& url, const std::string& name) {
  const size_t begin = url.find(name + "=") + name.size() + 1;
  return Decoded(url.substr(begin, url.find('&', begin) - begin));
}

static int failures = 0;
static void Expect(bool holds, const char* what) {
  if (!holds) ++failures;
  if (!holds) std::cout << "not so: " << what << "\n";
}

int main() {
  for (const char* origin : {"", "/a", "/ab", "/abc", "/index.cgi?a=b"}) {  // every kind of padding
    Json::Value parameters;
    parameters["origin"] = origin;
    const std::string url = QOVA::SSO::AzureSSOClient().GetAccessTokenReqURI(parameters);
    const std::string text = Value(url, "state");
    const Json::Value state = DecodeState(text);
    Json::Value claims;
    claims["nonce"] = Value(url, "nonce");
    Expect(state["origin"].asString() == origin, "the origin is in the state");
    Expect(NonceMatches(claims, state), "the nonce belongs to its state");
    Expect(StateMatches(text, text), "the state belongs to its login");
    claims["nonce"] = claims["nonce"].asString() + "0";
    Expect(!NonceMatches(claims, state), "another nonce is refused");
    Expect(!StateMatches(text, text + "AAAA"), "another state is refused");
    Expect(!NonceMatches(Json::Value(), state), "a token without a nonce is refused");
    Expect(!NonceMatches(claims, Json::Value()), "a state without a nonce is refused");
  }
  for (const char* text : {"", "abc", "====", "bm9uZQ==", "W10=", "!!!!"}) {
    Expect(DecodeState(text).isNull(), text);
    Expect(!StateMatches("", text), "a login without a state is refused");
  }
  return failures == 0 ? EXIT_SUCCESS : EXIT_FAILURE;
}
