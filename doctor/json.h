// How the doctor reads JSON: by the library's rules, with the same reader. Its
// leniency, and its limits.
#pragma once

#include <json/value.h>

#include <string>

namespace doctor {

// Parses like the library does. On failure `problem` says where and, as far as that can be told
// without repeating the text, why.
bool ParseJson(const std::string& text, Json::Value& value, std::string& problem);
bool ParseJson(const std::string& text, Json::Value& value);

// "line 2, column 5"
std::string Position(const std::string& text, size_t offset);

// What the library's reader lets pass, though it is hardly meant.
struct OddJson {
  bool text_behind = false;  // the document
  bool key_twice = false;
};
OddJson FindOdd(const std::string& text);

enum class JsonStyle { kCompact, kForPeople };
// kForPeople escapes what is not ASCII; kCompact keeps all bytes as they are.
std::string WriteJson(const Json::Value& value, JsonStyle style);

// The member's text: as it is for a string, in decimal for a number, empty for the rest.
std::string TextOf(const Json::Value& value, const char* name);

// The member if it is a string, otherwise empty.
std::string StringOf(const Json::Value& value, const char* name);

// "a number", "a list", ...
std::string TypeName(const Json::Value& value);

}  // namespace doctor
