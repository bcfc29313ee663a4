// The documents against the sources: no text, key, finding or option is missing in them, and
// nothing in them is obsolete.
#include <gtest/gtest.h>

#include <cctype>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <regex>
#include <set>
#include <sstream>
#include <string>
#include <vector>

namespace {

namespace fs = std::filesystem;
using Texts = std::set<std::string>;

const fs::path kRoot = SOURCE_DIR;

std::string contents(const fs::path& path) {
  std::ostringstream text;
  text << std::ifstream(path, std::ios::binary).rdbuf();
  EXPECT_FALSE(text.str().empty()) << path;
  return text.str();
}

// The string literals of a C++ source; neighbours are joined, comments left out.
class Literals {
 public:
  explicit Literals(std::string code) : text(std::move(code)) {
    while (at < text.size()) step();
    finish();
  }
  Texts found;

 private:
  void step() {
    if (text.compare(at, 2, "//") == 0) {
      at = std::min(text.find('\n', at), text.size());
    } else if (text.compare(at, 2, "/*") == 0) {
      at = text.find("*/", at) + 2;
    } else if (text.compare(at, 3, "R\"(") == 0) {
      const size_t end = text.find(")\"", at);
      add(text.substr(at + 3, end - at - 3));
      at = end + 2;
    } else if (text[at] == '"') {
      add(quoted('"'));
    } else if (text[at] == '\'' && (at == 0 || std::isalnum(byte(at - 1)) == 0)) {
      quoted('\'');
      finish();
    } else {
      if (std::isspace(byte(at)) == 0) finish();
      ++at;
    }
  }

  unsigned char byte(size_t i) const { return static_cast<unsigned char>(text[i]); }

  std::string quoted(char quote) {
    std::string value;
    for (++at; at < text.size() && text[at] != quote; ++at) {
      if (text[at] == '\\') ++at;
      value += text[at];
    }
    ++at;
    return value;
  }

  void add(const std::string& piece) {
    joined += piece;
    open = true;
  }
  void finish() {
    if (open) found.insert(joined);
    joined.clear();
    open = false;
  }

