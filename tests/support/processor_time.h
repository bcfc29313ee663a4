// How much of the processor a call may take: a bound that holds under any tool, since it grows with
// what ordinary work takes there.
#pragma once

#include <gtest/gtest.h>
#include <openssl/evp.h>
#include <openssl/rsa.h>

#include <algorithm>
#include <ctime>
#include <memory>
#include <string>

namespace test {

template <typename Call>
std::clock_t processorTimeOf(const Call& call) {
  const std::clock_t start = std::clock();
  call();
  return std::clock() - start;
}

// Of a hundred signatures' verification under an ordinary key, by OpenSSL alone.
inline std::clock_t timeOfAHundred() {
  const std::unique_ptr<EVP_PKEY, decltype(&EVP_PKEY_free)> key(EVP_RSA_gen(2048), EVP_PKEY_free);
  const std::unique_ptr<EVP_MD_CTX, decltype(&EVP_MD_CTX_free)> context(EVP_MD_CTX_new(),
                                                                        EVP_MD_CTX_free);
  const std::string text(1000, 'x');
  const auto* bytes = reinterpret_cast<const unsigned char*>(text.data());
  unsigned char signature[256];
  size_t size = sizeof signature;
  EVP_DigestSignInit(context.get(), nullptr, EVP_sha256(), nullptr, key.get());
  bool good = EVP_DigestSign(context.get(), signature, &size, bytes, text.size()) == 1;
  const std::clock_t taken = processorTimeOf([&] {
    for (int i = 0; i < 100; ++i) {
      EVP_MD_CTX_reset(context.get());
      EVP_DigestVerifyInit(context.get(), nullptr, EVP_sha256(), nullptr, key.get());
      good = EVP_DigestVerify(context.get(), signature, size, bytes, text.size()) == 1 && good;
    }
  });
  EXPECT_TRUE(good);
  return taken;
}

// Use as EXPECT_TRUE(takesAMoment([&] { call(); })): a second at most, which is three hundred times
// those hundred; where that is slow, a hundred times as long as they take.
template <typename Call>
testing::AssertionResult takesAMoment(const Call& call) {
  static const std::clock_t most = std::max(std::clock_t{CLOCKS_PER_SEC}, 100 * timeOfAHundred());
  const std::clock_t taken = processorTimeOf(call);
  if (taken <= most) return testing::AssertionSuccess();
  return testing::AssertionFailure()
         << "took " << taken * 1000 / CLOCKS_PER_SEC << " ms of the processor, more than "
         << most * 1000 / CLOCKS_PER_SEC;
}

}  // namespace test
