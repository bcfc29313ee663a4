// The keys of the three files, and what the library does without each.
#pragma once

#include <json/value.h>

#include <string>
#include <vector>

#include "doctor/checkup.h"

namespace doctor {

struct Key {
  const char* name;
  Json::ValueType type;  // booleanValue or stringValue
  bool needed;           // a login fails without it
  const char* meaning;
};

struct FileKind {
  const char* name;
  Provider provider;  // kNone: the profile file
  bool secret;        // holds the client secret
  std::string prefix;
  std::vector<Key> keys;
};

extern const FileKind kFileKinds[3];

// The kind of a file of this name; null: none.
const FileKind* FindKind(const std::string& name);
const Key* FindKey(const FileKind& kind, const std::string& name);

// What the library says and does in a login without this key.
std::vector<Said> WithoutKey(const Checkup& checkup, const Key& key);

}  // namespace doctor
