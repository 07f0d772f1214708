// Windows command-line splitting, as the C run time and CommandLineToArgvW do.
#pragma once

#include <string>
#include <vector>

namespace kxlsim::posix {

// The program token: quoted up to the next quote (no escapes), else up to the
// first blank. `rest` receives what follows it.
std::string programToken(const std::string &commandLine, std::string &rest);

// Splits arguments: blanks separate; quotes group; 2n backslashes before a
// quote give n and the quote toggles quoting; 2n+1 give n and a literal
// quote; backslashes elsewhere are literal; "" inside quotes is a literal quote.
std::vector<std::string> splitArguments(const std::string &arguments);

} // namespace kxlsim::posix
