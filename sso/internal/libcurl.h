// libcurl, as much of it as the library calls.
//
// A program that redirects a browser or asks for the settings makes no request, and libcurl with
// the thirty libraries behind it would be most of what it waits for. So the first request loads
// libcurl, unless the library was built with SSOCLIENT_LATE_CURL=OFF. Defined in libcurl.cpp; not
// exported.
#pragma once

#include <curl/curl.h>

namespace QOVA {
namespace SSO {

struct Curl {
  decltype(&curl_global_init) global_init;
  decltype(&curl_global_cleanup) global_cleanup;
  decltype(&curl_easy_init) easy_init;
  decltype(&curl_easy_cleanup) easy_cleanup;
  decltype(&curl_easy_setopt) easy_setopt;
  decltype(&curl_easy_perform) easy_perform;
  decltype(&curl_easy_strerror) easy_strerror;
};

// libcurl's functions. Throws sso_err_resp with the dynamic linker's text if they cannot be had;
// the next call tries again.
const Curl& LoadCurl();

// curl_global_cleanup, unless libcurl cannot be loaded: then there is nothing to clean up.
void CleanUpCurl();

}  // namespace SSO
}  // namespace QOVA
