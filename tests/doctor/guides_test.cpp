// The settings in the guides: the doctor finds nothing wrong with them, and the provider's side of
// a guide names the same client, addresses and secret.
#include <gtest/gtest.h>
#include <json/json.h>

#include <array>
#include <cstdio>
#include <fstream>
#include <regex>
#include <sstream>
#include <string>
#include <vector>

#include "support/device.h"

namespace {

constexpr char kTenant[] = "6f0b4d1e-2c3a-4b5c-8d9e-0a1b2c3d4e5f";
constexpr char kApplication[] = "0a1b2c3d-4e5f-4a5b-8c7d-9e0f1a2b3c4d";
constexpr char kSecret[] = "5f1c0d7be29a4463b8f0a1c2d3e4f5a65f1c0d7be29a4463b8f0a1c2d3e4f5a6";

std::string contents(const std::string& name) {
  std::ostringstream text;
  text << std::ifstream(SOURCE_DIR "/docs/" + name, std::ios::binary).rdbuf();
  EXPECT_FALSE(text.str().empty()) << name;
  return text.str();
}

// The indented blocks of a document that are JSON objects.
std::vector<Json::Value> objectsOf(const std::string& page) {
  static const std::regex block("\n    \\{(?:[^\n]*\\}|(?:\n      [^\n]*)+\n    \\})\n");
  std::vector<Json::Value> objects;
  for (std::sregex_iterator i(page.begin(), page.end(), block), end; i != end; ++i) {
    std::istringstream text(i->str());
    Json::Value value;
    std::string errors;
    EXPECT_TRUE(Json::parseFromStream(Json::CharReaderBuilder(), text, &value, &errors)) << errors;
    objects.push_back(value);
  }
  return objects;
}

std::string filledIn(const Json::Value& settings) {
  std::string text = Json::writeString(Json::StreamWriterBuilder(), settings);
  const std::vector<std::pair<std::string, std::string>> values = {
      {"TENANT", kTenant}, {"APPLICATION", kApplication}, {"VALUE", kSecret}, {"SECRET", kSecret}};
  for (const auto& [name, value] : values) text = std::regex_replace(text, std::regex(name), value);
  return text;
}

// What the doctor objects to on a device with these files.
std::string objections() {
  FILE* const pipe = popen("cd / && " DOCTOR " --offline --json 2>&1", "r");
  std::string out;
  std::array<char, 4096> piece;
  for (size_t n; (n = fread(piece.data(), 1, piece.size(), pipe)) > 0;) out.append(piece.data(), n);
  pclose(pipe);
  std::istringstream text(out);
  Json::Value report;
  std::string errors;
  if (!Json::parseFromStream(Json::CharReaderBuilder(), text, &report, &errors)) return out;
  EXPECT_GT(report["findings"].size(), 3u) << out;
  std::string found;
  for (const Json::Value& finding : report["findings"]) {
    const std::string grade = finding["grade"].asString();
    if (grade == "failure" || grade == "warning") found += finding.toStyledString();
  }
  return found;
}

TEST(EntraGuide, HasSettingsThatTheDoctorAccepts) {
  const std::vector<Json::Value> objects = objectsOf(contents("entra-id.md"));
  ASSERT_EQ(objects.size(), 3u);
  test::writeConfig("profile.conf", filledIn(objects[0]), 0644);
  for (const size_t version : {1, 2}) {
    EXPECT_EQ(objects[version].size(), 9u);
    test::writeConfig("azure.conf", filledIn(objects[version]));
    EXPECT_EQ(objections(), "");
  }
}

TEST(LibertyGuide, HasSettingsThatTheDoctorAccepts) {
  const std::vector<Json::Value> objects = objectsOf(contents("websphere-liberty.md"));
  ASSERT_EQ(objects.size(), 2u);
  test::writeConfig("profile.conf", filledIn(objects[0]), 0644);
  EXPECT_EQ(objects[1].size(), 7u);
  test::writeConfig("websphere.conf", filledIn(objects[1]));
  EXPECT_EQ(objections(), "");
}

TEST(Guides, AreMissedByTheDoctorIfOneSettingIsWrong) {
  std::vector<Json::Value> objects = objectsOf(contents("entra-id.md"));
  objects[1]["azure_token_endpoint"] = "login.microsoftonline.com/token";
  test::writeConfig("profile.conf", filledIn(objects[0]), 0644);
  test::writeConfig("azure.conf", filledIn(objects[1]));
  EXPECT_NE(objections().find("azure_token_endpoint"), std::string::npos);
}

TEST(LibertyGuide, NamesTheSameOnBothSides) {
  const std::string page = contents("websphere-liberty.md");
  const Json::Value settings = objectsOf(page).at(1);
  const auto first = [&page](const std::string& pattern) {
    std::smatch match;
    return std::regex_search(page, match, std::regex(pattern)) ? match[1].str() : "";
  };
  EXPECT_EQ(first("<client name=\"([^\"]*)\""), settings["websphere_client_id"].asString());
  EXPECT_EQ(first(" secret=\"([^\"]*)\""), settings["websphere_client_secret"].asString());
  EXPECT_EQ(first("<redirect>([^<]*)<"), settings["websphere_redirect_uri"].asString());
  EXPECT_EQ(first("<oauthProvider id=\"([^\"]*)\""), first("oauthProviderRef=\"([^\"]*)\""));
  const std::string base =
      "https://login.example.net/oidc/endpoint/" + first("<openidConnectProvider id=\"([^\"]*)\"");
  EXPECT_EQ(settings["websphere_authorization_endpoint"], base + "/authorize");
  EXPECT_EQ(settings["websphere_token_endpoint"], base + "/token");
  EXPECT_EQ(settings["websphere_logout_endpoint"], base + "/end_session");
  EXPECT_EQ(settings["websphere_wellknown"], base + "/.well-known/openid-configuration");
}

}  // namespace
