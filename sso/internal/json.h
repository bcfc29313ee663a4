// How the library reads and writes JSON: all texts, files and members go through here. Not
// exported.
#pragma once

#include <json/value.h>

#include <string>

namespace QOVA {
namespace SSO {

// Parses the text between two addresses into `value`; false on any failure, too deep nesting
// included. `value` then holds what was read so far.
bool ParseJson(const char* begin, const char* end, Json::Value& value);

inline bool ParseJson(const std::string& text, Json::Value& value) {
  return ParseJson(text.data(), text.data() + text.size(), value);
}

// The compact text of `value`: non-ASCII escaped, a line feed at the end.
std::string WriteJson(const Json::Value& value);

// Reads and parses a whole file; false if it cannot be opened or read or is not JSON. Throws
// only when out of memory.
bool ReadJsonFile(const char* path, Json::Value& value);

// The member `name`, or null if there is none. A value that is not an object has no members.
const Json::Value* FindMember(const Json::Value& value, const char* name);

// The same, but null too if the member is not a string.
const Json::Value* FindString(const Json::Value& value, const char* name);

// The member `name` as text, empty if there is none; a number is given in decimal. Throws
// Json::LogicError for an array or an object.
std::string MemberText(const Json::Value& value, const char* name);

// Assigns the member `name` to `field` if it is there and of the right type.
void TakeSetting(const Json::Value& settings, const char* name, bool& field);
void TakeSetting(const Json::Value& settings, const char* name, std::string& field);

}  // namespace SSO
}  // namespace QOVA
