// Where the randomness of a nonce comes from, and what happens when it does not come.
#include <dlfcn.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/random.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <cstring>
#include <set>
#include <string>
#include <vector>

#include "support/both_clients.h"
#include "support/faults.h"
#include "support/log.h"
#include "support/query.h"
#include "support/tokens.h"

namespace {

// What the library did with its source of randomness.
int source = -1;
int opened = 0;
int closed = 0;
std::vector<size_t> reads;
// How a read of it goes, if not normally: -1 fails, otherwise so many bytes at most.
bool limited = false;
ssize_t limit = 0;
bool no_getrandom = false;
int interruptions = 0;  // of getrandom, to come

template <typename Function>
Function* real(const char* name) {
  return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

bool isSource(int file, const void* caller) {
  return file >= 0 && file == source && test::isFromLibrary(caller);
}

}  // namespace

extern "C" int open(const char* path, int flags, ...) {
  static auto* const next = real<int(const char*, int, ...)>("open");
  va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = (flags & O_CREAT) != 0 ? va_arg(arguments, mode_t) : 0;
  va_end(arguments);
  const bool random = std::strcmp(path, "/dev/urandom") == 0;
  if (!random || !test::isFromLibrary(__builtin_return_address(0))) return next(path, flags, mode);
  if (test::failsNow("open", __builtin_return_address(0))) {
    errno = EACCES;
    return -1;
  }
  ++opened;
  return source = next(path, flags, mode);
}

extern "C" ssize_t read(int file, void* bytes, size_t size) {
  static auto* const next = real<ssize_t(int, void*, size_t)>("read");
  if (!isSource(file, __builtin_return_address(0))) return next(file, bytes, size);
  reads.push_back(size);
  if (!limited) return next(file, bytes, size);
  if (limit < 0) errno = EIO;
  return limit <= 0 ? limit : next(file, bytes, std::min(size, static_cast<size_t>(limit)));
}

extern "C" int close(int file) {
  static auto* const next = real<int(int)>("close");
  if (isSource(file, __builtin_return_address(0))) {
    ++closed;
    source = -1;
  }
  return next(file);
}

extern "C" unsigned char* MD5(const unsigned char* bytes, size_t size, unsigned char* digest) {
  static auto* const next =
      real<unsigned char*(const unsigned char*, size_t, unsigned char*)>("MD5");
  if (test::failsNow("MD5", __builtin_return_address(0))) return nullptr;
  return next(bytes, size, digest);
}

extern "C" ssize_t getrandom(void* bytes, size_t size, unsigned flags) {
  static auto* const next = real<ssize_t(void*, size_t, unsigned)>("getrandom");
  const bool ours = test::isFromLibrary(__builtin_return_address(0));
  if (!ours || (!no_getrandom && interruptions == 0)) return next(bytes, size, flags);
  errno = no_getrandom ? ENOSYS : EINTR;
  if (interruptions > 0) --interruptions;
  return -1;
}

namespace {

template <typename Provider>
class ClientNonce : public testing::Test {
 protected:
  std::string nonce() {
    const std::string url = client.GetAccessTokenReqURI(Json::Value());
    return url.substr(url.find("nonce=") + 6, 36);
  }

  void expectDifferentNonces() {
    std::set<std::string> nonces;
    for (int i = 0; i < 20; ++i) nonces.insert(nonce());
    EXPECT_EQ(nonces.size(), 20u);
  }

  void SetUp() override {
    opened = closed = 0;
    reads.clear();
    limited = no_getrandom = false;
    interruptions = 0;
  }

  void TearDown() override {
    EXPECT_EQ(closed, opened);
    EXPECT_TRUE(log.isEmpty());
  }

  typename Provider::Client client;
  test::Log log;
};
TYPED_TEST_SUITE(ClientNonce, test::Clients, test::ClientName);

TYPED_TEST(ClientNonce, IsSeededAnewForEachCallWithOneRead) {
  for (int i = 1; i <= 3; ++i) {
    this->nonce();
    EXPECT_EQ(opened, i);
    EXPECT_EQ(reads.size(), static_cast<size_t>(i));
  }
  EXPECT_GE(reads[0], 16u) << "not less than the nonce itself";
}

TYPED_TEST(ClientNonce, IsMadeWithoutTheDevice) {
  for (int i = 0; i < 5; ++i) {
    test::Fault fault("open");
    EXPECT_EQ(this->nonce().size(), 36u);
    EXPECT_TRUE(fault.wasHit());
  }
  EXPECT_EQ(opened, 0);
}

TYPED_TEST(ClientNonce, IsRandomWhenTheDeviceCannotBeRead) {
  limited = true;
  for (ssize_t count : {-1, 0, 1}) {
    limit = count;
    SCOPED_TRACE(count);
    this->expectDifferentNonces();
  }
}

TYPED_TEST(ClientNonce, IsRandomWhenTheKernelIsInterrupted) {
  limited = true;
  limit = -1;
  interruptions = 3;
  this->expectDifferentNonces();
  EXPECT_EQ(interruptions, 0);
}

TYPED_TEST(ClientNonce, IsMadeWithoutAnySourceOfRandomness) {
  limited = true;
  limit = -1;
  no_getrandom = true;
  EXPECT_EQ(this->nonce().size(), 36u);
}

// The digest is empty then, and the request goes on.
TYPED_TEST(ClientNonce, HasAnEmptyDigestInTheStateWhenThatCannotBeMade) {
  test::Fault fault("MD5");
  const std::string url = this->client.GetAccessTokenReqURI(Json::Value());
  EXPECT_TRUE(fault.wasHit());
  const std::string state = test::percentDecoded(url.substr(url.find("&state=") + 7));
  EXPECT_EQ(test::fromBase64(state), "{\"nonce\":\"\"}\n");
  ASSERT_EQ(this->log.lines().size(), 1u);
  EXPECT_EQ(this->log.lines()[0].priority, LOG_ERR);
  EXPECT_EQ(this->log.lines()[0].text.find("utils.cpp:"), 0u);
  EXPECT_NE(this->log.lines()[0].text.find(" MD5 digest failed "), std::string::npos);
  this->log.clear();
}

}  // namespace
