#include "doctor/web.h"

#include <openssl/ssl.h>
#include <openssl/x509v3.h>

#include <memory>
#include <new>

namespace doctor {

namespace {

constexpr size_t kLongestBody = 1 << 20;

struct CurlState {
  CurlState() { curl_global_init(CURL_GLOBAL_ALL); }
  ~CurlState() { curl_global_cleanup(); }
  CurlState(const CurlState&) = delete;
  CurlState& operator=(const CurlState&) = delete;
};

template <auto Free>
struct Deleter {
  template <typename T>
  void operator()(T* resource) const {
    Free(resource);
  }
};

using Handle = std::unique_ptr<CURL, Deleter<curl_easy_cleanup>>;
using Bio = std::unique_ptr<BIO, Deleter<BIO_free_all>>;
using Names = std::unique_ptr<GENERAL_NAMES, Deleter<GENERAL_NAMES_free>>;

std::string NameText(const X509_NAME* name) {
  const Bio memory(BIO_new(BIO_s_mem()));
  if (memory == nullptr || name == nullptr) return "?";
  X509_NAME_print_ex(memory.get(), name, 0, XN_FLAG_ONELINE & ~ASN1_STRFLGS_ESC_MSB);
  char* text = nullptr;
  const long length = BIO_get_mem_data(memory.get(), &text);
  return length > 0 ? std::string(text, static_cast<size_t>(length)) : "?";
}

time_t TimeOf(const ASN1_TIME* time) {
  struct tm fields = {};
  return time != nullptr && ASN1_TIME_to_tm(time, &fields) == 1 ? timegm(&fields) : 0;
}

std::vector<std::string> DnsNames(const X509* certificate) {
  std::vector<std::string> result;
  const Names names(static_cast<GENERAL_NAMES*>(
      X509_get_ext_d2i(certificate, NID_subject_alt_name, nullptr, nullptr)));
  for (int i = 0; names != nullptr && i < sk_GENERAL_NAME_num(names.get()); ++i) {
    const GENERAL_NAME* const name = sk_GENERAL_NAME_value(names.get(), i);
    if (name->type != GEN_DNS) continue;
    result.emplace_back(reinterpret_cast<const char*>(ASN1_STRING_get0_data(name->d.dNSName)),
                        static_cast<size_t>(ASN1_STRING_length(name->d.dNSName)));
  }
  return result;
}

Certificate Describe(const X509* certificate) {
  return {NameText(X509_get_subject_name(certificate)), NameText(X509_get_issuer_name(certificate)),
          DnsNames(certificate), TimeOf(X509_get0_notBefore(certificate)),
          TimeOf(X509_get0_notAfter(certificate))};
}

// Verifies as OpenSSL does, and keeps what it saw.
int VerifyAndKeep(X509_STORE_CTX* context, void* user) {
  WebAnswer& answer = *static_cast<WebAnswer*>(user);
  const int result = X509_verify_cert(context);
  answer.verify_error = X509_STORE_CTX_get_error(context);
  answer.verify_text = X509_verify_cert_error_string(answer.verify_error);
  const int depth = X509_STORE_CTX_get_error_depth(context);
  answer.verify_depth = depth > 0 ? static_cast<size_t>(depth) : 0;
  answer.certificates.clear();
  if (const X509* const own = X509_STORE_CTX_get0_cert(context)) {
    answer.certificates.push_back(Describe(own));
  }
  const STACK_OF(X509)* const sent = X509_STORE_CTX_get0_untrusted(context);
  for (int i = 1; sent != nullptr && i < sk_X509_num(sent); ++i) {
    answer.certificates.push_back(Describe(sk_X509_value(sent, i)));
  }
  return result;
}

CURLcode SetUpTls(CURL*, void* context, void* user) {
  SSL_CTX_set_cert_verify_callback(static_cast<SSL_CTX*>(context), VerifyAndKeep, user);
  return CURLE_OK;
}

size_t KeepBody(char* data, size_t size, size_t count, void* user) {
  std::string& body = *static_cast<std::string*>(user);
  try {
    if (body.size() < kLongestBody) body.append(data, size * count);
  } catch (const std::bad_alloc&) {
    return 0;
  }
  return size * count;
}

// Keeps the server's time of the header.
size_t KeepHeader(char* data, size_t size, size_t count, void* user) {
  WebAnswer& answer = *static_cast<WebAnswer*>(user);
  try {
    const std::string line(data, size * count);
    if (line.size() > 5 && curl_strnequal(line.c_str(), "date:", 5)) {
      const time_t date = curl_getdate(line.c_str() + 5, nullptr);
      answer.date = date > 0 ? date : 0;
    }
  } catch (const std::bad_alloc&) {
    return 0;
  }
  return size * count;
}

std::string Text(CURL* handle, CURLINFO info) {
  char* text = nullptr;
  return curl_easy_getinfo(handle, info, &text) == CURLE_OK && text != nullptr ? text : "";
}

bool Happened(CURL* handle, CURLINFO info) {
  curl_off_t when = 0;
  return curl_easy_getinfo(handle, info, &when) == CURLE_OK && when > 0;
}

void Inspect(CURL* handle, WebAnswer& answer) {
  long os_error = 0;
  curl_easy_getinfo(handle, CURLINFO_OS_ERRNO, &os_error);
  answer.os_error = static_cast<int>(os_error);
  curl_easy_getinfo(handle, CURLINFO_RESPONSE_CODE, &answer.status);
  answer.address = Text(handle, CURLINFO_PRIMARY_IP);
  curl_off_t microseconds = 0;
  curl_easy_getinfo(handle, CURLINFO_TOTAL_TIME_T, &microseconds);
  answer.milliseconds = static_cast<long>(microseconds / 1000);
  answer.encrypted = Happened(handle, CURLINFO_APPCONNECT_TIME_T);
  answer.location = Text(handle, CURLINFO_REDIRECT_URL);
  answer.type = Text(handle, CURLINFO_CONTENT_TYPE);
}

}  // namespace

WebAnswer Fetch(const std::string& url, const std::string* body, int seconds) {
  const CurlState state;
  const Handle owner(curl_easy_init());
  CURL* const handle = owner.get();
  if (handle == nullptr) throw std::bad_alloc();

  WebAnswer answer;
  char error[CURL_ERROR_SIZE] = {};
  curl_easy_setopt(handle, CURLOPT_URL, url.c_str());
  if (body != nullptr) curl_easy_setopt(handle, CURLOPT_POSTFIELDS, body->c_str());
  curl_easy_setopt(handle, CURLOPT_WRITEFUNCTION, KeepBody);
  curl_easy_setopt(handle, CURLOPT_WRITEDATA, &answer.body);
  curl_easy_setopt(handle, CURLOPT_HEADERFUNCTION, KeepHeader);
  curl_easy_setopt(handle, CURLOPT_HEADERDATA, &answer);
  curl_easy_setopt(handle, CURLOPT_ERRORBUFFER, error);
  curl_easy_setopt(handle, CURLOPT_TIMEOUT, static_cast<long>(seconds));
  curl_easy_setopt(handle, CURLOPT_NOSIGNAL, 1L);
  // Without effect on a libcurl that is not built with OpenSSL: then the certificates stay unseen.
  curl_easy_setopt(handle, CURLOPT_SSL_CTX_FUNCTION, SetUpTls);
  curl_easy_setopt(handle, CURLOPT_SSL_CTX_DATA, &answer);

  answer.code = curl_easy_perform(handle);
  answer.received = time(nullptr);
  answer.detail = error[0] != '\0' ? error : curl_easy_strerror(answer.code);
  Inspect(handle, answer);
  return answer;
}

std::string TrustStore() {
  const curl_version_info_data* const version = curl_version_info(CURLVERSION_NOW);
  std::string store;
#if LIBCURL_VERSION_NUM >= 0x074600
  if (version->age >= CURLVERSION_SEVENTH) {
    if (version->cainfo != nullptr) store = version->cainfo;
    if (version->capath != nullptr)
      store += (store.empty() ? "" : ", ") + std::string(version->capath);
  }
#endif
  (void)version;
  return store.empty() ? "the system's store of certificate authorities" : store;
}

}  // namespace doctor
