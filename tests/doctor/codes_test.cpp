// The doctor's table of provider codes and library messages: complete, recognised in whatever form
// they are pasted, and the same in docs/messages.md.
#include "doctor/codes.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdio>
#include <fstream>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "doctor/explain.h"
#include "doctor/messages.h"
#include "pasted.h"

namespace {

using doctor::Code;
using doctor::CodeSource;
using doctor::Message;
using doctor::MessageGroup;
using test::namesIn;
using Names = std::vector<std::string>;

// --- the table

size_t countOf(CodeSource source) {
  const auto rows = doctor::Codes();
  return static_cast<size_t>(std::count_if(
      rows.begin(), rows.end(), [source](const Code& code) { return code.source == source; }));
}

TEST(Codes, AreEnough) {
  EXPECT_GE(countOf(CodeSource::kEntra), 90u);
  EXPECT_GE(countOf(CodeSource::kLiberty), 25u);
}

TEST(Codes, HoldWhatAdministratorsMeetFirst) {
  for (const char* number :
       {"7000222", "7000215", "7000218", "700016", "700025", "50011", "500112", "90002",
        "9002313", "900144",  "90014",   "70000",  "70008",  "54005", "53003",  "50076",
        "50146",   "65001",   "65004",   "50020",  "50105",  "50034", "700054"}) {
    EXPECT_NE(doctor::FindCode(std::string("AADSTS") + number), nullptr) << number;
  }
  for (const char* name : {"CWOAU0025E", "CWOAU0029E", "CWOAU0032E", "CWOAU0033E", "CWOAU0035E",
                           "CWOAU0058E", "CWOAU0061E", "CWWKS1406E", "CWWKS1455E", "CWWKS1636E"}) {
    EXPECT_NE(doctor::FindCode(name), nullptr) << name;
  }
}

// RFC 6749, sections 4.1.2.1 and 5.2; OpenID Connect Core, section 3.1.2.6.
TEST(Codes, HoldEveryPlainError) {
  const std::set<std::string> standard = {"invalid_request",
                                          "unauthorized_client",
                                          "access_denied",
                                          "unsupported_response_type",
                                          "invalid_scope",
                                          "server_error",
                                          "invalid_client",
                                          "temporarily_unavailable",
                                          "invalid_grant",
                                          "unsupported_grant_type",
                                          "interaction_required",
                                          "login_required",
                                          "consent_required",
                                          "account_selection_required",
                                          "invalid_request_uri",
                                          "invalid_request_object",
                                          "request_not_supported",
                                          "request_uri_not_supported",
                                          "registration_not_supported"};
  std::set<std::string> held;
  for (const Code& code : doctor::Codes()) {
    if (code.source == CodeSource::kOAuth) held.insert(code.name);
  }
  EXPECT_EQ(held, standard);
}

TEST(Codes, AreWholeSentencesAndFitATable) {
  std::set<std::string> names;
  for (const Code& code : doctor::Codes()) {
    EXPECT_TRUE(names.insert(code.name).second) << code.name << " is there twice";
    EXPECT_NE(code.met, 0u) << code.name;
    for (const std::string text : {code.meaning, code.action}) {
      EXPECT_TRUE(text.size() > 8 && text.back() == '.') << code.name << ": " << text;
      EXPECT_EQ(text.find_first_of("|\n"), std::string::npos) << code.name;
    }
  }
}

TEST(Codes, JudgeTheSecretOnlyWhereItIsMeant) {
  Names refused;
  for (const Code& code : doctor::Codes()) {
    if (code.secret == doctor::SecretVerdict::kRefused) refused.push_back(code.name);
  }
  EXPECT_EQ(refused, (Names{"AADSTS7000215", "AADSTS7000222", "AADSTS7000218", "AADSTS7000216",
                            "CWOAU0024E", "CWOAU0038E", "CWWKS1406E"}));
}

TEST(Codes, AreFoundByNameAlone) {
  EXPECT_STREQ(doctor::FindCode("aadsts50011")->name, "AADSTS50011");
  for (const char* name : {"", "AADSTS", "AADSTS5001", "AADSTS500110", "50011", "CWOAU0061"}) {
    EXPECT_EQ(doctor::FindCode(name), nullptr) << name;
  }
}

// --- in every form in which they are pasted

class PastedCode : public testing::TestWithParam<test::Form> {};

TEST_P(PastedCode, IsRecognised) {
  size_t count = 0;
  for (const Code& code : doctor::Codes()) {
    const std::string text = GetParam().write(code.name);
    if (text.empty()) continue;  // a form that these codes do not have
    ++count;
    EXPECT_EQ(namesIn(text), Names{code.name}) << text;
  }
  EXPECT_GT(count, 15u);
}

INSTANTIATE_TEST_SUITE_P(Forms, PastedCode, testing::ValuesIn(test::forms()),
                         [](const auto& given) { return given.param.name; });

class PastedMessage : public testing::TestWithParam<test::Form> {};

TEST_P(PastedMessage, IsRecognised) {
  size_t count = 0;
  for (const Message& message : doctor::Messages()) {
    if (message.pattern != nullptr && *message.pattern == '\0') continue;
    ++count;
    const std::string text = GetParam().write(test::asLogged(message));
    const Names names = namesIn(text);
    const auto ends = [&message](const std::string& name) {
      const std::string whole = message.text;
      return name.size() >= whole.size() &&
             name.compare(name.size() - whole.size(), whole.size(), whole) == 0;
    };
    EXPECT_TRUE(std::any_of(names.begin(), names.end(), ends)) << text;
  }
  EXPECT_GT(count, 50u);
}

INSTANTIATE_TEST_SUITE_P(Forms, PastedMessage, testing::ValuesIn(test::formsOfMessages()),
                         [](const auto& given) { return given.param.name; });

TEST(Explain, NamesTheCodeAndNotThePlainErrorWithIt) {
  EXPECT_EQ(namesIn(R"({"error":"invalid_client","error_description":"AADSTS7000215: x"})"),
            Names{"AADSTS7000215"});
  EXPECT_EQ(
      namesIn(R"({"error":"invalid_grant","error_description":"AADSTS70002: Error validating )"
              R"(credentials. AADSTS70008: The code is expired."})"),
      (Names{"AADSTS70002", "AADSTS70008"}));
}

