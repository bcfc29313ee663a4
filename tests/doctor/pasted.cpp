#include "pasted.h"

#include <cctype>

#include "doctor/explain.h"

namespace test {

namespace {

bool isPlainError(const std::string& name) {
  return name.find_first_not_of("abcdefghijklmnopqrstuvwxyz_") == std::string::npos;
}

std::string numberOf(const std::string& name) {
  return name.rfind("AADSTS", 0) == 0 ? name.substr(6) : "";
}

// A description around it, as providers write.
std::string described(const std::string& name) {
  if (isPlainError(name)) return "error: " + name + " (see the provider)";
  return name + ": The request by application '8f2f0c5e-0000-4000-8000-3f6a1c2b9d10' was refused.";
}

std::string hex(char c, bool upper) {
  const char* digits = upper ? "0123456789ABCDEF" : "0123456789abcdef";
  const auto value = static_cast<unsigned char>(c);
  return {digits[value >> 4], digits[value & 15]};
}

std::string percent(const std::string& text, bool upper) {
  std::string out;
  for (const char c : text) {
    if (std::isalnum(static_cast<unsigned char>(c)) != 0) {
      out += c;
    } else {
      out += c == ' ' && upper ? "+" : "%" + hex(c, upper);
    }
  }
  return out;
}

std::string each(const std::string& text, const std::string& before, const std::string& after) {
  std::string out;
  for (const char c : text) out += before + hex(c, false) + after;
  return out;
}

std::string json(const std::string& text) {
  std::string out;
  for (const char c : text) {
    if (c == '"' || c == '\\') out += '\\';
    out += c;
  }
  return R"({"error_description":")" + out +
         R"(\r\nTrace ID: 5f1c\r\nTimestamp: x","error":"other"})";
}

std::string html(const std::string& text) {
  std::string out;
  for (const char c : text) {
    const std::string entity = c == '<'    ? "&lt;"
                               : c == '"'  ? "&quot;"
                               : c == '&'  ? "&amp;"
                               : c == '\'' ? "&#39;"
                                           : std::string(1, c);
    out += entity;
  }
  return "<!DOCTYPE html><html><head><title>Sign in</title></head><body><div "
         "class=\"exceptionText\">" +
         out + "</div><p>Request Id: 5f1c</p></body></html>";
}

std::string between(const std::string& text, size_t every, const std::string& piece) {
  std::string out;
  for (size_t i = 0; i < text.size(); ++i) {
    if (i > 0 && i % every == 0) out += piece;
    out += text[i];
  }
  return out;
}

std::string lower(std::string text) {
  for (char& c : text) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return text;
}

std::string replaced(std::string text, char from, const std::string& to) {
  for (size_t at = 0; (at = text.find(from, at)) != std::string::npos; at += to.size())
    text.replace(at, 1, to);
  return text;
}

}  // namespace

void PrintTo(const Form& form, std::ostream* out) {
  *out << form.name;
}

std::vector<Form> formsOfMessages() {
  std::vector<Form> all;
  for (const Form& form : forms()) {
    if (!form.only_codes) all.push_back(form);
  }
  return all;
}

std::vector<Form> forms() {
  const std::string log = "Nov 22 10:15:03 device login.cgi[812]: ";
  return {
      {"Alone", false, [](const std::string& s) { return s; }},
      {"WithBlanksAround", false, [](const std::string& s) { return "\n " + s + " \r\n"; }},
      {"LogLine", true, [log](const std::string& s) { return log + described(s); }},
      {"LoginsLogLine", false,
       [log](const std::string& s) {
         const std::string text = isPlainError(s) ? "provider refused: " + s : s;
         return log + "sign-in failed: " + text;
       }},
      {"Query", true,
       [](const std::string& s) {
         return "https://device.example.net/webman/"
                "login.cgi?state=eyJub25jZSI6&error_description=" +
                percent(described(s), true);
       }},
      {"QueryInLowerCase", true,
       [](const std::string& s) {
         return "GET /webman/login.cgi?error_description=" + percent(described(s), false) +
                "&error_uri=x HTTP/1.1";
       }},
      {"RelayPage", false,
       [](const std::string& s) {
         return "https://device.example.net/webman/ssoclient/relay.html#success=false&reason=" +
                percent(s, false);
       }},
      {"Json", true, [](const std::string& s) { return json(described(s)); }},
      {"JsonError", true,
       [](const std::string& s) {
         return isPlainError(s) ? "{\"error\": \"" + s + "\"}" : json(described(s));
       }},
      {"JsonEscaped", true, [](const std::string& s) { return each(described(s), "\\u00", ""); }},
      {"JsonInJson", true,
       [](const std::string& s) {
         return "{\"message\":\"" + replaced(json(described(s)), '"', "\\\"") + "\"}";
       }},
      {"Page", false,
       [](const std::string& s) {
         return html(isPlainError(s) ? "error: " + s : "sign-in failed: " + s);
       }},
      {"PageOfEntities", true,
       [](const std::string& s) {
         std::string out;
         for (const char c : described(s)) out += "&#" + std::to_string(c) + ";";
         return out;
       }},
      {"PageOfHexEntities", true,
       [](const std::string& s) { return each(described(s), "&#x", ";"); }},
      {"JsonInPage", true, [](const std::string& s) { return html(json(described(s))); }},
      {"PageInQuery", true, [](const std::string& s) { return percent(html(described(s)), true); }},
      {"BoldPage", true,
       [](const std::string& s) {
         return "<p>error: <b>" + s + "</b>: The provider refused.</p>";
       }},
      {"WordBreaks", true, [](const std::string& s) { return "error: " + between(s, 4, "<wbr>"); }},
      {"SoftHyphens", true,
       [](const std::string& s) { return "error: " + between(s, 5, "\xc2\xad"); }},
      {"BrokenDescription", true,
       [](const std::string& s) {
         return described(s) +
                " The reply\n   address does not\r\nmatch the addresses\nof the application.";
       }},
      {"BrokenBefore", true,
       [](const std::string& s) { return "The provider said:\n  error:\n  " + s + ":\nno."; }},
      {"Mail", true,
       [](const std::string& s) { return "> > error: " + between(s, 9, "=\n") + ": x"; }},
      {"Coloured", true,
       [](const std::string& s) { return "error: \x1b[1;31m" + s + "\x1b[0m: x"; }},
      {"LowerCase", true,
       [](const std::string& s) { return isPlainError(s) ? "" : "failed with " + lower(s) + "."; }},
      {"ErrorCodes", true,
       [](const std::string& s) {
         return numberOf(s).empty() ? ""
                                    : "{\"error\":\"x\",\"error_codes\":[" + numberOf(s) + "]}";
       }},
      {"ErrorPage", true,
       [](const std::string& s) {
         return numberOf(s).empty() ? ""
                                    : "https://login.microsoftonline.com/error?code=" + numberOf(s);
       }},
      {"SignInLog", true,
       [](const std::string& s) {
         return numberOf(s).empty() ? ""
                                    : "Sign-in error code\n" + numberOf(s) + "\nFailure reason";
       }},
  };
}

