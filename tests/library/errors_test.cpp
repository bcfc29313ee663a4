// The exception classes: who catches whom.
#include <gtest/gtest.h>

#include <stdexcept>
#include <type_traits>

#include "sso/azuresso.h"
#include "sso/sso.h"
#include "sso/utils.h"
#include "sso/webspheresso.h"

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

template <typename Caught>
testing::AssertionResult catches(void (*raise)()) {
  try {
    raise();
  } catch (const Caught&) {
    return testing::AssertionSuccess();
  } catch (...) {
    return testing::AssertionFailure();
  }
  return testing::AssertionFailure() << "nothing was thrown";
}

TEST(Errors, AreCaughtByTheirFamilyAndNoOther) {
  void (*const family[])() = {[] { throw sso_exception("x"); }, [] { throw sso_err_resp("x"); },
                              [] { throw sso_op_failed("x"); },
                              [] { throw sso_not_implemented("x"); }};
  for (const auto raise : family) {
    EXPECT_TRUE(catches<sso_exception>(raise));
    EXPECT_TRUE(catches<std::runtime_error>(raise));
    EXPECT_FALSE(catches<jwt_exception>(raise));
  }
  EXPECT_FALSE(catches<sso_err_resp>(family[0]));
  EXPECT_FALSE(catches<sso_err_resp>(family[2]));
  EXPECT_FALSE(catches<sso_op_failed>(family[1]));
  EXPECT_FALSE(catches<sso_not_implemented>(family[2]));
  EXPECT_TRUE(catches<jwt_exception>([] { throw jwt_not_support("x"); }));
  EXPECT_TRUE(catches<jwt_exception>([] { throw jwt_verify_failed("x"); }));
}

// RFC 6749 and the providers' documents.
TEST(SharedKeys, HaveTheNamesOfAzuresProtocol) {
  EXPECT_STREQ(azure::kResponseType, "response_type");
  EXPECT_STREQ(azure::kScope, "scope");
  EXPECT_STREQ(azure::kRedirectURI, "redirect_uri");
  EXPECT_STREQ(azure::kClientID, "client_id");
  EXPECT_STREQ(azure::kNonce, "nonce");
  EXPECT_STREQ(azure::kState, "state");
  EXPECT_STREQ(azure::kGrantType, "grant_type");
  EXPECT_STREQ(azure::kCode, "code");
  EXPECT_STREQ(azure::kClientSecret, "client_secret");
  EXPECT_STREQ(azure::kTokenType, "token_type");
  EXPECT_STREQ(azure::kExpiresIn, "expires_in");
  EXPECT_STREQ(azure::kExtExpiresIn, "ext_expires_in");
  EXPECT_STREQ(azure::kExpiresOn, "expires_on");
  EXPECT_STREQ(azure::kAccessToken, "access_token");
  EXPECT_STREQ(azure::kRefreshToken, "refresh_token");
  EXPECT_STREQ(azure::kIDToken, "id_token");
  EXPECT_STREQ(azure::kStateAnswer, "state");
  EXPECT_STREQ(azure::kPostLogoutRedirectURI, "post_logout_redirect_uri");
  EXPECT_STREQ(azure::kError, "error");
  EXPECT_STREQ(azure::kErrorDescription, "error_description");
  EXPECT_STREQ(azure::kErrorCodes, "error_codes");
  EXPECT_STREQ(azure::kTimestamp, "timestamp");
  EXPECT_STREQ(azure::kTraceID, "trace_id");
  EXPECT_STREQ(azure::kCorrelationID, "correlation_id");
  EXPECT_STREQ(azure::kInvalidRequest, "invalid_request");
  EXPECT_STREQ(azure::kInvalidGrant, "invalid_grant");
  EXPECT_STREQ(azure::kUnauthorizedClient, "unauthorized_client");
  EXPECT_STREQ(azure::kInvalidClient, "invalid_client");
  EXPECT_STREQ(azure::kUnsupportedGrantType, "unsupported_grant_type");
  EXPECT_STREQ(azure::kInvalidResource, "invalid_resource");
  EXPECT_STREQ(azure::kInteractionRequired, "interaction_required");
  EXPECT_STREQ(azure::kTemporarilyUnavailable, "temporarily_unavailable");
}

TEST(SharedKeys, HaveTheNamesOfWebSpheresProtocol) {
  EXPECT_STREQ(websphere::kScope, "scope");
  EXPECT_STREQ(websphere::kResponseType, "response_type");
  EXPECT_STREQ(websphere::kClientID, "client_id");
  EXPECT_STREQ(websphere::kRedirectURI, "redirect_uri");
  EXPECT_STREQ(websphere::kState, "state");
  EXPECT_STREQ(websphere::kNonce, "nonce");
  EXPECT_STREQ(websphere::kAccessToken, "access_token");
  EXPECT_STREQ(websphere::kTokenType, "token_type");
  EXPECT_STREQ(websphere::kIDToken, "id_token");
  EXPECT_STREQ(websphere::kStateAnswer, "state");
  EXPECT_STREQ(websphere::kExpiresIn, "expires_in");
  EXPECT_STREQ(websphere::kRefreshToken, "refresh_token");
  EXPECT_STREQ(websphere::kGrantType, "grant_type");
  EXPECT_STREQ(websphere::kCode, "code");
  EXPECT_STREQ(websphere::kClientSecret, "client_secret");
}

}  // namespace
