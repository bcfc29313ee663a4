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

// Programs have the constants compiled in: arrays of just these characters.
template <std::size_t N, std::size_t M>
void expectConstant(const char (&constant)[N], const char (&value)[M]) {
  EXPECT_STREQ(constant, value);
  EXPECT_EQ(N, M) << value;
}

static_assert(std::is_same_v<decltype(kSupportedProfiles), const char* const[2]>);

TEST(SharedKeys, HaveTheNamesOfTheProfileFile) {
  expectConstant(kProfilePath, "/usr/qova/etc/ssoclient/profile.conf");
  expectConstant(kAzureProfile, "azure");
  expectConstant(kWebSphereProfile, "websphere");
  expectConstant(kEnableKey, "sso_enable");
  expectConstant(kProfileKey, "sso_profile");
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
  expectConstant(azure::kResponseType, "response_type");
  expectConstant(azure::kScope, "scope");
  expectConstant(azure::kRedirectURI, "redirect_uri");
  expectConstant(azure::kClientID, "client_id");
  expectConstant(azure::kNonce, "nonce");
  expectConstant(azure::kState, "state");
  expectConstant(azure::kGrantType, "grant_type");
  expectConstant(azure::kCode, "code");
  expectConstant(azure::kClientSecret, "client_secret");
  expectConstant(azure::kTokenType, "token_type");
  expectConstant(azure::kExpiresIn, "expires_in");
  expectConstant(azure::kExtExpiresIn, "ext_expires_in");
  expectConstant(azure::kExpiresOn, "expires_on");
  expectConstant(azure::kAccessToken, "access_token");
  expectConstant(azure::kRefreshToken, "refresh_token");
  expectConstant(azure::kIDToken, "id_token");
  expectConstant(azure::kStateAnswer, "state");
  expectConstant(azure::kPostLogoutRedirectURI, "post_logout_redirect_uri");
  expectConstant(azure::kError, "error");
  expectConstant(azure::kErrorDescription, "error_description");
  expectConstant(azure::kErrorCodes, "error_codes");
  expectConstant(azure::kTimestamp, "timestamp");
  expectConstant(azure::kTraceID, "trace_id");
  expectConstant(azure::kCorrelationID, "correlation_id");
  expectConstant(azure::kInvalidRequest, "invalid_request");
  expectConstant(azure::kInvalidGrant, "invalid_grant");
  expectConstant(azure::kUnauthorizedClient, "unauthorized_client");
  expectConstant(azure::kInvalidClient, "invalid_client");
  expectConstant(azure::kUnsupportedGrantType, "unsupported_grant_type");
  expectConstant(azure::kInvalidResource, "invalid_resource");
  expectConstant(azure::kInteractionRequired, "interaction_required");
  expectConstant(azure::kTemporarilyUnavailable, "temporarily_unavailable");
}

TEST(SharedKeys, HaveTheNamesOfWebSpheresProtocol) {
  expectConstant(websphere::kScope, "scope");
  expectConstant(websphere::kResponseType, "response_type");
  expectConstant(websphere::kClientID, "client_id");
  expectConstant(websphere::kRedirectURI, "redirect_uri");
  expectConstant(websphere::kState, "state");
  expectConstant(websphere::kNonce, "nonce");
  expectConstant(websphere::kAccessToken, "access_token");
  expectConstant(websphere::kTokenType, "token_type");
  expectConstant(websphere::kIDToken, "id_token");
  expectConstant(websphere::kStateAnswer, "state");
  expectConstant(websphere::kExpiresIn, "expires_in");
  expectConstant(websphere::kRefreshToken, "refresh_token");
  expectConstant(websphere::kGrantType, "grant_type");
  expectConstant(websphere::kCode, "code");
  expectConstant(websphere::kClientSecret, "client_secret");
}

}  // namespace
