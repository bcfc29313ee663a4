// Tokens when memory runs out: the library's allocations fail, one after the other.
#include <gtest/gtest.h>
#include <openssl/evp.h>

#include <string>

#include "sso/jwt.h"
#include "support/faults.h"
#include "support/log.h"
#include "support/memory_spy.h"
#include "support/throws.h"
#include "support/tokens.h"

// The real one by its other name: finding it with dlsym would allocate.
#if defined(__SANITIZE_ADDRESS__)
#define REAL_MALLOC __interceptor_malloc
#else
#define REAL_MALLOC __libc_malloc
#endif
extern "C" void* REAL_MALLOC(size_t size);

extern "C" __attribute__((visibility("default"))) void* malloc(size_t size) {
  return test::failsNow("malloc", __builtin_return_address(0)) ? nullptr : REAL_MALLOC(size);
}

namespace {

using QOVA::JWT::Jwt;
using QOVA::JWT::jwt_verify_failed;
using test::failEachNew;
using test::throws;

// Calls `attempt` with the first, the second, ... allocation failing, until there is no further
// one. Returns how many there were.
template <typename Attempt>
int failEachAllocation(const Attempt& attempt) {
  for (int nth = 1; nth < 100; ++nth) {
    bool hit = false;
    testing::AssertionResult result = testing::AssertionSuccess();
    {
      test::Fault fault("malloc", nth);
      result = attempt();
      hit = fault.wasHit();
    }
    if (!hit) return nth - 1;
    EXPECT_TRUE(result) << "allocation " << nth;
  }
  return 100;
}

TEST(JwtWithoutMemory, ReadsNoHeaderAndNoBody) {
  test::Log log;
  Jwt jwt("e30.e30.sig");
  EXPECT_EQ(failEachAllocation([&] { return throws<std::logic_error>([&] { jwt.GetHeader(); }); }),
            1);
  EXPECT_EQ(failEachAllocation([&] { return throws<std::logic_error>([&] { jwt.GetBody(); }); }),
            1);
  EXPECT_EQ(jwt.GetBody(), Json::Value(Json::objectValue));
  EXPECT_TRUE(log.isEmpty());
}

TEST(JwtWithoutMemory, FailsTheRsaCheckSilently) {
  test::Log log;
  const test::RsaKey& key = test::anyRsaKey();
  std::string n = key.n();
  std::string e = key.e();
  Jwt jwt(test::rsaToken(key, "{}", "{}"));
  const auto attempt = [&] {
    return throws<jwt_verify_failed>("verify rsa signature failed",
                                     [&] { jwt.JwtRSAVerify(n, e, EVP_sha256()); });
  };
  EXPECT_EQ(failEachAllocation(attempt), 3) << "modulus, exponent, signature";
  EXPECT_NO_THROW(jwt.JwtRSAVerify(n, e, EVP_sha256()));
  EXPECT_TRUE(log.isEmpty());
}

TEST(JwtWithoutMemory, FailsTheHmacCheck) {
  test::Log log;
  std::string key = test::base64url("secret");
  Jwt jwt(test::hmacToken("secret", "{}", "{}"));
  const auto attempt = [&] {
    return throws<jwt_verify_failed>("verify hmac signature failed",
                                     [&] { jwt.JwtHMACVerify(key, EVP_sha256()); });
  };
  EXPECT_GE(failEachAllocation(attempt), 1) << "the key";
  EXPECT_NO_THROW(jwt.JwtHMACVerify(key, EVP_sha256()));
  EXPECT_TRUE(log.isEmpty());
}

TEST(JwtWithoutMemory, LetsExhaustionPassAndReleasesEverything) {
  test::Log log;
  const test::RsaKey& key = test::anyRsaKey();
  const std::string header = R"({"alg":"none", "a long name": ["a long value", 1, {"x":"y"}]})";
  const std::string rsa = test::rsaToken(key, header, header);
  const std::string hmac = test::hmacToken("secret", header, header);
  std::string n = key.n();
  std::string e = key.e();
  std::string secret = test::base64url("secret");
  Jwt rsa_jwt(rsa);
  Jwt hmac_jwt(hmac);
  EXPECT_GE(failEachNew([&] { Jwt{rsa}; }), 3);
  EXPECT_GE(failEachNew([&] { rsa_jwt.GetHeader(); }), 3);
  EXPECT_GE(failEachNew([&] { rsa_jwt.GetBody(); }), 3);
  EXPECT_EQ(failEachNew([&] { rsa_jwt.GetSignature(); }), 1);
  EXPECT_GE(failEachNew([&] { rsa_jwt.JwtRSAVerify(n, e, EVP_sha256()); }), 1);
  EXPECT_GE(failEachNew([&] { hmac_jwt.JwtHMACVerify(secret, EVP_sha256()); }), 1);
  EXPECT_TRUE(log.isEmpty());
}

}  // namespace
