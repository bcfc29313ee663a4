// The exception classes: who catches whom.
#include <gtest/gtest.h>

#include <stdexcept>
#include <type_traits>

#include "sso/sso.h"
#include "sso/utils.h"

namespace {

using namespace QOVA::SSO;
using namespace QOVA::JWT;

template <typename Error>
class Message : public testing::Test {};
using AllErrors = testing::Types<sso_exception, sso_err_resp, sso_op_failed, sso_not_implemented,
                                 jwt_exception, jwt_not_support, jwt_verify_failed>;
TYPED_TEST_SUITE(Message, AllErrors);

TYPED_TEST(Message, IsCarriedAsItWasGiven) {
  try {
    throw TypeParam("parse json falied");
  } catch (const std::runtime_error& e) {
    EXPECT_STREQ(e.what(), "parse json falied");
    EXPECT_TRUE(typeid(e) == typeid(TypeParam));
  }
}

TYPED_TEST(Message, IsTheOnlyState) {
  EXPECT_EQ(sizeof(TypeParam), sizeof(std::runtime_error));
}

TEST(Errors, EachFamilyHasOneRoot) {
  EXPECT_TRUE((std::is_base_of_v<sso_exception, sso_err_resp>));
  EXPECT_TRUE((std::is_base_of_v<sso_exception, sso_op_failed>));
  EXPECT_TRUE((std::is_base_of_v<sso_exception, sso_not_implemented>));
  EXPECT_TRUE((std::is_base_of_v<jwt_exception, jwt_not_support>));
  EXPECT_TRUE((std::is_base_of_v<jwt_exception, jwt_verify_failed>));
  EXPECT_FALSE((std::is_base_of_v<sso_err_resp, sso_op_failed>));
}

TEST(Errors, TheFamiliesMeetOnlyInTheStandardRoot) {
  EXPECT_TRUE((std::is_base_of_v<std::runtime_error, sso_exception>));
  EXPECT_TRUE((std::is_base_of_v<std::runtime_error, jwt_exception>));
  EXPECT_FALSE((std::is_base_of_v<sso_exception, jwt_exception>));
  EXPECT_THROW(
      {
        try {
          throw jwt_verify_failed("x");
        } catch (const sso_exception&) {
        }
      },
      jwt_verify_failed);
}

// Thrown inside the library, caught here by type: the type identities are exported.
TEST(Errors, AreCaughtAcrossTheLibraryBoundary) {
  SSOClient client;
  EXPECT_THROW(client.VerifyIDToken(), sso_not_implemented);
  EXPECT_THROW(client.VerifyIDToken(), sso_exception);
}

TEST(SharedKeys, HaveTheNamesOfTheProfileFile) {
  EXPECT_STREQ(kEnableKey, "sso_enable");
  EXPECT_STREQ(kProfileKey, "sso_profile");
  ASSERT_EQ(std::size(kSupportedProfiles), 2u);
  EXPECT_STREQ(kSupportedProfiles[0], "azure");
  EXPECT_STREQ(kSupportedProfiles[1], "websphere");
}

}  // namespace
