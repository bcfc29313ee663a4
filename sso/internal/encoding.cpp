#include "sso/internal/encoding.h"

#include "platform/platform.h"
#include "sso/common.h"
#include "sso/internal/owned.h"

namespace QOVA {
namespace SSO {

void AppendURLEncoded(const std::string& value, std::string& text) {
  const size_t capacity = 3 * value.size();
  const CText encoded(static_cast<char*>(std::calloc(capacity + 1, 1)));
  if (encoded != nullptr && QOVACGIURLEncode(value.c_str(), encoded.get(), capacity) == 0) {
    text += encoded.get();
  } else {
    text += value;  // unencoded: callers cannot tell
  }
}

std::string EncodeBase64(const std::string& bytes) {
  constexpr int kOption = 1;
  char text[1024] = {};
  if (QOVABase64Encode(bytes.data(), bytes.size(), text, sizeof text, kOption) == 0) {
    throw sso_op_failed("encode base64 failed.");
  }
  return text;
}

}  // namespace SSO
}  // namespace QOVA
