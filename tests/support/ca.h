// A certificate authority that lives as long as the test.
#pragma once

#include <openssl/evp.h>
#include <openssl/x509.h>

#include <memory>
#include <string>
#include <vector>

namespace test {

// A certificate and its private key, as PEM text.
struct Identity {
  std::string certificate;
  std::string key;
};

enum class Validity { kNow, kExpired, kNotYet, kEnding };

class Ca {
 public:
  Ca();

  // A server certificate for these DNS names (an address as a name does not match).
  Identity issue(const std::vector<std::string>& names, Validity validity = Validity::kNow) const;

  // Makes libcurl trust this authority, in the sandbox alone: its bundle file is covered by a
  // copy with this certificate appended. Throws outside a sandbox.
  void trust() const;
  // The same with this certificate alone: a bundle of one is read in no time.
  void trustAlone() const;

  std::string certificate() const;  // PEM

 private:
  std::shared_ptr<EVP_PKEY> key;
  std::shared_ptr<X509> self;
};

// A server certificate that is its own issuer; its subject has the description, if there is one.
Identity selfSigned(const std::vector<std::string>& names, const std::string& description = "");

}  // namespace test
