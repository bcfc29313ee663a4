// Servers that repeat the client secret, wherever the doctor reads: what it prints holds no 8
// characters of it, in none of its encodings, on none of its outputs.
#include <gtest/gtest.h>

#include "doctor_site.h"
#include "secret_forms.h"

namespace {

using test::Answer;
using test::compact;
using test::filler;
using test::Site;

// One place of the provider's answers, and what puts a text that holds the secret there.
struct Echo {
  const char* name;
  void (*put)(Site& site, const std::string& text);
  bool shown;  // the doctor shows text from there
};

std::string oneLine(std::string text) {
  for (char& c : text) c = c == '\r' || c == '\n' ? ' ' : c;
  return text;
}

void inDescription(Site& site, const std::string& text) {
  Json::Value error;
  error["error"] = "invalid_client";
  error["error_description"] = text;
  site.answers["/token"] = test::failed(401, compact(error));
}

void inError(Site& site, const std::string& text) {
  Json::Value error;
  error["error"] = text;
  site.answers["/token"] = test::failed(400, compact(error));
}

void inPage(Site& site, const std::string& text) {
  site.answers["/token"] = test::failed(400, "<html>" + text);
}

void inContentType(Site& site, const std::string& text) {
  site.answers["/token"].raw = "HTTP/1.1 400 Bad\r\nContent-Type: " + oneLine(text) +
                               "\r\nContent-Length: 0\r\nConnection: close\r\n\r\n";
}

void inReason(Site& site, const std::string& text) {
  site.answers["/token"].raw =
      "HTTP/1.1 400 " + oneLine(text) + "\r\nContent-Length: 0\r\nConnection: close\r\n\r\n";
}

void inLocation(Site& site, const std::string& text) {
  site.answers["/token"].raw = "HTTP/1.1 302 Found\r\nLocation: https://localhost/?" +
                               oneLine(text) + "\r\nContent-Length: 0\r\nConnection: close\r\n\r\n";
}

void inDiscovery(Site& site, const std::string& text) {
  site.discovery["issuer"] = text;
  site.discovery["token_endpoint"] = "https://localhost/" + text;
  site.discovery["id_token_signing_alg_values_supported"][0] = text;
  site.passToken = true;
}

void inKeys(Site& site, const std::string& text) {
  site.keys["keys"].append(site.keys["keys"][0]);
  site.keys["keys"].append(site.keys["keys"][0]);
  site.keys["keys"][1]["kid"] = text;
  site.keys["keys"][2]["kid"] = text;
}

void inClaims(Site& site, const std::string& text) {
  for (const char* name : {"iss", "aud", "tid", "email"}) site.claims[name] = text;
  site.header["kid"] = text;
  site.header["alg"] = text;
  site.passToken = true;
}

void inCertificate(Site& site, const std::string& text) {
  site.identity = test::selfSigned({"localhost"}, text);
}

class DoctorEcho : public testing::TestWithParam<Echo> {};

TEST_P(DoctorEcho, ShowsNothingOfTheSecret) {
  const std::vector<std::string> forms = test::allSecretForms();
  size_t hidden = 0;
  // Each form at a few of the positions; doctor_redact_test has all of them.
  constexpr size_t kPositions[] = {0, 52, 190, 197, 203, 300};
  for (size_t i = 0; i < forms.size(); i += 3) {
    Site site(true);
    site.settings["azure_client_secret"] = test::kOddSecret;
    site.arguments = {"--try-secret", "--verbose"};
    GetParam().put(site, filler(kPositions[i % std::size(kPositions)]) + forms[i] + " and so on");
    site.deploy(false);
    const test::Outcome run = runDoctor(site, i % 2 == 0);
    ASSERT_NE(run.out, "") << run.err;
    if (run.out.find("(hidden)") != std::string::npos) ++hidden;
    for (const std::string& form : {forms[i], std::string(test::kOddSecret)}) {
      ASSERT_EQ(test::windowIn(run.out + run.err, form), "") << run.out << run.err;
    }
  }
  EXPECT_EQ(hidden > 0, GetParam().shown);
}

INSTANTIATE_TEST_SUITE_P(
    Places, DoctorEcho,
    testing::Values(Echo{"Description", inDescription, true}, Echo{"Error", inError, true},
                    Echo{"Page", inPage, false}, Echo{"ContentType", inContentType, true},
                    Echo{"Reason", inReason, false}, Echo{"Location", inLocation, true},
                    Echo{"Discovery", inDiscovery, true}, Echo{"Keys", inKeys, true},
                    Echo{"Claims", inClaims, true}, Echo{"Certificate", inCertificate, true}),
    [](const auto& given) { return given.param.name; });

// The two IDs in each other's place.
TEST(DoctorEcho, ShowsNeitherOfASwappedClientIdAndSecret) {
  for (const bool azure : {false, true}) {
    Site site(azure);
    const std::string prefix = azure ? "azure_" : "websphere_";
    const std::string secret = "Xq8Q~3xk.secret-Value_7rT9";
    site.settings[prefix + "client_id"] = secret;
    site.settings[prefix + "client_secret"] = test::kClient;
    site.claims["aud"] = test::kClient;
    site.passToken = true;
    site.arguments = {"--verbose"};
    site.deploy(false);
    for (const bool text : {false, true}) {
      const test::Outcome run = runDoctor(site, text);
      EXPECT_EQ(test::windowIn(run.out, secret), "") << run.out;
      EXPECT_EQ(test::windowIn(run.out, test::kClient), "") << run.out;
    }
  }
}

}  // namespace
