#include "page.h"

#include "cgi.h"

namespace page {

std::string SigningIn(const std::string& url, const std::string&) {
  return "<!DOCTYPE html>\n<html lang=\"en\">\n<head>\n<meta charset=\"utf-8\">\n"
         "<meta name=\"viewport\" content=\"width=device-width, initial-scale=1\">\n"
         "<meta http-equiv=\"refresh\" content=\"0;url=" +
         cgi::EscapeHTML(url) +
         "\">\n<title>Signing in</title>\n"
         "<link rel=\"stylesheet\" href=\"/webman/ssoclient/relay.css\">\n</head>\n"
         "<body>\n<main>\n<h1>Signing in …</h1>\n</main>\n</body>\n</html>\n";
}

}  // namespace page
