// RSA numbers that no honest provider publishes, and documents that are cut off anywhere.
#include <gtest/gtest.h>
#include <openssl/bn.h>
#include <openssl/core_names.h>
#include <openssl/evp.h>
#include <openssl/param_build.h>
#include <openssl/rsa.h>

#include <algorithm>
#include <ctime>
#include <memory>
#include <string>
#include <vector>

#include "sso/jwt.h"
#include "support/processor_time.h"
#include "support/token_check.h"

namespace {

using QOVA::JWT::Jwt;
using QOVA::JWT::jwt_verify_failed;
using test::anyRsaKey;
using test::base64url;
using test::fromBase64;
using test::throws;

// The verdict of OpenSSL alone, made with calls of its newer interface.
bool opensslAccepts(const std::string& input, const std::string& signature, const std::string& n,
                    const std::string& e, const EVP_MD* md) {
  const auto number = [](const std::string& bytes) {
    return BN_bin2bn(reinterpret_cast<const unsigned char*>(bytes.data()),
                     static_cast<int>(bytes.size()), nullptr);
  };
  BIGNUM* modulus = number(n);
  BIGNUM* exponent = number(e);
  OSSL_PARAM_BLD* build = OSSL_PARAM_BLD_new();
  OSSL_PARAM_BLD_push_BN(build, OSSL_PKEY_PARAM_RSA_N, modulus);
  OSSL_PARAM_BLD_push_BN(build, OSSL_PKEY_PARAM_RSA_E, exponent);
  OSSL_PARAM* parameters = OSSL_PARAM_BLD_to_param(build);
  EVP_PKEY_CTX* maker = EVP_PKEY_CTX_new_from_name(nullptr, "RSA", nullptr);
  EVP_PKEY* key = nullptr;
  EVP_PKEY_fromdata_init(maker);
  EVP_PKEY_fromdata(maker, &key, EVP_PKEY_PUBLIC_KEY, parameters);
  EVP_PKEY_CTX_free(maker);
  OSSL_PARAM_free(parameters);
  OSSL_PARAM_BLD_free(build);
  BN_free(exponent);
  BN_free(modulus);
  if (key == nullptr) return false;
  EVP_MD_CTX* context = EVP_MD_CTX_new();
  const bool good =
      EVP_DigestVerifyInit(context, nullptr, md, nullptr, key) == 1 &&
      EVP_DigestVerify(context, reinterpret_cast<const unsigned char*>(signature.data()),
                       signature.size(), reinterpret_cast<const unsigned char*>(input.data()),
                       input.size()) == 1;
  EVP_MD_CTX_free(context);
  EVP_PKEY_free(key);
  return good;
}

std::string digest(const std::string& text) {
  unsigned char bytes[EVP_MAX_MD_SIZE];
  unsigned size = 0;
  EVP_Digest(text.data(), text.size(), bytes, &size, EVP_sha256(), nullptr);
  return std::string(reinterpret_cast<char*>(bytes), size);
}

// The block that a signature stands for (RFC 8017, section 9.2), with SHA-256.
std::string encodedMessage(const std::string& input, size_t size) {
  const std::string info(
      "\x30\x31\x30\x0d\x06\x09\x60\x86\x48\x01\x65\x03\x04\x02\x01\x05\x00\x04\x20", 19);
  const std::string end = '\0' + info + digest(input);
  return std::string("\0\1", 2) + std::string(size - 2 - end.size(), '\xff') + end;
}

const char kInput[] = "e30.e30";

// Whether the library takes the signature; what it says otherwise is checked.
bool accepts(const std::string& signature, const std::string& n, const std::string& e) {
  std::string modulus = base64url(n);
  std::string exponent = base64url(e);
  Jwt jwt(kInput + std::string(".") + base64url(signature));
  try {
    jwt.JwtRSAVerify(modulus, exponent, EVP_sha256());
  } catch (const jwt_verify_failed& error) {
    EXPECT_STREQ(error.what(), "verify rsa signature failed");
    return false;
  }
  return true;
}

// Refused, with a line in the log.
void expectRefused(const std::string& signature, const std::string& n, const std::string& e) {
  test::Log log;
  EXPECT_FALSE(accepts(signature, n, e));
  EXPECT_TRUE(log.is({{LOG_ERR, "jwt.cpp", "EVP_DigestVerifyFinal failed"}}));
}

class AttackNumbers : public testing::Test {
 protected:
  const std::string n = fromBase64(anyRsaKey().n());
  const std::string e = fromBase64(anyRsaKey().e());
  const std::string good = anyRsaKey().sign(kInput, "SHA256");
};

TEST_F(AttackNumbers, OddExponentsVerifyNothingThatTheKeySigned) {
  ASSERT_TRUE(accepts(good, n, e));
  const std::vector<std::string> exponents = {std::string("\2", 1),
                                              std::string("\3", 1),
                                              std::string("\1\0\0", 3),
                                              std::string("\1\0\2", 3),
                                              std::string("\xff\xff", 2),
                                              std::string("\xff\xff\xff\xff\xff\xff\xff\xff", 8),
                                              std::string("\x80") + std::string(8, '\1'),
                                              n,
                                              n + '\1',
                                              std::string(2048, '\xff')};
  for (const std::string& exponent : exponents) expectRefused(good, n, exponent);
  EXPECT_TRUE(accepts(good, n, std::string(5, '\0') + e));
}

// With the exponent 1 a signature is the padded digest itself: whoever publishes such a key gives
// away every signature under it. Keys are not judged here; the crypto library's verdict stands.
TEST_F(AttackNumbers, AnExponentOfOneIsTheProvidersOwnUndoing) {
  const std::string one = "\1";
  const std::string forged = encodedMessage(kInput, n.size());
  const test::Log log;
  EXPECT_EQ(accepts(forged, n, one), opensslAccepts(kInput, forged, n, one, EVP_sha256()));
  // Under any other exponent the padded digest is not a signature, and an honest signature none
  // here.
  expectRefused(forged, n, e);
  expectRefused(good, n, one);
  const std::string other = encodedMessage("e30.e31", n.size());
  expectRefused(other, n, one);
}

// The largest number whose cube is at most this one.
BIGNUM* cubeRoot(const BIGNUM* number, int bits, BN_CTX* context) {
  BIGNUM* root = BN_new();
  BIGNUM* cube = BN_new();
  for (int bit = bits / 3; bit >= 0; --bit) {
    BN_set_bit(root, bit);
    BN_sqr(cube, root, context);
    BN_mul(cube, cube, root, context);
    if (BN_cmp(cube, number) > 0) BN_clear_bit(root, bit);
  }
  BN_free(cube);
  return root;
}

// Bleichenbacher's forgery under the exponent 3: a cube that begins with a right block, behind
// which it leaves everything to chance.
TEST(AttackExponent, ThreeHelpsNoForger) {
  const int size = 384;
  const std::string start = encodedMessage(kInput, 62);  // with the shortest padding there may be
  const std::string most = start + std::string(size - start.size(), '\xff');
  BN_CTX* context = BN_CTX_new();
  BIGNUM* number = BN_bin2bn(reinterpret_cast<const unsigned char*>(most.data()), size, nullptr);
  BIGNUM* root = cubeRoot(number, 8 * size, context);
  std::string forged(size, '\0');
  BN_bn2binpad(root, reinterpret_cast<unsigned char*>(&forged[0]), size);
  BN_sqr(number, root, context);
  BN_mul(number, number, root, context);
  std::string cube(size, '\0');
  BN_bn2binpad(number, reinterpret_cast<unsigned char*>(&cube[0]), size);
  BN_free(root);
  BN_free(number);
  BN_CTX_free(context);
  ASSERT_EQ(cube.substr(0, start.size()), start) << "the forgery is one";
  expectRefused(forged, std::string(size, '\xff'), "\3");
}

TEST_F(AttackNumbers, OddModuliVerifyNothing) {
  std::string even = n;
  even.back() = static_cast<char>(even.back() & ~1);
  expectRefused(good, even, e);
  const std::string power = '\1' + std::string(255, '\0');
  expectRefused(good, power, e);
  expectRefused(std::string(256, '\1'), power, e);
  for (const std::string& tiny :
       {std::string("\1"), std::string("\2"), std::string("\3"), std::string("\x0f"),
        std::string("\xff\xff"), std::string("\1\0\1", 3), std::string(8, '\xff'),
        std::string(11, '\xfd'), std::string(32, '\xfd'), std::string(61, '\xfd')}) {
    for (const std::string& signature :
         {good, std::string(1, '\0'), std::string("\1"), std::string(tiny.size(), '\1'),
          std::string(tiny.size(), '\0')})
      expectRefused(signature, tiny, e);
  }
  expectRefused(good, n + '\1', e);
  expectRefused(good, n.substr(1), e);
  expectRefused(good, std::string(n.rbegin(), n.rend()), e);
}

// Zero, one and the modulus itself are their own powers.
TEST_F(AttackNumbers, FixedPointsAreNoSignatures) {
  std::string before = n;
  before.back() = static_cast<char>(before.back() - 1);
  const std::string zero(255, '\0');
  for (const std::string& signature : {zero + '\0', zero + '\1', before, n,
                                       std::string(256, '\xff'), encodedMessage(kInput, n.size())})
    expectRefused(signature, n, e);
}

std::string exponentOfAllOnes(size_t bits) {
  return std::string(bits / 8, '\xff');
}

// 16,384 bits are the most that OpenSSL calculates with; anything larger it refuses unseen.
TEST_F(AttackNumbers, HugeOnesCostAMomentAtMost) {
  const auto refusedSoon = [](const std::string& signature, const std::string& modulus,
                              const std::string& exponent) {
    SCOPED_TRACE(std::to_string(8 * modulus.size()) + " bits, an exponent of " +
                 std::to_string(8 * exponent.size()));
    EXPECT_TRUE(test::takesAMoment([&] { expectRefused(signature, modulus, exponent); }));
  };
  for (const size_t bits : {4096u, 8192u, 16384u}) {
    const std::string modulus(bits / 8, '\xfd');
    for (const std::string& exponent : {std::string("\3"), e, exponentOfAllOnes(64)})
      refusedSoon(std::string(bits / 8, '\1'), modulus, exponent);
    refusedSoon(std::string(bits / 8, '\1'), modulus, exponentOfAllOnes(bits - 8));
    refusedSoon(good, modulus, e);
  }
  for (const size_t bits : {16385u + 7, 65536u, 1u << 20, 1u << 23}) {
    const std::string modulus(bits / 8, '\xfd');
    refusedSoon(std::string(bits / 8, '\1'), modulus, e);
    refusedSoon(good, modulus, exponentOfAllOnes(bits - 8));
    refusedSoon(std::string(bits / 8, '\1'), n, e);
    refusedSoon(good, n, exponentOfAllOnes(bits));
  }
}

TEST_F(AttackNumbers, AreTakenOrLeftAsOpenSSLDoes) {
  const test::Log log;
  unsigned accepted = 0;
  for (unsigned i = 0; i < 400; ++i) {
    std::string modulus = n;
    std::string exponent = e;
    std::string signature = good;
    const unsigned at = i * 37 % 256;
    const auto change = static_cast<char>(1 << i % 8);
    if (i % 4 == 0) modulus[at] = static_cast<char>(modulus[at] ^ change);
    if (i % 4 == 1) signature[at] = static_cast<char>(signature[at] ^ change);
    if (i % 4 == 2) exponent[at % 3] = static_cast<char>(exponent[at % 3] ^ change);
    if (i % 4 == 3) modulus.insert(0, at % 5, '\0');
    const bool good_here = opensslAccepts(kInput, signature, modulus, exponent, EVP_sha256());
    EXPECT_EQ(accepts(signature, modulus, exponent), good_here) << i;
    accepted += good_here;
  }
  EXPECT_EQ(accepted, 100u) << "zero bytes in front change nothing, everything else does";
}

// RFC 8017, section 8.2.2: the block is made anew and compared as a whole.
class AttackPadding : public testing::Test {
 protected:
  // What `block` is signed to with the private key, whatever it holds.
  std::string signedBlock(const std::string& block) const {
    EVP_PKEY_CTX* context = EVP_PKEY_CTX_new(key.get(), nullptr);
    std::string signature(256, '\0');
    size_t size = signature.size();
    const bool done =
        EVP_PKEY_sign_init(context) == 1 &&
        EVP_PKEY_CTX_set_rsa_padding(context, RSA_NO_PADDING) == 1 &&
        EVP_PKEY_sign(context, reinterpret_cast<unsigned char*>(&signature[0]), &size,
                      reinterpret_cast<const unsigned char*>(block.data()), block.size()) == 1;
    EVP_PKEY_CTX_free(context);
    EXPECT_TRUE(done);
    return signature;
  }