  const std::string text;
  size_t at = 0;
  std::string joined;
  bool open = false;
};

Texts literalsOf(const fs::path& folder) {
  Texts all;
  for (const auto& entry : fs::recursive_directory_iterator(folder)) {
    const std::string kind = entry.path().extension();
    if (kind == ".cpp" || kind == ".h") all.merge(Literals(contents(entry.path())).found);
  }
  return all;
}

Texts matches(const std::string& text, const std::string& pattern) {
  Texts found;
  const std::regex expression(pattern);
  for (std::sregex_iterator i(text.begin(), text.end(), expression), end; i != end; ++i) {
    found.insert((*i)[1].str());
  }
  return found;
}

std::string section(const std::string& text, const std::string& from, const std::string& to) {
  const size_t begin = text.find(from);
  const size_t end = text.find(to, begin);
  EXPECT_NE(begin, std::string::npos) << from;
  EXPECT_NE(end, std::string::npos) << to;
  return text.substr(begin, end - begin);
}

// What the library throws or logs: its literals with a blank in them, without "file:line".
Texts libraryTexts() {
  const Texts none = {"openid profile email", "Location: ", "%s"};
  Texts texts;
  for (std::string literal : literalsOf(kRoot / "sso")) {
    if (literal.find(' ') == std::string::npos) continue;
    if (literal.rfind("%s:%d ", 0) == 0) literal.erase(0, 6);
    if (none.count(literal) == 0) texts.insert(literal);
  }
  return texts;
}

TEST(Literals, AreReadAsACompilerDoes) {
  const Literals literals(
      "#include \"a.h\"\n// \"no\"\n/* \"no\" */ f(\"one \" /* x */ \"two\", '\"', \"th\\\"ree\");"
      "const int n = 1'000; g(R\"(raw \"text\")\");");
  EXPECT_EQ(literals.found, (Texts{"a.h", "one two", "th\"ree", "raw \"text\""}));
}

// Relative links of a document, without their anchors.
Texts links(const fs::path& document) {
  return matches(contents(document), R"(\]\(([^):#]+)(#[^)]*)?\))");
}

TEST(Documents, LinkOnlyToWhatIsInstalledWithThem) {
  const std::string list = contents(kRoot / "docs/CMakeLists.txt");
  const Texts installed = matches(list, R"(([\w-]+\.md))");
  EXPECT_GT(installed.size(), 4u);
  for (const std::string& name : installed) {
    for (const std::string& link : links(kRoot / "docs" / name)) {
      EXPECT_TRUE(installed.count(link) == 1 || link.rfind("pictures/", 0) == 0)
          << name << " links to " << link;
      EXPECT_TRUE(fs::exists(kRoot / "docs" / link)) << name << " links to " << link;
    }
  }
}

TEST(Documents, ReadmeShowsTheLoginProgram) {
  const std::string source = contents(kRoot / "device/login/signin.cpp");
  std::string shown = section(contents(kRoot / "README.md"), "```cpp\n", "\n```\n").substr(7);
  EXPECT_NE(shown.find("VerifyIDToken"), std::string::npos);
  const size_t middle = shown.find("\n\ntemplate");
  ASSERT_NE(middle, std::string::npos);
  EXPECT_NE(source.find(shown.substr(0, middle)), std::string::npos);
  EXPECT_NE(source.find(shown.substr(middle + 2)), std::string::npos);
}

TEST(Messages, HoldEveryTextOfTheLibrary) {
  const std::string page = contents(kRoot / "docs/messages.md");
  const Texts texts = libraryTexts();
  EXPECT_GT(texts.size(), 40u);
  EXPECT_EQ(texts.count("parse json falied"), 1u);
  EXPECT_EQ(texts.count("request token uri %s."), 1u);
  for (const std::string& text : texts) {
    EXPECT_NE(page.find("`" + text + "`"), std::string::npos) << text << " is not in messages.md";
  }
}

TEST(Messages, HoldNoTextThatTheLibraryDoesNotHave) {
  const std::string page = contents(kRoot / "docs/messages.md");
  const std::string own = section(page, "## Exceptions", "## Texts of other libraries");
  const Texts texts = libraryTexts();
  const Texts rows = matches(own, "\n\\| `([^`]+)` \\|");
  EXPECT_GT(rows.size(), 40u);
  for (const std::string& row : rows) EXPECT_EQ(texts.count(row), 1u) << row;
}

TEST(Configuration, HoldsEveryKey) {
  const std::string guide = contents(kRoot / "docs/configuration.md");
  const std::string page = contents(kRoot / "docs/man/ssoclient.5");
  const std::regex key("(azure|websphere|sso)_[a-z_]+");
  size_t count = 0;
  for (const std::string& literal : literalsOf(kRoot / "sso")) {
    if (!std::regex_match(literal, key)) continue;
    ++count;
    EXPECT_NE(guide.find("| `" + literal + "` |"), std::string::npos) << literal;
    EXPECT_NE(page.find(".It Cm " + literal + " "), std::string::npos) << literal;
  }
  EXPECT_EQ(count, 18u);
}

TEST(Configuration, HasExamplesOfEveryKeyInTheManualPage) {
  const std::string page = contents(kRoot / "docs/man/ssoclient.5");
  Texts keys;
  for (const char* name : {"profile.conf", "azure.conf", "websphere.conf"}) {
    const std::string example = contents(kRoot / "docs/examples" / name);
    EXPECT_NE(page.find("\n" + example + ".Ed\n"), std::string::npos) << name;
    keys.merge(matches(example, "\"([a-z_]+)\": "));
  }
  EXPECT_EQ(keys.size(), 18u);
  for (const std::string& key : keys) {
    EXPECT_NE(page.find(".It Cm " + key + " "), std::string::npos) << key;
  }
}

// --- the doctor

Texts documentedFindings() {
  const std::string page = contents(kRoot / "docs/man/ssoclient-doctor.8");
  return matches(section(page, ".Sh DIAGNOSTICS", ".Sh SEE ALSO"), "\\b([a-z]+(?:-[a-z0-9]+)+)\\b");
}

TEST(DoctorPage, HoldsEveryFinding) {
  // Findings that are in order, options, and other words with a hyphen.
  const Texts others = {"offline",
                        "try-secret",
                        "secret-accepted",
                        "token-endpoint",
                        "token-expiry",
                        "token-key",
                        "token-name",
                        "token-accepted",
                        "ssoclient-doctor",
                        "www-data",
                        "authorization-endpoint",
                        "date",
                        "www-authenticate",
                        "openid-configuration"};
  const Texts documented = documentedFindings();
  const std::regex id("[a-z]+(-[a-z0-9]+)+");
  size_t count = 0;
  for (const std::string& literal : literalsOf(kRoot / "doctor")) {
    if (!std::regex_match(literal, id) || others.count(literal) > 0) continue;
    ++count;
    EXPECT_EQ(documented.count(literal), 1u) << literal << " is not in ssoclient-doctor(8)";
  }
  EXPECT_EQ(count, documented.size());
}

TEST(DoctorPage, HoldsNoFindingThatIsNotSeeded) {
  Texts seeded;
  for (const auto& entry : fs::directory_iterator(kRoot / "tests/doctor")) {
    const std::string name = entry.path().filename();
    if (name.find("_faults.cpp") != std::string::npos) {
      seeded.merge(Literals(contents(entry.path())).found);
    }
  }
  for (const std::string& id : documentedFindings()) {
    EXPECT_EQ(seeded.count(id), 1u) << id << " is not seeded in tests/doctor/*_faults.cpp";
  }
}

TEST(DoctorPage, HoldsTheOptionsOfTheHelp) {
  const std::string page = contents(kRoot / "docs/man/ssoclient-doctor.8");
  const Texts helped = matches(contents(kRoot / "doctor/options.cpp"), "\n  (?:-h, )?--([a-z-]+)");
  EXPECT_EQ(helped.size(), 12u);
  EXPECT_EQ(matches(page, "\n\\.It Fl (?:h , )?-([a-z-]+)"), helped);
}

// --- form

std::string outputOf(const std::string& command) {
  FILE* const pipe = popen((command + " 2>&1").c_str(), "r");
  std::string text;
  char piece[4096];
  for (size_t n; (n = fread(piece, 1, sizeof piece, pipe)) > 0;) text.append(piece, n);
  const int status = pclose(pipe);
  return text + (status == 0 ? "" : "status " + std::to_string(status));
}

TEST(ManualPages, AreCleanForMandoc) {
  size_t count = 0;
  for (const auto& entry : fs::directory_iterator(kRoot / "docs/man")) {
    ++count;
    EXPECT_EQ(outputOf("mandoc -T lint -W warning " + entry.path().string()), "");
  }
  EXPECT_EQ(count, 3u);
}

TEST(Documents, LinkToFilesThatExist) {
  size_t count = 0;
  for (const char* folder : {"", "docs", "platform", "device", "lab/fuzz", "lab/bench"}) {
    for (const auto& entry : fs::directory_iterator(kRoot / folder)) {
      if (entry.path().extension() != ".md") continue;
      for (const std::string& link : matches(contents(entry.path()), "\\]\\(([^)#:]+)\\)")) {
        ++count;
        EXPECT_TRUE(fs::exists(entry.path().parent_path() / link)) << entry.path() << ": " << link;
      }
    }
  }
  EXPECT_GT(count, 5u);
}

}  // namespace
