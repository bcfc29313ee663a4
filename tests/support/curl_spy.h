// Stands between the library and libcurl: records the calls, in order, and lets a test decide
// what a call gives back. Link support/curl_spy.cpp into the test program that needs it.
#pragma once

#include <curl/curl.h>

#include <functional>
#include <map>
#include <string>
#include <vector>

namespace test {

class CurlSpy {
 public:
  CurlSpy();  // records from here on; one at a time
  ~CurlSpy();
  CurlSpy(const CurlSpy&) = delete;
  CurlSpy& operator=(const CurlSpy&) = delete;

  // "global_init 3", "easy_init", "setopt URL", "perform", "easy_cleanup", "global_cleanup".
  // A cleanup of a null handle is not recorded: it does nothing.
  std::vector<std::string> calls;

  // What the options were last set to; of those that take a number, the number.
  std::map<int, const void*> pointers;
  std::map<int, long> numbers;

  bool noHandle = false;                            // curl_easy_init: null, errno ENOMEM
  CURLcode globalInitResult = CURLE_OK;             // after the real call
  CURLcode setoptResult = CURLE_OK;                 // after the real call
  std::function<CURLcode(CURL* handle)> onPerform;  // instead of the real call; may throw
};

}  // namespace test
