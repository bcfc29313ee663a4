// Writes the seeds that hold signatures or exact lengths.
//   fuzz_seeds FOLDER           writes them to FOLDER/TARGET/NAME
//   fuzz_seeds --check FOLDER   compares them with what is there
// Seeds named good-* get through; all others must not (fuzz_replay --named).
#include <sys/stat.h>

#include <cstdio>
#include <fstream>
#include <map>
#include <sstream>
#include <string>

#include "support/independent.h"
#include "support/known.h"

namespace {

using fuzz::base64url;

const std::string kBetween = "\n%%\n";

// Standard base64 with padding, as the state is written.
std::string base64(const std::string& bytes) {
  std::string text = base64url(bytes);
  for (char& c : text) c = c == '-' ? '+' : c == '_' ? '/' : c;
  return text.append((4 - text.size() % 4) % 4, '=');
}

std::string repeated(const std::string& text, int count) {
  std::string all;
  while (count-- > 0) all += text;
  return all;
}

using Seeds = std::map<std::string, std::string>;

const std::string kHS256 = R"({"alg":"HS256"})";
const std::string kRS256 = R"({"alg":"RS256","kid":"key-1"})";

// RFC 7515, appendix A.1: header, payload, signature and key.
const std::string kRfcHeader = "eyJ0eXAiOiJKV1QiLA0KICJhbGciOiJIUzI1NiJ9";
const std::string kRfcPayload =
    "eyJpc3MiOiJqb2UiLA0KICJleHAiOjEzMDA4MTkzODAsDQogImh0dHA6Ly9leGFt"
    "cGxlLmNvbS9pc19yb290Ijp0cnVlfQ";
const std::string kRfcSignature = "dBjftJeZ4CVP-mB92K27uhbUJU1p1r_wW1gFWFOEjXk";
const std::string kRfcKey =
    "AyM1SysPpbyDfgZld3umj1qzKObwVMkoqQ-EstJQLr_T-1qS0gZH75aK"
    "tMN3Yj0iPS4hcgUuTwjAzZr1Z9CAow";

void tokens(Seeds& seeds) {
  const auto add = [&](const std::string& name, const std::string& token) {
    seeds["token/" + name] = token;
  };
  const std::string good = fuzz::hmacToken(kHS256, fuzz::kClaims);
  add("good-hs256", good);
  add("good-hs384", fuzz::hmacToken(R"({"alg":"HS384"})", fuzz::kClaims));
  add("good-hs512", fuzz::hmacToken(R"({"alg":"HS512"})", fuzz::kClaims));
  add("good-zero-byte-behind-signature", good + std::string(1, '\0') + "x");
  add("rs256", fuzz::rsaToken(kRS256, fuzz::kClaims));
  add("rfc7515-a1-expired", kRfcHeader + "." + kRfcPayload + "." + kRfcSignature);
  add("rfc7519-6.1-unsecured", "eyJhbGciOiJub25lIn0." + kRfcPayload + ".");
  add("hs256-padded-signature", good + "=");
  add("hs256-standard-alphabet-header", "+/" + good);
  add("hs256-without-signature", good.substr(0, good.rfind('.') + 1));
  add("hs256-four-segments", good + ".");
  add("hs256-zero-byte-in-header", std::string(1, '\0') + good);
  add("expired", fuzz::hmacToken(kHS256, R"({"aud":"device-17","exp":1999999999})"));
  add("empty-body", "e30..");
  add("two-dots", "..");
  add("body-of-4k-plus-1", "e30.e30xx.");
}

void base64urls(Seeds& seeds) {
  const auto add = [&](const std::string& name, const std::string& text) {
    seeds["base64url/" + name] = text;
  };
  add("good-rfc7515-a1-key", kRfcKey);
  add("good-rfc4648-f", "Zg");
  add("good-rfc4648-fo", "Zm8");
  add("good-rfc4648-foobar", "Zm9vYmFy");
  add("good-both-alphabets", "-_+/");
  add("good-json-object", base64url("{}"));
  add("good-zero-bytes", "AAAA");
  add("padded", "Zg==");
  add("one-character", "Z");
  add("left-over-bits", "Zh");
  add("spaces", " Zm 9v ");
  add("line-break", "Zm9v\nYmFy\n");
  add("pads-in-the-middle", "Zg==Zg==");
  add("pads-alone", "====");
  add("outside-the-alphabet", "Zm9v!mFy");
  add("good-a-full-line-of-64-and-more", repeated("YWJj", 40));
}

void headersAndBodies(Seeds& seeds) {
  const auto add = [&](const std::string& name, const std::string& header,
                       const std::string& body) {
    seeds["header_and_body/" + name] = header + kBetween + body;
  };
  const std::string aud = R"({"aud":"device-17","sub":"alice","exp":)";
  add("good-hs256", kHS256, fuzz::kClaims);
  add("good-hs512", R"({"alg":"HS512"})", fuzz::kClaims);
  add("good-expiry-now", kHS256, aud + "2000000000}");
  add("good-expiry-beyond-2-to-31", kHS256, aud + "2200000000}");
  add("good-expiry-2-to-63", kHS256, aud + "9223372036854775808}");
  add("good-expiry-as-text", kHS256, aud + R"("2000000001 seconds"})");
  add("good-expiry-real", kHS256, aud + "2000000000.5}");
  add("good-comment", kHS256 + "// why not", aud + "/*soon*/2000000001}");
  add("good-comment-of-two-lines", kHS256, aud + "/*not\r\n\"now*/2000000001}");
  add("good-later-member-counts", R"({"alg":"none","alg":"HS256"})", aud + "1,\"exp\":2000000001}");
  add("good-zero-byte-behind-json", kHS256 + std::string(1, '\0') + "}",
      fuzz::kClaims + std::string(1, '\0') + "}");
  add("expiry-one-second-ago", kHS256, aud + "1999999999}");
  add("expiry-negative", kHS256, aud + "-1}");
  add("expiry-missing", kHS256, R"({"aud":"device-17"})");
  add("good-expiry-exponent", kHS256, aud + "2e9}");
  add("expiry-array", kHS256, aud + "[2000000001]}");
  add("audience-array", kHS256, R"({"aud":["device-17"],"exp":2000000001})");
  add("audience-with-zero-byte", kHS256, R"({"aud":"device-17\u0000","exp":2000000001})");
  add("audience-in-other-case", kHS256, R"({"aud":"Device-17","exp":2000000001})");
  add("subject-number", kHS256, R"({"aud":"device-17","sub":7,"exp":2000000001})");
  add("algorithm-none", R"({"alg":"none"})", fuzz::kClaims);
  add("algorithm-in-lower-case", R"({"alg":"hs256"})", fuzz::kClaims);
  add("algorithm-rs256", kRS256, fuzz::kClaims);
  add("algorithm-object", R"({"alg":{}})", fuzz::kClaims);
  add("header-array", "[]", fuzz::kClaims);
  add("header-null", "null", fuzz::kClaims);
  add("body-number", kHS256, "502");
  add("body-cut-off", kHS256, std::string(fuzz::kClaims).substr(0, 40));
  add("body-nested", kHS256, repeated("[", 400));
  add("body-invalid-utf8", kHS256, "{\"aud\":\"\xff\xc0\x80\",\"exp\":2000000001}");
  add("body-half-surrogate", kHS256, R"({"aud":"\ud800","exp":2000000001})");
}

void keySets(Seeds& seeds) {
  const auto add = [&](const std::string& name, const std::string& set) {
    seeds["key_set/" + name] = set;
  };
  const std::string n = fuzz::kModulus;
  const auto key = [&](const std::string& kid, const std::string& modulus,
                       const std::string& exponent) {
    return R"({"kid":)" + kid + R"(,"n":")" + modulus + R"(","e":")" + exponent + R"("})";
  };
  const auto set = [](const std::string& keys) { return R"({"keys":[)" + keys + "]}"; };
  const std::string good = key(R"("key-1")", n, "AQAB");
  const std::string other = key(R"("key-1")", "3" + n.substr(1), "AQAB");
  add("good-one-key", fuzz::keySet());
  add("good-among-others", set(key(R"("key-0")", "AQAB", "Aw") + "," + good));
  add("good-first-of-two-alike", set(good + "," + other));
  add("good-exponent-with-leading-zero", set(key(R"("key-1")", n, "AAEAAQ")));
  add("good-keys-without-id", set(R"({"n":"AQAB","e":"Aw"},7,null,)" + good));
  add("good-null-id-first", set(key("null", n, "AQAB") + "," + good));
  add("good-trailing-text", fuzz::keySet() + "}}}");
  add("first-of-two-alike-is-wrong", set(other + "," + good));
  add("no-such-id", set(key(R"("key-2")", n, "AQAB")));
  add("id-null", set(key("null", n, "AQAB")));
  add("id-array", set(key("[]", n, "AQAB") + "," + good));
  add("keys-object", R"({"keys":{"kid":"key-1"}})");
  add("keys-missing", "{}");
  add("keys-null", R"({"keys":null})");
  add("not-json", "<html>502 Bad Gateway</html>");
  add("cut-off", fuzz::keySet().substr(0, 300));
  add("cut-off-in-the-last-byte", fuzz::keySet().substr(0, fuzz::keySet().size() - 1));
  add("exponent-1", set(key(R"("key-1")", n, "AQ")));
  add("exponent-empty", set(key(R"("key-1")", n, "")));
  add("exponent-not-base64", set(key(R"("key-1")", n, "!!!!")));
  add("exponent-number", set(R"({"kid":"key-1","n":")" + n + R"(","e":65537})"));
  add("modulus-even", set(key(R"("key-1")", n.substr(0, 341) + "g", "AQAB")));
  add("modulus-tiny", set(key(R"("key-1")", "Iw", "Aw")));
  add("modulus-missing", set(R"({"kid":"key-1","e":"AQAB"})"));
  add("modulus-of-4096-bits", set(key(R"("key-1")", repeated("_", 683), "AQAB")));
}

void signatures(Seeds& seeds) {
  const std::string n = fuzz::kModulus;
  const auto rsa = [&](const std::string& name, const std::string& digest, const std::string& n_,
                       const std::string& e, const std::string& token) {
    seeds["rsa_signature/" + name] = digest + kBetween + n_ + kBetween + e + kBetween + token;
  };
  const auto signedBy = [](const std::string& digest) {
    const std::string input = "aGVhZGVy.Ym9keQ";
    return input + "." + base64url(fuzz::sign(input, digest));
  };
  for (const std::string digest : {"SHA256", "SHA384", "SHA512"}) {
    rsa("good-" + digest, digest, n, "AQAB", signedBy(digest));
  }
  rsa("good-empty-segments", "SHA256", n, "AQAB", ".." + base64url(fuzz::sign(".")));
  rsa("another-digest", "SHA256", n, "AQAB", signedBy("SHA384"));
  rsa("signature-one-byte-short", "SHA256", n, "AQAB", "a.b." + base64url(std::string(255, 'x')));
  rsa("signature-zero", "SHA256", n, "AQAB", "a.b." + base64url(std::string(256, '\0')));
  rsa("signature-modulus", "SHA256", n, "AQAB", "a.b." + n);
  rsa("signature-empty", "SHA256", n, "AQAB", "a.b.");
  rsa("exponent-1", "SHA256", n, "AQ", "a.b." + n);
  rsa("exponent-2", "SHA256", n, "Ag", "a.b." + n);
  rsa("exponent-of-65-bits", "SHA256", n, "Af____________8", signedBy("SHA256"));
  rsa("exponent-as-long-as-the-modulus", "SHA256", n, n, signedBy("SHA256"));
  rsa("modulus-zero", "SHA256", "AA", "AQAB", "a.b.AA");
  rsa("modulus-1", "SHA256", "AQ", "AQAB", "a.b.AQ");
  rsa("modulus-even", "SHA256", n.substr(0, 341) + "g", "AQAB", signedBy("SHA256"));
  rsa("modulus-of-512-bits", "SHA256", repeated("_", 85) + "w", "AQAB", "a.b." + repeated("A", 86));

  const auto hmac = [&](const std::string& name, const std::string& digest, const std::string& key,
                        const std::string& token) {
    seeds["hmac_signature/" + name] = digest + kBetween + key + kBetween + token;
  };
  hmac("good-rfc7515-a1", "SHA256", kRfcKey, kRfcHeader + "." + kRfcPayload + "." + kRfcSignature);
  for (const std::string digest : {"SHA256", "SHA384", "SHA512"}) {
    hmac("good-" + digest, digest, "c2VjcmV0", "aGVhZGVy.Ym9keQ.!");
  }
  hmac("good-key-of-one-zero-byte", "SHA256", "AA", "a.b.!");
  hmac("another-digest", "SHA512", kRfcKey, kRfcHeader + "." + kRfcPayload + "." + kRfcSignature);
  hmac("key-empty", "SHA256", "", "a.b." + base64url(fuzz::hmac("", "a.b", "SHA256")));
  hmac("key-not-base64", "SHA256", "!!!!", "a.b." + base64url(fuzz::hmac("", "a.b", "SHA256")));
  hmac("key-of-4k-plus-1", "SHA256", "AAAAA", "a.b.!");
  hmac("signature-padded", "SHA256", kRfcKey,
       kRfcHeader + "." + kRfcPayload + "." + kRfcSignature + "=");
  hmac("signature-empty", "SHA256", kRfcKey, kRfcHeader + "." + kRfcPayload + ".");
  hmac("good-zero-byte-in-front-of-the-dot", "SHA256", "AA", std::string("a\0a.b.!", 7));
}

void answers(Seeds& seeds) {
  const auto response = [&](const std::string& name, char chunk, const std::string& body) {
    seeds["token_response/" + name] = chunk + body;
  };
  const std::string token = fuzz::hmacToken(kHS256, fuzz::kClaims);
  response("good-azure", 'z', fuzz::tokenResponse(fuzz::rsaToken(kRS256, fuzz::kClaims)));
  response("good-websphere-byte-by-byte", '\1', fuzz::tokenResponse(token));
  response("good-empty-token", 'z', R"({"id_token":""})");
  response("good-zero-byte-in-token", 'z', R"({"id_token":"a\u0000b"})");
  response("good-trailing-text", 'z', R"({"id_token":"x"}<html>)");
  response("good-zero-byte-in-body", 'z', R"({"id_token":"x"})" + std::string(1, '\0') + "lost");
  response(
      "error", 'z',
      R"({"error":"invalid_grant","error_description":"AADSTS70008\r\n","error_codes":[70008]})");
  response("error-null-beside-a-token", 'z', R"({"error":null,"id_token":"x"})");
  response("token-null", 'z', R"({"id_token":null})");
  response("token-number", 'z', R"({"id_token":5})");
  response("token-array", 'z', R"({"id_token":["x"]})");
  response("token-missing", 'z', R"({"access_token":"x"})");
  response("not-json", 'z', "<html>502 Bad Gateway</html>");
  response("number", 'z', "502 Bad Gateway");
  response("array", 'z', R"(["id_token"])");
  response("empty", 'z', "");
  response("cut-off", 'z', R"({"id_token":"x)");
  response("deep", 'z', repeated("[", 1500));
  response("good-escapes", 'z', R"({"\u0069d_token":"\ud83d\ude00\"\\\/\b\f\n\r\t"})");