TEST(Explain, GivesTheCodesAloneToo) {
  const auto codes = doctor::CodesOf("error=invalid_grant&error_description=AADSTS54005%3a+x");
  ASSERT_EQ(codes.size(), 1u);
  EXPECT_STREQ(codes[0]->name, "AADSTS54005");
  EXPECT_EQ(codes[0]->secret, doctor::SecretVerdict::kUnknown);
  EXPECT_TRUE(doctor::CodesOf("id_token expired.").empty());
}

TEST(Explain, ReadsANumberAcrossALineBreakOnlyIfItGoesOn) {
  EXPECT_EQ(namesIn("AADSTS7000\r\n215: Invalid client secret"), Names{"AADSTS7000215"});
  EXPECT_EQ(namesIn("AADSTS70002\n  15: Invalid client secret"), Names{"AADSTS7000215"});
  EXPECT_EQ(namesIn("AADSTS50011\n2 November, 10:15"), Names{"AADSTS50011"});
  EXPECT_EQ(namesIn("CWOAU\n0061E: no such client"), Names{"CWOAU0061E"});
}

TEST(Explain, KnowsTheAlgorithmsThatATokenNames) {
  for (const char* name : {"none", "RS256", "HS512", "PS384", "ES256K", "EdDSA", "hs256"}) {
    EXPECT_EQ(namesIn(std::string(name) + " algorithm is not supported"),
              Names{"... algorithm is not supported"});
  }
}

TEST(Explain, RecognisesNothingElse) {
  const Names texts = test::unrelatedTexts();
  EXPECT_GE(texts.size(), 50u);
  for (const std::string& text : texts) EXPECT_EQ(namesIn(text), Names{}) << text;
}

// --- no secret

TEST(Explain, RepeatsNothingOfTheText) {
  const std::string secret = "Zx9~verySecret.value-42";
  for (const std::string& around :
       {"client_secret=" + secret + "&error=invalid_client",
        "AADSTS7000215: Invalid client secret provided: " + secret,
        "AADSTS" + secret + " AADSTS50011" + secret, "CWOAU0024E: client " + secret,
        "Profile '" + secret + "' not support", "request token uri " + secret + ".",
        "code=" + secret + " sign-in failed: id_token expired. " + secret}) {
    for (const bool json : {false, true}) {
      testing::internal::CaptureStdout();
      EXPECT_EQ(doctor::RunExplain(around, json), 0) << around;
      const std::string out = testing::internal::GetCapturedStdout();
      EXPECT_GT(out.size(), 40u);
      EXPECT_EQ(out.find(secret.substr(0, 4)), std::string::npos) << out;
      EXPECT_EQ(out.find("verySecret"), std::string::npos) << out;
    }
  }
}

// --- the program

std::string run(const std::string& command, int& status) {
  FILE* const pipe = popen((command + " 2>&1").c_str(), "r");
  std::string out;
  std::array<char, 4096> piece;
  for (size_t n; (n = fread(piece.data(), 1, piece.size(), pipe)) > 0;) out.append(piece.data(), n);
  status = WEXITSTATUS(pclose(pipe));
  return out;
}

TEST(Program, ExplainsAnArgumentOrItsInput) {
  int status = -1;
  const std::string doctor = DOCTOR;
  EXPECT_NE(run(doctor + " --explain 'AADSTS50105: x'", status).find("Users and groups"),
            std::string::npos);
  EXPECT_EQ(status, 0);
  const std::string out =
      run("printf 'a\\nCWOAU0061E: x\\n' | " + doctor + " --explain - --json", status);
  EXPECT_NE(out.find("\"name\" : \"CWOAU0061E\""), std::string::npos) << out;
  EXPECT_EQ(status, 0);
  EXPECT_EQ(run(doctor + " --explain 'all is well'", status).rfind("No known code", 0), 0u);
  EXPECT_EQ(status, 1);
  run(doctor + " --explain ''", status);
  EXPECT_EQ(status, 1);
}

