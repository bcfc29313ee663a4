// A configuration file as it was found.
#pragma once

#include <sys/stat.h>

#include <string>

#include "doctor/checkup.h"
#include "doctor/keys.h"

namespace doctor {

struct File {
  const FileKind& kind;
  std::string path;
  int error = 0;  // errno of the failed open or read; 0: `text` holds the file
  struct stat status = {};
  std::string text = {};

  Place At(const std::string& key = "") const { return {path, key}; }
};

extern const char kFolder[];

// Reads the file without waiting for whatever it may be.
File Load(const FileKind& kind);

// A file that is probably meant to be this one: in other letters, with one more ending, misspelt,
// or in another folder; empty: none. As it may be shown.
std::string NearMiss(const std::string& name);

// Adds what is wrong with the file, its mode and its JSON. True if it holds a JSON object, which
// is then in `document`. `in_use`: a sign-in needs the file.
bool CheckFile(Checkup& checkup, const File& file, bool in_use, Json::Value& document);

// keys_check.cpp: the keys of the file, and what is wrong with their values in themselves.
void CheckKeys(Checkup& checkup, const File& file, bool in_use, const Json::Value& document);

}  // namespace doctor
