// What an HTTP answer says: the provider's refusals, and answers that are not the provider's.
#pragma once

#include <json/value.h>

#include <string>

#include "doctor/finding.h"
#include "doctor/web.h"

namespace doctor {

bool IsRedirect(const WebAnswer& answer);

// "HTTP 302, text/html, to https://..., "Title""
std::string Describe(const WebAnswer& answer);

// "error" and "error_description" of an OAuth error response.
std::string ErrorOf(const Json::Value& document);

// The provider's code in a text, with its meaning and action; also one that is not in the table.
struct Refusal {
  std::string code;  // empty: there is none
  std::string meaning;
  std::string action;
  bool about_secret = false;  // the client secret was refused
  bool plain = false;         // one of OAuth's general errors
};
Refusal RefusalIn(const std::string& text);

// What keeps the provider's answer away, if this is the answer of a captive portal, a firewall or
// a proxy; otherwise a finding without an identifier. `url` was requested.
Finding Stranger(const WebAnswer& answer, const std::string& url);

}  // namespace doctor
