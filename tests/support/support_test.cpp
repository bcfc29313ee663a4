// The test support itself: what other tests rely on, shown once through the library's own entry
// points.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <iostream>

#include "sso/azuresso.h"
#include "sso/utils.h"
#include "support/ca.h"
#include "support/device.h"
#include "support/log.h"
#include "support/provider.h"
#include "support/tokens.h"

namespace {

using namespace QOVA::SSO;

unsigned append(void* data, unsigned size, unsigned count, void* userData) {
  static_cast<std::string*>(userData)->append(static_cast<char*>(data), size * count);
  return size * count;
}

std::string get(const std::string& url, bool verifySSL = true) {
  std::string response;
  httpGet(url, response, verifySSL, append);
  return response;
}

TEST(Support, ProviderAnswersByPathAndRemembersRequests) {
  test::Provider provider;
  provider.answer("/a", test::ok("first")).answer("/a", test::failed(500, "second"));
  provider.start();
  EXPECT_EQ(get(provider.url("/a?x=1")), "first");
  EXPECT_EQ(get(provider.url("/a")), "second");
  EXPECT_EQ(get(provider.url("/a")), "second");
  EXPECT_EQ(get(provider.url("/b")), "");
  std::string response;
  httpPost(provider.url("/a"), "x=1", response, true, append);
  const auto requests = provider.requests();
  ASSERT_EQ(requests.size(), 5u);
  EXPECT_EQ(requests[0].method, "GET");
  EXPECT_EQ(requests[0].target, "/a?x=1");
  EXPECT_EQ(requests[0].header("host"), "localhost:" + std::to_string(provider.port()));
  EXPECT_EQ(requests[4].method, "POST");
  EXPECT_EQ(requests[4].body, "x=1");
}

TEST(Support, ProviderSpeaksTlsUnderATrustedAuthority) {
  test::Ca ca;
  ca.trust();
  test::Provider provider(ca.issue({"localhost"}));
  provider.answer("/", test::ok("safe")).start();
  EXPECT_EQ(get(provider.url("/")), "safe");
}

TEST(Support, LogShowsPriorityTextAndErrno) {
  test::Log log;
  test::writeConfig("azure.conf", "{}");
  test::asProcess({1000, 1000, 1000}, [&] {
    AzureSSOClient client;
    ASSERT_EQ(log.lines().size(), 2u);
    EXPECT_EQ(log.lines()[1].error, EPERM);
    EXPECT_TRUE(log.is({{LOG_AUTH | LOG_ERR, "azuresso.cpp",
                         "ERROR: setresgid(-1, 0, -1) [Operation not permitted]"},
                        {LOG_AUTH | LOG_ERR, "azuresso.cpp", "ERROR: ENTERCriticalSection"}}));
    EXPECT_FALSE(log.is({}));
  });
}

TEST(Support, ConfigurationFilesHaveTheModeAndOwnerGiven) {
  test::writeConfig("azure.conf", "{}", 0640, 12, 34);
  struct stat found;
  ASSERT_EQ(stat(test::configPath("azure.conf").c_str(), &found), 0);
  EXPECT_EQ(found.st_mode & 07777, 0640u);
  EXPECT_EQ(found.st_uid, 12u);
  EXPECT_EQ(found.st_gid, 34u);
  test::removeConfig("azure.conf");
  EXPECT_NE(stat(test::configPath("azure.conf").c_str(), &found), 0);
}

TEST(Support, StandardOutputIsCaptured) {
  EXPECT_EQ(test::stdoutOf([] { std::cout << "Location: x\n\n"; }), "Location: x\n\n");
}

TEST(Support, ChildProcessesBringBackTheirResult) {
  EXPECT_EQ(test::asProcess({1, 2, 3}, {4, 5, 6},
                            [] {
                              uid_t r, e, s;
                              getresuid(&r, &e, &s);
                              return std::to_string(r * 100 + e * 10 + s) + "\n";
                            }),
            "123\n");
}

TEST(Support, Base64GoesBothWays) {
  for (const std::string text : {"", "f", "fo", "foo", "\xfb\xff\xfe"}) {
    EXPECT_EQ(test::fromBase64(test::base64(text)), text);
    EXPECT_EQ(test::fromBase64(test::base64url(text)), text);
  }
  EXPECT_EQ(test::base64url("\xfb\xff\xfe?"), "-__-Pw");
  EXPECT_EQ(test::base64("\xfb\xff\xfe?"), "+//+Pw==");
}

}  // namespace
