#include "doctor/json.h"

#include <json/reader.h>
#include <json/writer.h>

#include <algorithm>
#include <memory>

namespace doctor {

std::string Position(const std::string& text, size_t offset) {
  const auto end = text.begin() + static_cast<std::ptrdiff_t>(std::min(offset, text.size()));
  const auto line = 1 + std::count(text.begin(), end, '\n');
  const size_t start = text.rfind('\n', offset == 0 ? 0 : offset - 1);
  const size_t column = start == std::string::npos || start >= offset ? offset : offset - start - 1;
  return "line " + std::to_string(line) + ", column " + std::to_string(column + 1);
}

// The newer reader takes other texts for JSON than the one in the library.
#if defined(__GNUC__)
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wdeprecated-declarations"
#endif
bool ParseJson(const std::string& text, Json::Value& value, std::string& problem) {
  Json::Reader reader;
  try {
    if (reader.parse(text.data(), text.data() + text.size(), value, true)) return true;
  } catch (const Json::Exception&) {
    problem = "it is nested too deep";
    return false;
  }
  problem = "it is no JSON";
  for (const auto& error : reader.getStructuredErrors()) {
    problem = Position(text, static_cast<size_t>(std::max<std::ptrdiff_t>(error.offset_start, 0)));
    // Messages that begin with a quote repeat the text, which may be a secret.
    if (!error.message.empty() && error.message[0] != '\'') problem += ": " + error.message;
    break;
  }
  return false;
}
#if defined(__GNUC__)
#pragma GCC diagnostic pop
#endif

bool ParseJson(const std::string& text, Json::Value& value) {
  std::string problem;
  return ParseJson(text, value, problem);
}

OddJson FindOdd(const std::string& text) {
  const auto accepts = [&text](const char* rule) {
    Json::CharReaderBuilder builder;
    if (rule != nullptr) builder[rule] = true;
    Json::Value value;
    try {
      return std::unique_ptr<Json::CharReader>(builder.newCharReader())
          ->parse(text.data(), text.data() + text.size(), &value, nullptr);
    } catch (const Json::Exception&) {
      return false;
    }
  };
  if (!accepts(nullptr)) return {};
  return {!accepts("failIfExtra"), !accepts("rejectDupKeys")};
}

std::string WriteJson(const Json::Value& value, JsonStyle style) {
  Json::StreamWriterBuilder builder;
  builder["commentStyle"] = "None";
  builder["indentation"] = style == JsonStyle::kCompact ? "" : "  ";
  builder["emitUTF8"] = style == JsonStyle::kCompact;
  return Json::writeString(builder, value);
}

std::string TextOf(const Json::Value& value, const char* name) {
  if (!value.isObject()) return "";
  const Json::Value& member = value[name];
  return member.isConvertibleTo(Json::stringValue) ? member.asString() : "";
}

std::string StringOf(const Json::Value& value, const char* name) {
  return value.isObject() && value[name].isString() ? value[name].asString() : "";
}

std::string TypeName(const Json::Value& value) {
  switch (value.type()) {
    case Json::nullValue:
      return "null";
    case Json::intValue:
    case Json::uintValue:
    case Json::realValue:
      return "a number";
    case Json::stringValue:
      return "a string";
    case Json::booleanValue:
      return "a boolean";
    case Json::arrayValue:
      return "a list";
    case Json::objectValue:
      break;
  }
  return "an object";
}

}  // namespace doctor
