// Name and language helpers of the product library. Internal; the tests use
// them directly.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace kxlprod {

// Copies `text` into `buffer` of `size` bytes, cut to fit and terminated.
// Returns false when it had to be cut (or there is no room at all).
bool copyBounded(const std::string &text, char *buffer, size_t size);

// A locale text ("de_DE.UTF-8@euro", "de-de", "C") as a message directory
// name: language in lower case, territory in upper case, codeset and
// modifier dropped; "C" and "POSIX" give "en_US". "" when the text is no
// usable locale name.
std::string normalizeLanguage(std::string_view locale);

// The environment's message language: the machine identity's "Language",
// else LC_ALL, else LANG, normalised; "en_US" when none is usable.
std::string environmentLanguage();

} // namespace kxlprod
