// The layout of the public classes: what a login program that was built against this library
// has compiled in. Each number here is a promise (docs/abi.md), for 64 and for 32 bits.
#include <cxxabi.h>
#include <gtest/gtest.h>

#include <cstddef>
#include <cstring>
#include <string>
#include <type_traits>
#include <typeinfo>

#include "sso/azuresso.h"
#include "sso/common.h"
#include "sso/jwt.h"
#include "sso/profile.h"
#include "sso/sso.h"
#include "sso/webspheresso.h"
#include "support/device.h"

using namespace QOVA::SSO;
using namespace QOVA::JWT;

namespace {

constexpr bool k64 = sizeof(void*) == 8;

// Sizes in bytes; the alignment is a pointer's for all of them.
template <typename T>
constexpr bool hasSize(std::size_t on64, std::size_t on32) {
  return sizeof(T) == (k64 ? on64 : on32) && alignof(T) == alignof(void*);
}

static_assert(hasSize<std::string>(32, 24), "another string class gives another interface");
static_assert(hasSize<SSOClient>(304, 224));
static_assert(hasSize<AzureSSOClient>(336, 248));
static_assert(hasSize<WebSphereSSOClient>(304, 224));
static_assert(hasSize<SSOProfile>(352, 256));
static_assert(hasSize<Jwt>(96, 72));
static_assert(hasSize<sso_exception>(16, 8));
static_assert(hasSize<sso_err_resp>(16, 8));
static_assert(hasSize<sso_op_failed>(16, 8));
static_assert(hasSize<sso_not_implemented>(16, 8));
static_assert(hasSize<jwt_exception>(16, 8));
static_assert(hasSize<jwt_not_support>(16, 8));
static_assert(hasSize<jwt_verify_failed>(16, 8));

// The destructor entry that the base does not have and its children do.
static_assert(std::is_polymorphic_v<SSOClient> && !std::has_virtual_destructor_v<SSOClient>);
static_assert(std::has_virtual_destructor_v<AzureSSOClient>);
static_assert(std::has_virtual_destructor_v<WebSphereSSOClient>);
static_assert(std::has_virtual_destructor_v<SSOProfile>);
static_assert(!std::is_polymorphic_v<Jwt>);

// Sees the fields that a provider client of a device's own inherits.
class Fields : public SSOClient {
 public:
  // The offset of each field, as declared, in units of a string; the flag comes before all.
  void expectOrder() const {
    const std::string* const fields[] = {&clientID,          &clientSecret,  &redirectURI,
                                         &authEndpoint,      &tokenEndpoint, &logoutEndpoint,
                                         &wellknownEndpoint, &code,          &token};
    const std::size_t first = 2 * sizeof(void*);
    std::size_t position = 0;
    EXPECT_EQ(offset(&enable), sizeof(void*));
    for (const std::string* field : fields) {
      EXPECT_EQ(offset(field), first + sizeof(std::string) * position) << "field " << position;
      ++position;
    }
  }

  static_assert(std::is_same_v<decltype(enable), bool>);

 private:
  std::size_t offset(const void* field) const {
    return static_cast<std::size_t>(static_cast<const char*>(field) -
                                    reinterpret_cast<const char*>(this));
  }
};

// The private field of that type at that place of an object.
template <typename Field>
const Field& fieldAt(const void* object, std::size_t offset) {
  return *reinterpret_cast<const Field*>(static_cast<const char*>(object) + offset);
}

// The place of a virtual operation in the table, counted from 1: a pointer to it holds that.
template <typename Member>
std::size_t slotOf(Member member) {
  std::ptrdiff_t parts[2];
  static_assert(sizeof member == sizeof parts, "not the Itanium C++ ABI");
  std::memcpy(parts, &member, sizeof parts);
  // Where functions may have odd addresses, the mark of a virtual one is in the other word.
#if defined(__arm__) || defined(__aarch64__) || defined(__mips__)
  return static_cast<std::size_t>(parts[0]) / sizeof(void*) + 1;
#else
  return static_cast<std::size_t>(parts[0] - 1) / sizeof(void*) + 1;
#endif
}

// The one base class that the library's own type information names.
template <typename T>
const std::type_info* baseOf() {
  const auto* single = dynamic_cast<const abi::__si_class_type_info*>(&typeid(T));
  return single == nullptr ? nullptr : single->__base_type;
}

template <typename T, typename Base>
void expectBase() {
  static_assert(std::is_base_of_v<Base, T>);
  ASSERT_NE(baseOf<T>(), nullptr) << typeid(T).name();
  EXPECT_TRUE(*baseOf<T>() == typeid(Base)) << typeid(T).name();
}

template <typename T>
void expectNoBase() {
  EXPECT_EQ(typeid(typeid(T)).name(), typeid(abi::__class_type_info).name()) << typeid(T).name();
}

}  // namespace

TEST(Layout, FieldsOfTheBaseClassInTheirOrder) {
  Fields().expectOrder();
}

