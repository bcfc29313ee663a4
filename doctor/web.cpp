#include "doctor/web.h"

#include <netdb.h>
#include <openssl/ssl.h>
#include <openssl/x509v3.h>

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <memory>
#include <new>

#include "doctor/text.h"
#include "doctor/url.h"

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

// What the callbacks of a transfer need.
struct Transfer {
  WebAnswer answer;
  std::string host;
  bool lenient;
};

// Verifies as OpenSSL does, and keeps what it saw.
int VerifyAndKeep(X509_STORE_CTX* context, void* user) {
  const Transfer& transfer = *static_cast<Transfer*>(user);
  WebAnswer& answer = static_cast<Transfer*>(user)->answer;
  const int result = X509_verify_cert(context);
  answer.verify_error = X509_STORE_CTX_get_error(context);
  answer.verify_text = X509_verify_cert_error_string(answer.verify_error);
  const int depth = X509_STORE_CTX_get_error_depth(context);
  answer.verify_depth = depth > 0 ? static_cast<size_t>(depth) : 0;
  answer.certificates.clear();
  if (X509* const own = X509_STORE_CTX_get0_cert(context)) {
    answer.certificates.push_back(Describe(own));
    const std::string& host = transfer.host;
    answer.names_host = X509_check_host(own, host.data(), host.size(), 0, nullptr) == 1 ||
                        X509_check_ip_asc(own, host.c_str(), 0) == 1;
  }
  const STACK_OF(X509)* const sent = X509_STORE_CTX_get0_untrusted(context);
  for (int i = 1; sent != nullptr && i < sk_X509_num(sent); ++i) {
    answer.certificates.push_back(Describe(sk_X509_value(sent, i)));
  }
  if (!transfer.lenient) return result;
  X509_STORE_CTX_set_error(context, X509_V_OK);
  return 1;
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

// Keeps what the header says about the server's time and about who answers.
size_t KeepHeader(char* data, size_t size, size_t count, void* user) {
  WebAnswer& answer = *static_cast<WebAnswer*>(user);
  try {
    const std::string line(data, size * count);
    const std::string name = LowerCase(line.substr(0, line.find(':')));
    if (name == "date") {
      const time_t date = curl_getdate(line.c_str() + 5, nullptr);
      answer.date = date > 0 ? date : 0;
    } else if (name == "www-authenticate") {
      answer.asks_login = true;
    } else if (name == "via" || name == "server" || name.compare(0, 8, "x-squid-") == 0) {
      answer.via += line.substr(0, line.find_first_of("\r\n")) + " ";
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
  curl_easy_getinfo(handle, CURLINFO_HTTP_CONNECTCODE, &answer.connect_status);
  answer.address = Text(handle, CURLINFO_PRIMARY_IP);
  curl_off_t microseconds = 0;
  curl_easy_getinfo(handle, CURLINFO_TOTAL_TIME_T, &microseconds);
  answer.milliseconds = static_cast<long>(microseconds / 1000);
  // Not the time to connect: some libcurls set it only when the TLS handshake is done too.
  answer.connected = !answer.address.empty();
  answer.encrypted = Happened(handle, CURLINFO_APPCONNECT_TIME_T);
  answer.location = Text(handle, CURLINFO_REDIRECT_URL);
  answer.type = Text(handle, CURLINFO_CONTENT_TYPE);
}

// The IP addresses of a host, separated by blanks.
std::string AddressesOf(const std::string& host) {
  struct addrinfo hints = {};
  hints.ai_socktype = SOCK_STREAM;
  struct addrinfo* found = nullptr;
  if (host.empty() || getaddrinfo(host.c_str(), nullptr, &hints, &found) != 0) return "";
  const std::unique_ptr<struct addrinfo, Deleter<freeaddrinfo>> owner(found);
  std::string all;
  for (const struct addrinfo* one = found; one != nullptr; one = one->ai_next) {
    char text[NI_MAXHOST];
    if (getnameinfo(one->ai_addr, one->ai_addrlen, text, sizeof text, nullptr, 0, NI_NUMERICHOST) ==
        0)
      all += (all.empty() ? "" : " ") + std::string(text);
  }
  return all;
}

}  // namespace

WebAnswer Fetch(const std::string& url, const std::string* body, int seconds, bool lenient) {
  const CurlState state;
  const Handle owner(curl_easy_init());
  CURL* const handle = owner.get();
  if (handle == nullptr) throw std::bad_alloc();

  Transfer transfer{{}, ParsedUrl(url).host(), lenient};
  WebAnswer& answer = transfer.answer;
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
  curl_easy_setopt(handle, CURLOPT_SSL_CTX_DATA, &transfer);
  curl_easy_setopt(handle, CURLOPT_SUPPRESS_CONNECT_HEADERS, 1L);
  if (lenient) {  // the device itself
    curl_easy_setopt(handle, CURLOPT_SSL_VERIFYHOST, 0L);
    curl_easy_setopt(handle, CURLOPT_PROXY, "");
  }

  answer.code = curl_easy_perform(handle);
  answer.received = time(nullptr);
  answer.detail = error[0] != '\0' ? error : curl_easy_strerror(answer.code);
  Inspect(handle, answer);
  if (!answer.connected && (lenient || ProxyFor(url).empty())) {
    answer.address = AddressesOf(transfer.host);
  }
  return answer;
}

std::string ProxyFor(const std::string& url) {
  const ParsedUrl parsed(url);
  const auto value = [](const char* name) {
    const char* const text = std::getenv(name);
    return std::string(text != nullptr ? text : "");
  };
  std::string except = value("no_proxy") + value("NO_PROXY");
  for (size_t at = 0; at < except.size();) {
    const size_t end = std::min(except.find_first_of(", ", at), except.size());
    std::string name = LowerCase(except.substr(at, end - at));
    at = end + 1;
    if (name == "*") return "";
    if (!name.empty() && name[0] == '.') name.erase(0, 1);
    if (!name.empty() && (parsed.host() == name || EndsWith(parsed.host(), "." + name))) return "";
  }
  const bool plain = parsed.scheme() == "http";  // HTTP_PROXY would come from a CGI request
  for (const char* name : {plain ? "http_proxy" : "https_proxy", plain ? "" : "HTTPS_PROXY",
                           "all_proxy", "ALL_PROXY"}) {
    if (*name != '\0' && !value(name).empty()) return value(name);
  }
  return "";
}

BundleTime ReadBundle() {
  const std::string bundle = TrustStore().substr(0, TrustStore().find(", "));
  BundleTime least;
  for (int i = 0; i < 3; ++i) {  // the first time is longer
    const std::unique_ptr<SSL_CTX, Deleter<SSL_CTX_free>> context(SSL_CTX_new(TLS_client_method()));
    const auto start = std::chrono::steady_clock::now();
    const std::clock_t begun = std::clock();
    if (context == nullptr ||
        SSL_CTX_load_verify_locations(context.get(), bundle.c_str(), nullptr) != 1) {
      return {};
    }
    const std::chrono::duration<double, std::milli> taken =
        std::chrono::steady_clock::now() - start;
    const double processor = 1000.0 * static_cast<double>(std::clock() - begun) / CLOCKS_PER_SEC;
    if (i == 0 || taken.count() < least.clock) least = {taken.count(), processor};
  }
  return least;
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
