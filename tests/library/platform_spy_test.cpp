// The library asks the platform that it was linked with.
#include <gtest/gtest.h>

#include "sso/utils.h"
#include "support/platform_spy.h"

namespace {

TEST(PlatformSpy, StandsBehindTheLibrary) {
  EXPECT_EQ(QOVA::SSO::URLEncode("a b"), "a%20b");
  ASSERT_EQ(test::platformSpy().urlEncode.size(), 1u);
  EXPECT_EQ(test::platformSpy().urlEncode[0].input, "a b");
}

}  // namespace
