// MD5 is deprecated in OpenSSL 3, and is what the state carries.
#define OPENSSL_API_COMPAT 0x10100000L

#include "sso/utils.h"

#include <fcntl.h>
#include <json/reader.h>
#include <json/writer.h>
#include <openssl/md5.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <new>

#include "platform/platform.h"
#include "sso/internal/encoding.h"
#include "sso/internal/json.h"
#include "sso/internal/libcurl.h"
#include "sso/internal/owned.h"

namespace QOVA {
namespace SSO {

namespace {

constexpr char kUnit[] = "utils.cpp";

using WriteFunction = unsigned (*)(void* data, unsigned size, unsigned count, void* userData);

// libcurl's state, set up and torn down around every transfer.
class CurlState {
 public:
  explicit CurlState(const Curl& library) : curl(library) { curl.global_init(CURL_GLOBAL_ALL); }
  ~CurlState() { curl.global_cleanup(); }
  CurlState(const CurlState&) = delete;
  CurlState& operator=(const CurlState&) = delete;

 private:
  const Curl& curl;
};

// libcurl's type has size_t where ours has unsigned. It passes at most its own buffer's size, and
// the calling conventions of the supported targets carry values below 2^32 alike in both types.
curl_write_callback CurlFunction(WriteFunction writeFn) {
  return reinterpret_cast<curl_write_callback>(reinterpret_cast<void (*)()>(writeFn));
}

// A POST of `body`, or a GET if it is null.
void Transfer(const std::string& url, const std::string* body, std::string& response,
              bool verifySSL, WriteFunction writeFn) {
  const Curl& curl = LoadCurl();
  const CurlState state(curl);
  const std::unique_ptr<CURL, decltype(curl.easy_cleanup)> owner(curl.easy_init(),
                                                                 curl.easy_cleanup);
  CURL* const handle = owner.get();
  if (handle == nullptr) throw std::bad_alloc();

  curl.easy_setopt(handle, CURLOPT_URL, url.c_str());
  if (body != nullptr) curl.easy_setopt(handle, CURLOPT_POSTFIELDS, body->c_str());
  curl.easy_setopt(handle, CURLOPT_WRITEFUNCTION, CurlFunction(writeFn));
  curl.easy_setopt(handle, CURLOPT_WRITEDATA, &response);
  if (!verifySSL) {
    curl.easy_setopt(handle, CURLOPT_SSL_VERIFYHOST, 0L);
    curl.easy_setopt(handle, CURLOPT_SSL_VERIFYPEER, 0L);
  }

  const CURLcode result = curl.easy_perform(handle);
  if (result != CURLE_OK) throw sso_err_resp(curl.easy_strerror(result));
}

// An open file.
class File {
 public:
  explicit File(const char* path) : descriptor(open(path, O_RDONLY | O_CLOEXEC)) {}
  ~File() {
    if (descriptor >= 0) close(descriptor);
  }
  File(const File&) = delete;
  File& operator=(const File&) = delete;

  // Appends all that is left of the file to `text`.
  bool ReadAll(std::string& text) const {
    char chunk[4096];
    for (;;) {
      const ssize_t count = read(descriptor, chunk, sizeof chunk);
      if (count == 0) return true;
      if (count > 0) {
        text.append(chunk, static_cast<size_t>(count));
      } else if (errno != EINTR) {
        return false;  // not open, a directory, or a broken read
      }
    }
  }

