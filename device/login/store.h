// A folder of short-lived secrets: what the login program must remember between two requests.
#pragma once

#include <optional>
#include <string>

// Store keeps small texts under random keys, each in a file of its own that only the web server's
// user can read, until they are taken or too old.
class Store {
 public:
  // `name` is a folder below /run/ssoclient, made when it is missing; texts older than `lifetime`
  // seconds are gone; at most `capacity` are kept.
  Store(const std::string& name, int lifetime, int capacity);

  // NewKey returns a key that nobody can guess: 64 hexadecimal digits.
  static std::string NewKey();

  // Put keeps a text under a new key. Throws std::runtime_error if it cannot be written, or the
  // store is full.
  void Put(const std::string& key, const std::string& text) const;

  // Get returns the text of a key, if there is one.
  std::optional<std::string> Get(const std::string& key) const;

  // Take returns the text of a key and forgets it: of several who ask at once, one gets it.
  std::optional<std::string> Take(const std::string& key) const;

 private:
  std::string Path(const std::string& key) const;
  void Sweep() const;

  std::string folder_;
  int lifetime_;
  int capacity_;
};