  const auto discovery = [&](const std::string& name, const std::string& document) {
    seeds["discovery/" + name] = document;
  };
  discovery("good-honest", fuzz::kDiscovery);
  discovery("good-cut-off-behind-the-address",
            R"({"jwks_uri":"https://provider.example/keys","issuer":)");
  discovery("good-later-member-counts",
            R"({"jwks_uri":"file:///etc/passwd","jwks_uri":"https://provider.example/keys"})");
  discovery("address-missing", "{}");
  discovery("address-array", R"({"jwks_uri":["https://provider.example/keys"]})");
  discovery("address-number", R"({"jwks_uri":7})");
  discovery("address-of-a-file", R"({"jwks_uri":"file:///etc/passwd"})");
  discovery("address-with-line-break", R"({"jwks_uri":"https://provider.example/keys\r\nX: y"})");
  discovery("good-address-with-zero-byte",
            R"({"jwks_uri":"https://provider.example/keys\u0000x"})");
  discovery("html", "<html></html>");
  discovery("array", "[]");
  discovery("null", "null");
  discovery("empty", "");

  const auto login = [&](const std::string& name, const std::string& client,
                         const std::string& answer, const std::string& document,
                         const std::string& keys) {
    seeds["login/" + name] = client + kBetween + answer + kBetween + document + kBetween + keys;
  };
  const std::string azure = fuzz::tokenResponse(fuzz::rsaToken(kRS256, fuzz::kClaims));
  login("good-azure-rs256", "azure", azure, fuzz::kDiscovery, fuzz::keySet());
  login("good-azure-rs384", "azure",
        fuzz::tokenResponse(fuzz::rsaToken(R"({"alg":"RS384","kid":"key-1"})", fuzz::kClaims)),
        fuzz::kDiscovery, fuzz::keySet());
  login("good-azure-rs512", "azure",
        fuzz::tokenResponse(fuzz::rsaToken(R"({"alg":"RS512","kid":"key-1"})", fuzz::kClaims)),
        fuzz::kDiscovery, fuzz::keySet());
  std::string padded = fuzz::keySet();
  padded.replace(padded.find("UsLA9e"), 6, "UsL=9e");
  login("good-azure-pad-for-zero-bits-in-the-modulus", "azure", azure, fuzz::kDiscovery, padded);
  login("good-websphere-hs256", "websphere", fuzz::tokenResponse(token), "", "");
  login("azure-no-keys", "azure", azure, fuzz::kDiscovery, "{}");
  login("azure-hs256-under-the-modulus", "azure",
        fuzz::tokenResponse(fuzz::hmacToken(R"({"alg":"HS256","kid":"key-1"})", fuzz::kClaims)),
        fuzz::kDiscovery, fuzz::keySet());
  login("websphere-rs256", "websphere", azure, "", "");
  login("azure-without-email", "azure",
        fuzz::tokenResponse(
            fuzz::rsaToken(kRS256, R"({"exp":2000000300,"aud":"device-17","tid":"tenant-4"})")),
        fuzz::kDiscovery, fuzz::keySet());
  login("azure-other-tenant", "azure",
        fuzz::tokenResponse(
            fuzz::rsaToken(kRS256, R"({"exp":2000000300,"aud":"device-17","tid":"tenant-5"})")),
        fuzz::kDiscovery, fuzz::keySet());
  login("azure-error", "azure", R"({"error":"invalid_grant"})", "", "");
  login("websphere-error", "websphere", R"({"error":"invalid_grant"})", "", "");
  login("azure-silence", "azure", "", "", "");
}

void states(Seeds& seeds) {
  const auto relay = [&](const std::string& name, const std::string& json) {
    seeds["relay_state/" + name] = base64(json);
  };
  relay("good-origin",
        R"({"nonce":"d41d8cd98f00b204e9800998ecf8427e","origin":"/webman/index.cgi"})");
  relay("good-origin-with-line-breaks", R"({"origin":"/\r\nSet-Cookie: a=b\r\n\r\n<script>&#"})");
  relay("good-origin-empty", R"({"origin":""})");
  relay("good-origin-utf8", R"({"origin":"/\u00e4\ud83d\ude00"})");
  relay("good-origin-zero-byte", R"({"origin":"/a\u0000b"})");
  const std::string longest = R"({"origin":")" + std::string(1024 - 13, 'a') + R"("})";
  relay("good-of-1024-bytes", longest);
  relay("of-1025-bytes", longest + " ");
  relay("origin-number", R"({"origin":5})");
  relay("origin-missing", "{}");
  relay("array", R"(["origin"])");
  relay("cut-off", R"({"origin":"/webman)");
  relay("zero-byte-in-front", std::string(1, '\0') + R"({"origin":"/"})");
  relay("good-zero-byte-behind", R"({"origin":"/"})" + std::string(1, '\0') + "}");
  seeds["relay_state/empty"] = "";
  seeds["relay_state/url-alphabet"] = "eyJvcmlnaW4iOiI_-Pn4ifQ";
  seeds["relay_state/without-padding"] = base64url(R"({"origin":"/ab"})");
  seeds["relay_state/line-break"] = base64(R"({"origin":"/"})") + "\n";
  seeds["relay_state/percent-encoded"] = "eyJvcmlnaW4iOiIvIn0%3D";

  const auto parameters = [&](const std::string& name, const std::string& json) {
    seeds["state_parameters/" + name] = json;
  };
  parameters("good-origin", R"({"origin":"/webman/index.cgi"})");
  parameters("good-nonce-of-the-caller", R"({"nonce":"mine","origin":"/"})");
  parameters("good-nested", R"({"a":[1,2.5,true,null,{"b":"c"}],"origin":{"x":1}})");
  parameters("good-utf8", "{\"origin\":\"/\xc3\xa4\xe2\x82\xac\xf0\x9f\x98\x80\"}");
  parameters("good-invalid-utf8", "{\"origin\":\"/\xff\xc0\x80\"}");
  parameters("good-names-that-become-one", "{\"\xff\":1,\"\xfe\":1,\"origin\":\"/\"}");
  parameters("good-line-breaks", R"({"origin":"/\r\nLocation: x"})");
  // What the library adds around it: the nonce, 43 bytes, and a line feed.
  const auto sized = [](std::size_t size) {
    return R"({"a":")" + std::string(size, 'x') + R"("})";
  };
  parameters("good-state-of-765-bytes", sized(765 - 1 - 43 - 8));
  parameters("state-of-766-bytes", sized(766 - 1 - 43 - 8));
  parameters("null", "null");
  parameters("array", R"([{"origin":"/"}])");
  parameters("text", R"("origin")");
  parameters("not-json", "origin");
}

void files(Seeds& seeds) {
  const auto add = [&](const std::string& name, const std::string& profile,
                       const std::string& azure, const std::string& websphere) {
    seeds["configuration/" + name] = profile + kBetween + azure + kBetween + websphere;
  };
  const std::string onAzure = R"({"sso_enable":true,"sso_profile":"azure"})";
  const std::string onWebSphere = R"({"sso_enable":true,"sso_profile":"websphere"})";
  const std::string azure =
      R"({"azure_sso_enable":true,"azure_wellknown":"w","azure_client_id":"i",)"
      R"("azure_client_secret":"s","azure_tenant_id":"t","azure_authorization_endpoint":"a",)"
      R"("azure_token_endpoint":"e","azure_redirect_uri":"r","azure_logout_endpoint":"l"})";
  const std::string websphere =
      R"({"websphere_wellknown":"w","websphere_client_id":"i","websphere_client_secret":"s",)"
      R"("websphere_authorization_endpoint":"a","websphere_token_endpoint":"e",)"
      R"("websphere_redirect_uri":"r","websphere_logout_endpoint":"l"})";
  add("good-azure", onAzure, azure, "missing");
  add("good-websphere", onWebSphere, "missing", websphere);
  add("good-comments", "/* on */" + onAzure + "// now", azure, websphere);
  add("good-line-break-in-a-value", onAzure, R"({"azure_client_id":"a\r\nb"})", "{}");
  add("a-comma-too-many", R"({"sso_enable":true,})", azure, websphere);
  add("nothing-there", "missing", "missing", "missing");
  add("folders", "folder", "folder", "folder");
  add("empty-files", "", "", "");
  add("objects-without-members", "{}", "{}", "{}");
  add("arrays", "[true]", "[]", "[[]]");
  add("off", R"({"sso_enable":false,"sso_profile":"azure"})", azure, websphere);
  add("on-as-text", R"({"sso_enable":"true","sso_profile":"azure"})", azure, websphere);
  add("profile-in-capitals", R"({"sso_enable":true,"sso_profile":"Azure"})", azure, websphere);
  add("profile-with-zero-byte", R"({"sso_enable":true,"sso_profile":"azure\u0000"})", azure, "");
  add("profile-format-string", R"({"sso_enable":true,"sso_profile":"%s%n%m"})", azure, "");
  add("profile-missing", R"({"sso_enable":true})", azure, websphere);
  add("wrong-types", onAzure,
      R"({"azure_sso_enable":1,"azure_client_id":5,"azure_client_secret":null,"azure_tenant_id":[]})",
      R"({"websphere_client_id":{}})");
  add("cut-off", onAzure.substr(0, 20), azure.substr(0, 50), websphere.substr(0, 50));
  add("byte-order-mark", "\xef\xbb\xbf" + onAzure, "\xef\xbb\xbf" + azure, websphere);
  add("deep", repeated("[", 1200), repeated("{\"a\":", 120), "");
}

void texts(Seeds& seeds) {
  const auto add = [&](const std::string& name, const std::string& text) { seeds[name] = text; };
  add("principal_name/good-plain", "alice@werk.example.net");
  add("principal_name/good-empty-domain", "alice@");
  add("principal_name/good-empty-account", "@werk.example.net");
  add("principal_name/good-backslash", "WERK\\alice@example.net");
  add("principal_name/good-utf8", "\xc3\xa4@\xc3\xa9.example");
  add("principal_name/good-zero-byte", std::string("ad\0min@werk", 11));
  add("principal_name/good-line-breaks", "a\r\nb@c\r\nd");
  add("principal_name/good-of-1022-bytes", std::string(1000, 'a') + "@" + std::string(21, 'd'));
  add("principal_name/of-1023-bytes", std::string(1000, 'a') + "@" + std::string(22, 'd'));
  add("principal_name/two-in-a-row", "alice@@werk");
  add("principal_name/none", "alice");
  add("principal_name/empty", "");

  add("logout_address/good-index", "https://device.example/index.cgi");
  add("logout_address/good-slash", "https://device.example/");
  add("logout_address/good-index-and-slash", "https://device.example/index.cgi/");
  add("logout_address/good-index-alone", "/index.cgi");
  add("logout_address/good-slash-and-index", "//index.cgi");
  add("logout_address/good-empty", "");
  add("logout_address/good-line-breaks", "https://device.example/\r\nSet-Cookie: a=b");
  add("logout_address/good-query", "https://device.example/?a=b&c=d#e%00");
  add("logout_address/good-zero-byte", std::string("https://device\0example", 22));
  add("logout_address/nine-bytes", "index.cgi");
  add("logout_address/one-byte", "/");

  add("url_text/good-reserved", ":/?#[]@!$&'()*+,;= \"<>%\\^`{|}");
  add("url_text/good-line-breaks", "a\r\nb");
  add("url_text/good-utf8", "\xc3\xa4\xf0\x9f\x98\x80");
  add("url_text/good-all-escaped", std::string(100, '%'));
  add("url_text/good-zero-byte", std::string("a\0b", 3));
  add("url_text/unreserved", "AZaz09-._~");
  add("url_text/empty", "");

  add("http_chunks/good-one", R"({"id_token":"x"})");
  add("http_chunks/good-three", "{\"a\":" + kBetween + "1" + kBetween + "}");
  add("http_chunks/good-zero-byte", std::string("ab\0cd", 5) + kBetween + "ef");
  add("http_chunks/good-zero-byte-first", std::string("\0ab", 3) + kBetween + "cd");
  add("http_chunks/good-empty", "");
  add("http_chunks/cut-off", "!{\"a\":");
}

void wires(Seeds& seeds) {
  const auto add = [&](const std::string& name, const std::string& head, const std::string& body) {
    seeds["http_answer/" + name] = head + "\r\n\r\n" + body;
  };
  const std::string ok = "HTTP/1.1 200 OK\r\n";
  add("good-length", ok + "Content-Length: 5", "hello");
  add("good-until-the-end", "HTTP/1.0 200 OK", "hello");
  add("good-chunks", ok + "Transfer-Encoding: chunked",
      "2\r\nhe\r\n3;x=y\r\nllo\r\n0\r\nX: y\r\n\r\n");
  add("good-zero-byte", ok + "Content-Length: 5", std::string("he\0lo", 5));
  add("good-error-status", "HTTP/1.1 502 Bad Gateway\r\nContent-Length: 5", "sorry");
  add("good-continue-first", "HTTP/1.1 100 Continue\r\n\r\n" + ok + "Content-Length: 2", "ok");
  add("good-redirect", "HTTP/1.1 302 Found\r\nLocation: http://elsewhere/\r\nContent-Length: 2",
      "no");
  add("good-compressed-as-it-is", ok + "Content-Encoding: gzip\r\nContent-Length: 4",
      "\x1f\x8b\x08x");
  add("length-too-long", ok + "Content-Length: 50", "hello");
  add("length-negative", ok + "Content-Length: -5", "hello");
  add("good-length-twice-the-last-counts", ok + "Content-Length: 5\r\nContent-Length: 3", "hello");
  add("chunk-without-end", ok + "Transfer-Encoding: chunked", "ffffffffffffffffff\r\nhello");
  add("chunk-size-missing", ok + "Transfer-Encoding: chunked", "\r\nhello\r\n0\r\n\r\n");
  add("empty-body", ok + "Content-Length: 0", "");
  add("no-content", "HTTP/1.1 204 No Content", "hello");
  add("version-9", "HTTP/9.9 200 OK\r\nContent-Length: 5", "hello");
  seeds["http_answer/no-header-at-all"] = "hello";
  seeds["http_answer/nothing"] = "";
}

std::string contents(const std::string& path) {
  std::ostringstream text;
  text << std::ifstream(path, std::ios::binary).rdbuf();
  return text.str();
}

}  // namespace

int main(int argc, char** argv) {
  const bool check = argc == 3 && std::string(argv[1]) == "--check";
  if (argc != 2 && !check) {
    std::fprintf(stderr, "usage: fuzz_seeds [--check] FOLDER\n");
    return 2;
  }
  const std::string folder = argv[argc - 1];
  Seeds seeds;
  for (const auto make : {tokens, base64urls, headersAndBodies, keySets, signatures, answers,
                          states, files, texts, wires}) {
    make(seeds);
  }
  int wrong = 0;
  for (const auto& [name, text] : seeds) {
    const std::string path = folder + "/" + name;
    if (check) {
      if (std::ifstream(path).good() && contents(path) == text) continue;
      std::printf("%s is not what fuzz_seeds writes\n", path.c_str());
      ++wrong;
      continue;
    }
    mkdir((folder + "/" + name.substr(0, name.find('/'))).c_str(), 0755);
    std::ofstream(path, std::ios::binary | std::ios::trunc) << text;
  }
  std::printf("%zu seeds, %d wrong\n", seeds.size(), wrong);
  return wrong > 0 ? 1 : 0;
}
