// Building a Windows command line from a program and its arguments.
// Internal to the product library; the tests use it directly.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace kxlprod {

// Longest command line Windows accepts, without its terminator.
constexpr std::size_t kMaxCommandLine = 32767;

// Appends one argument (after a separating blank when the line is not empty)
// so that the C run time's argument parser of the started program gives it
// back unchanged. An argument the caller has already wrapped in double quotes
// as a whole (no quote inside) is taken as quoted: it reaches the program
// without its quotes, and backslashes before its closing quote are doubled so
// they cannot escape it.
void appendArgument(std::string &line, std::string_view argument);

// The command line for an argument block: NUL-terminated strings, the first
// being the program's own name, ended by an empty string (at most
// kMaxCommandLine bytes are read). Returns false when the line would be longer
// than kMaxCommandLine.
bool commandLineFromBlock(const char *block, std::string &line);

// Splits a command text ("kxlset.exe -cleanup") into its program (first
// word, quotes removed) and the rest, which is kept as written.
void splitCommandText(std::string_view text, std::string &program, std::string &rest);

} // namespace kxlprod
