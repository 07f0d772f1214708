// Windows path helpers shared by the file, program and message families.
// Internal to the product library.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace kxlprod {

// True when `text` begins with `prefix`, ignoring ASCII case.
bool startsWithIgnoringCase(std::string_view text, std::string_view prefix);

// The path without one pair of enclosing double quotes: callers may pass paths
// wrapped in quotes (a directory with blanks keeps them), which the file
// system does not accept.
std::string unquotedPath(const char *path);

// dir + "\" + name (no doubled backslash).
std::string joinPath(const std::string &dir, const std::string &name);

// The directory part of a path ("" when it has none).
std::string parentPath(const std::string &path);

// True for "C:", "C:\" and "\\server\share" roots and the empty path.
bool isRootPath(const std::string &path);

// True when the path names an existing directory.
bool isDirectoryPath(const std::string &path);

// Creates the directory and, when `parents` is set, every missing directory
// above it. True when it exists as a directory afterwards.
bool createDirectoryTree(const std::string &path, bool parents);

// Removes a directory with everything in it (never a root); 0 or a library code.
int32_t removeDirectoryTree(const std::string &path);

// Installation path of the current installation, without a trailing
// backslash. False when it cannot be found.
bool currentInstallationPath(std::string &path);

} // namespace kxlprod
