#include "sso/internal/json.h"

#include <json/reader.h>
#include <json/writer.h>

#include "sso/internal/file.h"

namespace QOVA {
namespace SSO {

// jsoncpp deprecates these two; its newer reader accepts another language, and its newer writer
// formats differently.
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
  return ReadFile(path, text) && ParseJson(text, value);
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
