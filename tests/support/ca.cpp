#include "support/ca.h"

#include <curl/curl.h>
#include <openssl/bio.h>
#include <openssl/ec.h>
#include <openssl/pem.h>
#include <openssl/x509v3.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <fstream>
#include <sstream>
#include <stdexcept>

#include "support/device.h"

namespace test {
namespace {

void require(bool good, const char* what) {
  if (!good) throw std::runtime_error(std::string("test certificates: ") + what);
}

std::shared_ptr<EVP_PKEY> newKey() {
  std::shared_ptr<EVP_PKEY> key(EVP_EC_gen("P-256"), EVP_PKEY_free);
  require(key != nullptr, "no key");
  return key;
}

std::string newName() {
  static int count = 0;
  return std::to_string(++count);
}

void extend(X509* certificate, X509* issuer, int kind, const std::string& value) {
  X509V3_CTX context;
  X509V3_set_ctx(&context, issuer, certificate, nullptr, nullptr, 0);
  std::unique_ptr<X509_EXTENSION, decltype(&X509_EXTENSION_free)> extension(
      X509V3_EXT_conf_nid(nullptr, &context, kind, value.c_str()), X509_EXTENSION_free);
  require(extension && X509_add_ext(certificate, extension.get(), -1) == 1, "extension");
}

std::shared_ptr<X509> newCertificate(EVP_PKEY* key, const std::string& subject, Validity validity) {
  static long serial = 1;
  std::shared_ptr<X509> certificate(X509_new(), X509_free);
  require(certificate != nullptr, "no certificate");
  X509* x = certificate.get();
  const long day = 24 * 3600;
  const long from = validity == Validity::kExpired  ? -3 * day
                    : validity == Validity::kNotYet ? day
                                                    : -day;
  const long until = validity == Validity::kExpired  ? -day
                     : validity == Validity::kEnding ? 3 * day
                                                     : 90 * day;
  X509_set_version(x, 2);
  ASN1_INTEGER_set(X509_get_serialNumber(x), serial++);
  X509_gmtime_adj(X509_getm_notBefore(x), from);
  X509_gmtime_adj(X509_getm_notAfter(x), until);
  X509_set_pubkey(x, key);
  X509_NAME_add_entry_by_txt(X509_get_subject_name(x), "CN", MBSTRING_UTF8,
                             reinterpret_cast<const unsigned char*>(subject.c_str()), -1, -1, 0);
  return certificate;
}

void sign(X509* certificate, X509* issuer, EVP_PKEY* issuerKey) {
  X509_set_issuer_name(certificate, X509_get_subject_name(issuer));
  require(X509_sign(certificate, issuerKey, EVP_sha256()) > 0, "signature");
}

template <typename Write>
std::string pem(Write write) {
  std::unique_ptr<BIO, decltype(&BIO_free)> out(BIO_new(BIO_s_mem()), BIO_free);
  require(out && write(out.get()) == 1, "PEM");
  char* text = nullptr;
  const long size = BIO_get_mem_data(out.get(), &text);
  return std::string(text, static_cast<std::size_t>(size));
}

Identity asPem(X509* certificate, EVP_PKEY* key) {
  return {pem([&](BIO* out) { return PEM_write_bio_X509(out, certificate); }), pem([&](BIO* out) {
            return PEM_write_bio_PrivateKey(out, key, nullptr, nullptr, 0, nullptr, nullptr);
          })};
}

std::string alternativeNames(const std::vector<std::string>& names) {
  std::string list;
  for (const std::string& name : names) list += (list.empty() ? "DNS:" : ",DNS:") + name;
  return list;
}

std::string bundlePath() {
  const curl_version_info_data* info = curl_version_info(CURLVERSION_NOW);
  return info->age >= CURLVERSION_SEVENTH && info->cainfo != nullptr
             ? info->cainfo
             : "/etc/ssl/certs/ca-certificates.crt";
}

// A host without any bundle gets an empty one, on a file system of the sandbox's own.
void provideBundle(const std::string& path) {
  if (access(path.c_str(), F_OK) == 0) return;
  std::string folder = path.substr(0, path.rfind('/'));
  std::vector<std::string> missing;
  while (access(folder.c_str(), F_OK) != 0) {
    missing.insert(missing.begin(), folder);
    folder.resize(folder.rfind('/'));
  }
  require(!folder.empty(), "no folder for a bundle");
  require(mount("test-ca", folder.c_str(), "tmpfs", 0, "mode=755") == 0, "mount for a bundle");
  for (const std::string& each : missing) require(mkdir(each.c_str(), 0755) == 0, "bundle folder");
  require(std::ofstream(path).good(), "empty bundle");
}

}  // namespace

// Each authority has its own name: a stranger of the same name would count as a forger.
Ca::Ca()
    : key(newKey()),
      self(newCertificate(key.get(), "Test authority " + newName(), Validity::kNow)) {
  extend(self.get(), self.get(), NID_basic_constraints, "critical,CA:TRUE");
  extend(self.get(), self.get(), NID_key_usage, "critical,keyCertSign,cRLSign");
  sign(self.get(), self.get(), key.get());
}

Identity Ca::issue(const std::vector<std::string>& names, Validity validity) const {
  const auto own = newKey();
  const auto certificate = newCertificate(own.get(), names.at(0), validity);
  extend(certificate.get(), self.get(), NID_subject_alt_name, alternativeNames(names));
  sign(certificate.get(), self.get(), key.get());
  return asPem(certificate.get(), own.get());
}

Identity selfSigned(const std::vector<std::string>& names, const std::string& description) {
  const auto own = newKey();
  const auto certificate = newCertificate(own.get(), names.at(0), Validity::kNow);
  if (!description.empty()) {
    require(X509_NAME_add_entry_by_txt(
                X509_get_subject_name(certificate.get()), "description", MBSTRING_UTF8,
                reinterpret_cast<const unsigned char*>(description.c_str()), -1, -1, 0) == 1,
            "description");
  }
  extend(certificate.get(), certificate.get(), NID_subject_alt_name, alternativeNames(names));
  sign(certificate.get(), certificate.get(), own.get());
  return asPem(certificate.get(), own.get());
}

std::string Ca::certificate() const {
  return asPem(self.get(), key.get()).certificate;
}

void Ca::trust() const {
  requireSandbox();
  const std::string path = bundlePath();
  provideBundle(path);
  std::ostringstream bundle;
  bundle << std::ifstream(path).rdbuf();
  coverFile(path, bundle.str() + "\n" + certificate());
}

void Ca::trustAlone() const {
  requireSandbox();
  const std::string path = bundlePath();
  provideBundle(path);
  coverFile(path, certificate());
}

}  // namespace test