 private:
  const int descriptor;
};

}  // namespace

sso_exception::sso_exception(const std::string& message) : std::runtime_error(message) {}
sso_exception::~sso_exception() = default;

sso_err_resp::sso_err_resp(const std::string& message) : sso_exception(message) {}
sso_err_resp::~sso_err_resp() = default;

sso_op_failed::sso_op_failed(const std::string& message) : sso_exception(message) {}
sso_op_failed::~sso_op_failed() = default;

sso_not_implemented::sso_not_implemented(const std::string& message) : sso_exception(message) {}
sso_not_implemented::~sso_not_implemented() = default;

void httpGet(const std::string& url, std::string& response, bool verifySSL,
             unsigned (*writeFn)(void* data, unsigned size, unsigned count, void* userData)) {
  Transfer(url, nullptr, response, verifySSL, writeFn);
}

void httpPost(const std::string& url, const std::string& body, std::string& response,
              bool verifySSL,
              unsigned (*writeFn)(void* data, unsigned size, unsigned count, void* userData)) {
  Transfer(url, &body, response, verifySSL, writeFn);
}

void AppendURLEncoded(const std::string& value, std::string& text) {
  const size_t capacity = 3 * value.size();
  const CText encoded(static_cast<char*>(std::calloc(capacity + 1, 1)));
  if (encoded != nullptr && QOVACGIURLEncode(value.c_str(), encoded.get(), capacity) == 0) {
    text += encoded.get();
  } else {
    text += value;  // unencoded: callers cannot tell
  }
}

std::string URLEncode(const std::string& text) {
  std::string encoded;
  AppendURLEncoded(text, encoded);
  return encoded;
}

std::string MD5Digest(std::string text) {
  std::string result;
  unsigned char digest[MD5_DIGEST_LENGTH];
  if (MD5(reinterpret_cast<const unsigned char*>(text.data()), text.size(), digest) == nullptr) {
    syslog(LOG_ERR, "%s:%d MD5 digest failed %m", kUnit, __LINE__);
    return result;
  }
  const CText hex(static_cast<char*>(std::calloc(2 * sizeof digest + 1, 1)));
  if (hex == nullptr) {
    syslog(LOG_ERR, "%s:%d calloc failed. %m", kUnit, __LINE__);
    return result;
  }
  char* out = hex.get();
  for (const unsigned char byte : digest) {
    *out++ = "0123456789abcdef"[byte >> 4];
    *out++ = "0123456789abcdef"[byte & 15];
  }
  result = hex.get();
  return result;
}

// jsoncpp would rather see its newer reader and writer used; their language and output differ.
#if defined(__GNUC__)
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wdeprecated-declarations"
#endif
bool ParseJson(const char* begin, const char* end, Json::Value& value) {
  try {
    return Json::Reader().parse(begin, end, value, true);
  } catch (const Json::Exception&) {
    return false;  // nested deeper than the reader goes
  }
}

std::string WriteJson(const Json::Value& value) {
  return Json::FastWriter().write(value);
}
#if defined(__GNUC__)
#pragma GCC diagnostic pop
#endif

bool ReadJsonFile(const char* path, Json::Value& value) {
  std::string text;
  return File(path).ReadAll(text) && ParseJson(text, value);
}

const Json::Value* FindMember(const Json::Value& value, const char* name) {
  if (!value.isObject()) return nullptr;
  return value.find(name, name + std::char_traits<char>::length(name));
}

const Json::Value* FindString(const Json::Value& value, const char* name) {
  const Json::Value* const member = FindMember(value, name);
  return member != nullptr && member->isString() ? member : nullptr;
}

std::string MemberText(const Json::Value& value, const char* name) {
  const Json::Value* const member = FindMember(value, name);
  return member != nullptr ? member->asString() : std::string();
}

bool HasText(const Json::Value& value, const std::string& text) {
  const char* begin = nullptr;
  const char* end = nullptr;
  if (!value.getString(&begin, &end)) return value.asString() == text;  // not a string
  return std::equal(begin, end, text.begin(), text.end());
}

void TakeSetting(const Json::Value& settings, const char* name, bool& field) {
  const Json::Value* const member = FindMember(settings, name);
  if (member != nullptr && member->isBool()) field = member->asBool();
}

void TakeSetting(const Json::Value& settings, const char* name, std::string& field) {
  const Json::Value* const member = FindString(settings, name);
  if (member != nullptr) field = member->asString();
}

}  // namespace SSO
}  // namespace QOVA
