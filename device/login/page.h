// The HTML of the login program.
#pragma once

#include <string>

namespace page {

// SigningIn returns a page that goes on to `url` at once, and stays visible until that answers.
// `languages` is the browser's Accept-Language.
std::string SigningIn(const std::string& url, const std::string& languages);

}  // namespace page
