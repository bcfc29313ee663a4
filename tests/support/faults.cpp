#include "support/faults.h"

#include <dlfcn.h>
#include <openssl/bio.h>
#include <openssl/bn.h>
#include <openssl/evp.h>
#include <openssl/hmac.h>
#include <openssl/rsa.h>

#include <cstring>

namespace {

const char* armed = nullptr;
int calls_left = 0;
bool hit = false;

template <typename Function>
Function* real(const char* name) {
  return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

}  // namespace

namespace test {

Fault::Fault(const char* function, int nth) {
  armed = function;
  hit = false;
  calls_left = nth;
}

Fault::~Fault() {
  calls_left = 0;
}

bool Fault::wasHit() const {
  return hit;
}

bool isFromLibrary(const void* caller) {
  Dl_info info;
  return dladdr(caller, &info) != 0 && std::strstr(info.dli_fname, "libssoclient.so") != nullptr;
}

bool failsNow(const char* function, const void* caller) {
  if (calls_left == 0 || std::strcmp(armed, function) != 0 || !isFromLibrary(caller)) return false;
  hit = --calls_left == 0;
  return hit;
}

}  // namespace test

// FAULTY(RESULT, NAME, PARAMETERS, ARGUMENTS, FAILED): stands before the function of that name.
// Weak, so that a test program may have one of its own instead.
#define FAULTY(RESULT, NAME, PARAMETERS, ARGUMENTS, FAILED)                  \
  extern "C" __attribute__((weak)) RESULT NAME PARAMETERS {                  \
    static auto* const next = real<RESULT PARAMETERS>(#NAME);                \
    if (test::failsNow(#NAME, __builtin_return_address(0))) return (FAILED); \
    return next ARGUMENTS;                                                   \
  }

FAULTY(BIO*, BIO_new, (const BIO_METHOD* type), (type), nullptr)
FAULTY(BIO*, BIO_new_mem_buf, (const void* bytes, int length), (bytes, length), nullptr)
FAULTY(int, BIO_read, (BIO * bio, void* bytes, int length), (bio, bytes, length), -1)
FAULTY(int, BIO_write, (BIO * bio, const void* bytes, int length), (bio, bytes, length), -1)
FAULTY(BIGNUM*, BN_bin2bn, (const unsigned char* bytes, int length, BIGNUM* number),
       (bytes, length, number), nullptr)
FAULTY(RSA*, RSA_new, (), (), nullptr)
FAULTY(int, RSA_set0_key, (RSA * rsa, BIGNUM* n, BIGNUM* e, BIGNUM* d), (rsa, n, e, d), 0)
FAULTY(EVP_PKEY*, EVP_PKEY_new, (), (), nullptr)
FAULTY(int, EVP_PKEY_assign, (EVP_PKEY * key, int type, void* rsa), (key, type, rsa), 0)
FAULTY(int, EVP_PKEY_get_id, (const EVP_PKEY* key), (key), EVP_PKEY_DSA)
FAULTY(EVP_MD_CTX*, EVP_MD_CTX_new, (), (), nullptr)
FAULTY(int, EVP_DigestVerifyInit,
       (EVP_MD_CTX * context, EVP_PKEY_CTX** key_context, const EVP_MD* md, ENGINE* engine,
        EVP_PKEY* key),
       (context, key_context, md, engine, key), 0)
FAULTY(int, EVP_DigestUpdate, (EVP_MD_CTX * context, const void* bytes, size_t length),
       (context, bytes, length), 0)
// A signature that is an error, not merely wrong.
FAULTY(int, EVP_DigestVerifyFinal,
       (EVP_MD_CTX * context, const unsigned char* signature, size_t length),
       (context, signature, length), -1)
FAULTY(unsigned char*, HMAC,
       (const EVP_MD* md, const void* key, int key_length, const unsigned char* text, size_t length,
        unsigned char* mac, unsigned int* mac_length),
       (md, key, key_length, text, length, mac, mac_length), nullptr)

// BIO_pending is a form of BIO_ctrl; it fails under its own name.
extern "C" long BIO_ctrl(BIO* bio, int command, long number, void* argument) {
  static auto* const next = real<long(BIO*, int, long, void*)>("BIO_ctrl");
  if (command == BIO_CTRL_PENDING && test::failsNow("BIO_pending", __builtin_return_address(0)))
    return -1;
  return next(bio, command, number, argument);
}