  std::string number(const char* name) const {
    BIGNUM* value = nullptr;
    EXPECT_EQ(EVP_PKEY_get_bn_param(key.get(), name, &value), 1);
    std::string bytes(static_cast<size_t>(BN_num_bytes(value)), '\0');
    BN_bn2bin(value, reinterpret_cast<unsigned char*>(&bytes[0]));
    BN_free(value);
    return bytes;
  }

  const std::shared_ptr<EVP_PKEY> key{EVP_RSA_gen(2048), EVP_PKEY_free};
};

TEST_F(AttackPadding, IsCheckedInEveryByte) {
  const std::string modulus = number("n");
  const std::string exponent = number("e");
  const std::string right = encodedMessage(kInput, 256);
  ASSERT_TRUE(accepts(signedBlock(right), modulus, exponent));
  const size_t info = 256 - 51;
  for (const size_t at : {size_t{1}, size_t{2}, size_t{3}, size_t{100}, info - 2, info - 1, info,
                          info + 1, info + 5, info + 17, info + 18, info + 19, size_t{255}}) {
    std::string block = right;
    block[at] = static_cast<char>(block[at] ^ 1);
    expectRefused(signedBlock(block), modulus, exponent);
  }
}

TEST_F(AttackPadding, HasOneForm) {
  const std::string modulus = number("n");
  const std::string exponent = number("e");
  const std::string hash = digest(kInput);
  const auto padded = [](const std::string& end) {
    return std::string("\0\1", 2) + std::string(253 - end.size(), '\xff') + '\0' + end;
  };
  const std::string right = encodedMessage(kInput, 256).substr(256 - 51);
  ASSERT_TRUE(accepts(signedBlock(padded(right)), modulus, exponent));
  std::vector<std::string> blocks;
  blocks.push_back(padded(hash));          // no algorithm at all
  blocks.push_back(padded(right + '\0'));  // something behind it
  blocks.push_back(padded(right + std::string(100, 'x')));
  blocks.push_back(padded(right).insert(200, 1, '\0').substr(0, 256));
  blocks.push_back('\0' + std::string("\2") + padded(right).substr(2));  // the other block type
  blocks.push_back(std::string("\0\1\0", 3) + right + std::string(253 - 51, '\xff'));
  blocks.push_back(std::string("\0\1", 2) + std::string(202, '\0') + '\0' + right);
  std::string sha1 = right;
  sha1[14] = '\3';  // another algorithm with a digest of this size
  blocks.push_back(padded(sha1));
  for (const std::string& block : blocks) {
    ASSERT_EQ(block.size(), 256u);
    expectRefused(signedBlock(block), modulus, exponent);
  }
}

class AttackCut : public test::TokenCheck<test::Azure> {
 protected:
  static std::string keySet() { return "{\"keys\":[" + anyRsaKey().jwk("the key") + "]}"; }
};

// Even the last bracket counts: a part of a key set must not pass for the whole.
TEST_F(AttackCut, KeySetsHoldNoKeyWhereverTheyEnd) {
  const std::string good = token(goodHeader());
  const std::string keys = keySet();
  for (size_t size = 0; size < keys.size(); ++size) {
    test::writeConfig("keys", keys.substr(0, size));
    log.clear();
    EXPECT_TRUE(misses(good)) << size;
    EXPECT_TRUE(
        log.is({{LOG_ERR, "azuresso.cpp", "request wellknown uri bad wellknown json format.."}}));
  }
  test::writeConfig("keys", keys);
  EXPECT_TRUE(accepts(good));
}

// Of a discovery document the part that was read is kept, so that the address counts as soon as
// it is complete.
TEST_F(AttackCut, DiscoveryDocumentsCountAsFarAsTheyCame) {
  const std::string good = token(goodHeader());
  const std::string start = "{\"issuer\":\"x\",\"jwks_uri\":\"" + address("keys") + "\"";
  const std::string whole = start + ",\"scopes\":[\"openid\",\"email\"]}";
  for (size_t size = 0; size < whole.size(); ++size) {
    test::writeConfig("discovery", whole.substr(0, size));
    EXPECT_TRUE(size < start.size() ? misses(good) : accepts(good)) << size;
  }
}

template <typename Provider>
class AttackCutToken : public test::TokenCheck<Provider> {};
TYPED_TEST_SUITE(AttackCutToken, test::Clients, test::ClientName);

TYPED_TEST(AttackCutToken, ResponsesHoldNoTokenWhereverTheyEnd) {
  const std::string token = this->token(this->goodHeader());
  const std::string response =
      "{\"token_type\":\"Bearer\",\"id_token\":" + test::jsonText(token) + "}";
  typename TypeParam::Client client;
  for (size_t size = 0; size < response.size(); ++size) {
    EXPECT_TRUE(throws<std::invalid_argument>(
        "parse json falied", [&] { client.ProcessTokenResponse(response.substr(0, size)); }));
    EXPECT_EQ(client.GetToken(), "");
  }
  for (size_t size = 0; size < token.size(); ++size) {
    const std::string part = token.substr(0, size);
    const bool whole = std::count(part.begin(), part.end(), '.') == 2;
    if (part.empty()) {
      EXPECT_TRUE(this->template refuses<std::invalid_argument>("token cannot be empty", part));
    } else if (!whole) {
      EXPECT_TRUE(this->template refuses<std::invalid_argument>("bad jwt format!", part)) << size;
    } else {
      EXPECT_TRUE(this->doubts(part)) << size;
    }
  }
  EXPECT_TRUE(this->accepts(token));
}

}  // namespace
