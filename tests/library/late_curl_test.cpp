// When libcurl comes into a process, which one, and what happens without one.
#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>

#include "support/provider.h"

namespace {

namespace fs = std::filesystem;

// What the probe says, with `environment` ("NAME=value NAME=value") set for it.
std::string probe(const std::string& environment, const std::string& arguments) {
  // A preloaded library comes before the address check's own.
  const std::string command = "env ASAN_OPTIONS=verify_asan_link_order=0 " + environment +
                              " " PROBE " " + arguments + " 2>&1";
  FILE* const pipe = popen(command.c_str(), "r");
  std::string text;
  char chunk[4096];
  while (pipe != nullptr && std::fgets(chunk, sizeof chunk, pipe) != nullptr) text += chunk;
  EXPECT_EQ(pclose(pipe), 0) << text;
  return text;
}

// A folder with a libcurl.so.4 of our own, for this test.
class Folder {
 public:
  Folder() {
    char name[] = "/tmp/libcurl-XXXXXX";
    path = mkdtemp(name);
  }
  ~Folder() { fs::remove_all(path); }
  Folder(const Folder&) = delete;
  Folder& operator=(const Folder&) = delete;

  std::string library() const { return path / "libcurl.so.4"; }
  // Before the folders of this run, where there are any: a library that is measured is there.
  std::string variable() const {
    const char* const others = std::getenv("LD_LIBRARY_PATH");
    return "LD_LIBRARY_PATH=" + path.string() + (others != nullptr ? ":" : "") +
           (others != nullptr ? others : "");
  }

 private:
  fs::path path;
};

#ifdef LATE_CURL

const char kNowhere[] = "http://127.0.0.1:1/";

TEST(LateCurl, IsLoadedByTheFirstRequestAndStays) {
  test::Provider provider;
  provider.answer("/a", test::ok("first"));
  provider.answer("/b", test::ok("second"));
  provider.start();
  EXPECT_EQ(probe("", provider.url("/a") + " " + provider.url("/b")),
            "start: not loaded\n"
            "without a request: not loaded\n"
            "answer: first\n"
            "answer: second\n"
            "end: loaded\n");
}

TEST(LateCurl, IsNotLoadedWithoutARequest) {
  EXPECT_EQ(probe("", ""),
            "start: not loaded\n"
            "without a request: not loaded\n"
            "end: not loaded\n");
}

TEST(LateCurl, MissingIsATransportFailureWithTheLoadersText) {
  Folder folder;
  std::ofstream(folder.library()) << "not a library";
  const std::string text = "sso_err_resp: " + folder.library() + ": file too short\n";
  EXPECT_EQ(probe(folder.variable(), std::string(kNowhere) + " " + kNowhere),
            "start: not loaded\n"
            "without a request: not loaded\n" +
                text + text + "end: not loaded\n");
}

TEST(LateCurl, LackingAFunctionIsATransportFailureWithTheLoadersText) {
  Folder folder;
  fs::copy_file(STUB_WITHOUT_TEXTS, folder.library());
  const std::string said = probe(folder.variable(), kNowhere);
  EXPECT_NE(
      said.find("sso_err_resp: " + folder.library() + ": undefined symbol: curl_easy_strerror\n"),
      std::string::npos)
      << said;
}

TEST(LateCurl, ThatTheLoaderFindsIsTaken) {
  Folder folder;
  fs::copy_file(STUB, folder.library());
  const std::string said = probe(folder.variable(), kNowhere);
  EXPECT_NE(said.find("sso_err_resp: the stub was asked\n"), std::string::npos) << said;
}

TEST(LateCurl, ThatIsPreloadedIsTaken) {
  const std::string said = probe("LD_PRELOAD=" STUB, kNowhere);
  EXPECT_NE(said.find("sso_err_resp: the stub was asked\n"), std::string::npos) << said;
  EXPECT_NE(said.find("end: not loaded\n"), std::string::npos) << said;
}

#else

TEST(OrdinaryCurl, IsThereFromTheStart) {
  EXPECT_NE(probe("", "").find("start: loaded\n"), std::string::npos);
}

#endif

}  // namespace