TEST(Program, ReadsALongTextInTime) {
  int status = -1;
  run("head -c 5000000 /dev/zero | tr '\\0' '<' | timeout 20 " + std::string(DOCTOR) +
          " --explain -",
      status);
  EXPECT_EQ(status, 1);
}

// --- docs/messages.md

const char* heading(MessageGroup group) {
  switch (group) {
    case MessageGroup::kBefore:
      return "### Before the provider is asked";
    case MessageGroup::kTokenEndpoint:
      return "### The answer of the token endpoint";
    case MessageGroup::kIdToken:
      return "### The ID token";
    case MessageGroup::kUser:
      return "### The user";
    case MessageGroup::kProgram:
      return "### Mistakes of the calling program";
    case MessageGroup::kLog:
      return "## Log lines";
    case MessageGroup::kGuard:
      return "### The privilege guard";
    case MessageGroup::kOther:
      break;
  }
  return "## Texts of other libraries";
}

std::string table(MessageGroup group) {
  const char* second = group == MessageGroup::kLog     ? "Unit"
                       : group == MessageGroup::kGuard ? "Priority"
                       : group == MessageGroup::kOther ? "From"
                                                       : "Class";
  const bool plain = group == MessageGroup::kOther;
  std::string out = std::string("| Text | ") + second + " | Cause | Remedy |\n|---|---|---|---|\n";
  for (const Message& row : doctor::Messages()) {
    if (row.group != group) continue;
    out += "| " + (row.shown != nullptr ? row.shown : "`" + std::string(row.text) + "`") + " | " +
           (plain ? row.where : "`" + std::string(row.where) + "`") + " | " + row.cause + " | " +
           row.remedy + " |\n";
  }
  return out;
}

const char* heading(CodeSource source) {
  if (source == CodeSource::kEntra) return "### Microsoft Entra ID";
  return source == CodeSource::kLiberty ? "### WebSphere Liberty" : "### OAuth 2.0";
}

std::string table(CodeSource source) {
  std::string out =
      "| Code | Met at | Meaning | What to do | Client secret |\n|---|---|---|---|---|\n";
  for (const Code& code : doctor::Codes()) {
    if (code.source != source) continue;
    const bool refused = code.secret == doctor::SecretVerdict::kRefused;
    out += "| `" + std::string(code.name) + "` | " + doctor::PlacesOf(code.met) + " | " +
           code.meaning + " | " + code.action + " | " + (refused ? "refused" : "") + " |\n";
  }
  return out;
}

// Each heading of the document with the table that belongs under it.
std::vector<std::pair<std::string, std::string>> tables() {
  std::vector<std::pair<std::string, std::string>> all;
  for (const MessageGroup group :
       {MessageGroup::kBefore, MessageGroup::kTokenEndpoint, MessageGroup::kIdToken,
        MessageGroup::kUser, MessageGroup::kProgram, MessageGroup::kLog, MessageGroup::kGuard,
        MessageGroup::kOther}) {
    all.emplace_back(heading(group), table(group));
  }
  for (const CodeSource source : {CodeSource::kEntra, CodeSource::kLiberty, CodeSource::kOAuth}) {
    all.emplace_back(heading(source), table(source));
  }
  return all;
}

// The page with its tables replaced by those of the program.
std::string withTables(std::string page) {
  for (const auto& [title, rows] : tables()) {
    const size_t begin = page.find("\n|", page.find("\n" + title + "\n"));
    if (begin == std::string::npos) return "no table under '" + title + "'";
    size_t end = begin + 1;
    while (end < page.size() && page[end] == '|') end = page.find('\n', end) + 1;
    page.replace(begin + 1, end - begin - 1, rows);
  }
  return page;
}

const std::string kPage = SOURCE_DIR "/docs/messages.md";

std::string contents(const std::string& path) {
  std::ostringstream text;
  text << std::ifstream(path, std::ios::binary).rdbuf();
  return text.str();
}

// After a change of the table: the same program with --gtest_also_run_disabled_tests and
// --gtest_filter='*WriteTheTables' writes them into the document.
TEST(Messages, HaveTheTablesOfTheProgram) {
  const std::string page = contents(kPage);
  EXPECT_GT(page.size(), 20000u);
  EXPECT_EQ(page, withTables(page)) << "see the comment at this test";
}

TEST(Messages, DISABLED_WriteTheTables) {
  const std::string page = withTables(contents(kPage));
  ASSERT_EQ(page.rfind("# Messages", 0), 0u) << page;
  std::ofstream(kPage, std::ios::binary) << page;
}

}  // namespace
