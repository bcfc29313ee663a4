// The functions of OpenSSL that the library calls and that can fail, as a list of
// FAULTY(RESULT, NAME, PARAMETERS, ARGUMENTS, FAILED); FAILED is what a failed call returns. Who
// includes it, outside of any namespace, has defined FAULTY.
#include <openssl/bio.h>
#include <openssl/bn.h>
#include <openssl/evp.h>
#include <openssl/hmac.h>
#include <openssl/rsa.h>

#include <cstddef>

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
FAULTY(int, EVP_DigestUpdate, (EVP_MD_CTX * context, const void* bytes, std::size_t length),
       (context, bytes, length), 0)
// A signature that is an error, not merely wrong.
FAULTY(int, EVP_DigestVerifyFinal,
       (EVP_MD_CTX * context, const unsigned char* signature, std::size_t length),
       (context, signature, length), -1)
FAULTY(unsigned char*, HMAC,
       (const EVP_MD* md, const void* key, int key_length, const unsigned char* text,
        std::size_t length, unsigned char* mac, unsigned int* mac_length),
       (md, key, key_length, text, length, mac, mac_length), nullptr)