std::string asLogged(const doctor::Message& message) {
  std::string text = message.text;
  if (text[0] == ' ') return "RS256" + text;
  if (text == "basic_string::substr: ")
    return text + "__pos (which is 12) > this->size() (which is 5)";
  if (text == "ERROR: %s") return "azuresso.cpp:61 ERROR: ENTERCriticalSection";
  for (size_t at; (at = text.find('%')) != std::string::npos;)
    text.replace(at, 2, text[at + 1] == 'd' ? "0" : "resuid");
  const bool log =
      message.group == doctor::MessageGroup::kLog || message.group == doctor::MessageGroup::kGuard;
  return log ? std::string(message.group == doctor::MessageGroup::kGuard ? "azuresso.cpp"
                                                                         : message.where) +
                   ":96 " + text
             : text;
}

std::vector<std::string> namesIn(const std::string& text) {
  std::vector<std::string> names;
  for (const doctor::Explanation& one : doctor::Explain(text)) names.push_back(one.name);
  return names;
}

std::vector<std::string> unrelatedTexts() {
  return {
      "",
      "all is well",
      "error",
      "Nov 22 10:15:03 device login.cgi[812]: signed in: AD\\alice",
      "Nov 22 10:15:03 device kernel: ata1.00: status: { DRDY ERR }",
      "curl: (28) Operation timed out after 10001 milliseconds",
      "fatal: unable to access 'https://git.example.org/': Timeout was reached",
      "wget: Failed: Couldn't connect to server",
      "The encryption algorithm is not supported by this cipher suite.",
      "SHA1 algorithm is not supported",
      "error code 50011 from the printer",
      "HTTP 404 Not Found",
      "HTTP/1.1 401 Unauthorized\r\nWWW-Authenticate: Bearer error=\"invalid_token\"",
      "order 7000215 was shipped",
      "AADSTS",
      "AADSTS: the prefix of the codes",
      "AADSTS1 AADSTS123456789",
      "CWOAU and CWWKS are prefixes",
      "CWWKF0011I: The defaultServer server is ready to run a smarter planet.",
      "CWWKZ0001I: Application demo started in 1.5 seconds.",
      "CWWKS4105I: LTPA configuration is ready after 0.7 seconds.",
      "CWOAU0061EX is no message",
      "CWOAU006E",
      "from django.contrib.auth.decorators import login_required",
      "@login_required\ndef page(request): return render(request)",
      "def test_access_denied_for_guests(self):",
      "nginx: [emerg] server_error_page is not a directive",
      "upstream temporarily_unavailable_since=0",
      "invalid_request_id: 5",
      "my_invalid_grant_handler()",
      "stripe.error.InvalidRequestError: No such customer",
      "calloc failed: Cannot allocate memory",
      "terminate called after throwing an instance of 'std::bad_alloc'",
      "EVP_DigestVerifyFinal failed in gpg-agent",
      "openssl: error:0A000086:SSL routines::certificate verify failed",
      "SSL connect error in the mail program",
      "sshd[411]: Failed password for alice from 192.0.2.7 port 50011 ssh2",
      "sudo: alice : user NOT in sudoers ; TTY=pts/0",
      "WARNING: settings (a, b, c) were changed",
      "ERROR: database is locked",
      "ERROR: EnterCriticalSection hangs in kernel32.dll",
      "Profile 'default' not found",
      "The user name cannot be found in the directory.",
      "token expired",
      "the client ID is invalid",
      "jwt malformed",
      "bad format!",
      "{\"status\":\"ok\",\"codes\":[50011,7000215]}",
      "{\"access_token\":\"eyJhbGciOiJSUzI1NiJ9.eyJzdWIiOiJhbGljZSJ9.c2ln\",\"token_type\":"
      "\"Bearer\"}",
      "https://device.example.net/webman/login.cgi?code=0.AXkA50011&state=eyJub25jZSI6",
      "<html><body><h1>502 Bad Gateway</h1></body></html>",
      "%41%42%43 %5Cu0041 &amp;amp; &#65;",
      "Die Anmeldung ist fehlgeschlagen. Bitte versuchen Sie es erneut.",
      "basic_string::append failed; basic_string_view: construction",
      "grep: libcurl.so.4: binary file matches",
      std::string(20000, 'A'),
      std::string(5000, '%') + std::string(5000, '\\') + std::string(5000, '&'),
  };
}

}  // namespace test