// Private fields are found by what they hold.
TEST(Layout, FieldsOfAToken) {
  const Jwt jwt("header.body.signature");
  EXPECT_EQ(fieldAt<std::string>(&jwt, 0), "header");
  EXPECT_EQ(fieldAt<std::string>(&jwt, sizeof(std::string)), "body");
  EXPECT_EQ(fieldAt<std::string>(&jwt, 2 * sizeof(std::string)), "signature");
}

TEST(Layout, FieldOfTheAzureClient) {
  test::writeConfig("azure.conf", R"({"azure_tenant_id":"the tenant"})");
  const AzureSSOClient client;
  EXPECT_EQ(fieldAt<std::string>(&client, sizeof(SSOClient)), "the tenant");
}

TEST(Layout, FieldsOfTheProfile) {
  test::writeConfig("profile.conf", R"({"sso_enable":true, "sso_profile":"azure"})", 0644);
  SSOProfile profile;
  // First the field whose place the library gives away: a text in a wrong place cannot be read.
  ASSERT_EQ(&fieldAt<SSOClient>(&profile, 2 * sizeof(void*) + sizeof(std::string)),
            profile.GetSSOClient());
  EXPECT_TRUE(fieldAt<bool>(&profile, sizeof(void*)));
  EXPECT_EQ(fieldAt<std::string>(&profile, 2 * sizeof(void*)), "azure");
}

TEST(Layout, SlotsOfTheOperations) {
  EXPECT_EQ(slotOf(&SSOClient::isEnable), 1u);
  EXPECT_EQ(slotOf(&SSOClient::GetClientID), 2u);
  EXPECT_EQ(slotOf(&SSOClient::GetClientSecret), 3u);
  EXPECT_EQ(slotOf(&SSOClient::GetRedirectURI), 4u);
  EXPECT_EQ(slotOf(&SSOClient::GetToken), 5u);
  EXPECT_EQ(slotOf(&SSOClient::GetAuthEndpoint), 6u);
  EXPECT_EQ(slotOf(&SSOClient::GetTokenEndpoint), 7u);
  EXPECT_EQ(slotOf(&SSOClient::GetWellknownEndpoint), 8u);
  EXPECT_EQ(slotOf(&SSOClient::GetLogoutEndpoint), 9u);
  EXPECT_EQ(slotOf(&SSOClient::SetRedirectURI), 10u);
  EXPECT_EQ(slotOf(&SSOClient::SetCode), 11u);
  EXPECT_EQ(slotOf(&SSOClient::RequestWellknownInfo), 12u);
  EXPECT_EQ(slotOf(&SSOClient::RequestTokenEndpoint), 13u);
  EXPECT_EQ(slotOf(&SSOClient::VerifyIDToken), 14u);
  EXPECT_EQ(slotOf(&SSOClient::GetIDTokenReqParams), 15u);
  EXPECT_EQ(slotOf(&SSOClient::GetUserName), 16u);
  EXPECT_EQ(slotOf(&SSOClient::ProcessTokenResponse), 17u);
  EXPECT_EQ(slotOf(&SSOClient::OpenIDConnectLogin), 18u);
}

TEST(Layout, NamesOfTheTypes) {
  EXPECT_STREQ(typeid(SSOClient).name(), "N4QOVA3SSO9SSOClientE");
  EXPECT_STREQ(typeid(AzureSSOClient).name(), "N4QOVA3SSO14AzureSSOClientE");
  EXPECT_STREQ(typeid(WebSphereSSOClient).name(), "N4QOVA3SSO18WebSphereSSOClientE");
  EXPECT_STREQ(typeid(SSOProfile).name(), "N4QOVA3SSO10SSOProfileE");
  EXPECT_STREQ(typeid(Jwt).name(), "N4QOVA3JWT3JwtE");
  EXPECT_STREQ(typeid(sso_exception).name(), "N4QOVA3SSO13sso_exceptionE");
  EXPECT_STREQ(typeid(sso_err_resp).name(), "N4QOVA3SSO12sso_err_respE");
  EXPECT_STREQ(typeid(sso_op_failed).name(), "N4QOVA3SSO13sso_op_failedE");
  EXPECT_STREQ(typeid(sso_not_implemented).name(), "N4QOVA3SSO19sso_not_implementedE");
  EXPECT_STREQ(typeid(jwt_exception).name(), "N4QOVA3JWT13jwt_exceptionE");
  EXPECT_STREQ(typeid(jwt_not_support).name(), "N4QOVA3JWT15jwt_not_supportE");
  EXPECT_STREQ(typeid(jwt_verify_failed).name(), "N4QOVA3JWT17jwt_verify_failedE");
}

TEST(Layout, BaseClasses) {
  expectNoBase<SSOClient>();
  expectNoBase<SSOProfile>();
  expectBase<AzureSSOClient, SSOClient>();
  expectBase<WebSphereSSOClient, SSOClient>();
  expectBase<sso_exception, std::runtime_error>();
  expectBase<sso_err_resp, sso_exception>();
  expectBase<sso_op_failed, sso_exception>();
  expectBase<sso_not_implemented, sso_exception>();
  expectBase<jwt_exception, std::runtime_error>();
  expectBase<jwt_not_support, jwt_exception>();
  expectBase<jwt_verify_failed, jwt_exception>();
}
