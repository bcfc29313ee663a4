// A host program that uses libcurl itself: what the library's calls leave of the host's references
// to libcurl's process-wide state. The state is recognised by the host's own allocator, which it
// gave to libcurl with its first reference.
#include <curl/curl.h>
#include <gtest/gtest.h>
#include <json/value.h>

#include <cstdlib>
#include <cstring>

#include "sso/azuresso.h"
#include "support/log.h"

namespace {

int allocations = 0;

void* countedMalloc(size_t size) {
  ++allocations;
  return std::malloc(size);
}
void* countedCalloc(size_t count, size_t size) {
  ++allocations;
  return std::calloc(count, size);
}

void initialise() {
  ASSERT_EQ(curl_global_init_mem(CURL_GLOBAL_ALL, countedMalloc, std::free, std::realloc, strdup,
                                 countedCalloc),
            CURLE_OK);
}

// Whether libcurl's state is still the one that the host set up.
bool isTheHosts() {
  allocations = 0;
  curl_easy_cleanup(curl_easy_init());
  return allocations > 0;
}

// The call that gives up one reference more than it takes; a whole login makes it once.
void requestKeys() {
  const test::Log log;
  Json::Value keys;
  QOVA::SSO::AzureSSOClient().RequestKeysInfo("file:///missing", keys);
}

TEST(HostCurl, LosesItsStateWithASingleReference) {
  initialise();
  EXPECT_TRUE(isTheHosts());
  requestKeys();
  EXPECT_FALSE(isTheHosts());
  curl_global_cleanup();
}

TEST(HostCurl, KeepsItsStateWithASecondReference) {
  initialise();
  initialise();
  requestKeys();
  EXPECT_TRUE(isTheHosts());
  curl_global_cleanup();
}

TEST(HostCurl, HasItsStateWhenItInitialisesAfterTheLibrarysCalls) {
  requestKeys();
  initialise();
  EXPECT_TRUE(isTheHosts());
  curl_global_cleanup();
}

}  // namespace
