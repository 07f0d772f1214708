// The one way the engine forms a file path from a directory and a relative
// name, so that quoted directories stay quoted and no path buffer overflows.
#pragma once

#include <cstddef>
#include <cstdint>

inline constexpr uint32_t KXL_JOINED_PATH_SZ = 261;

// Writes `directory` + `name` into `buffer` (KXL_JOINED_PATH_SZ bytes). A
// directory ending in a double quote loses it; "\" is put between the two
// unless `name` brings it; the result is cut at 260 characters; a directory
// that began with a double quote gets a closing one when there is room.
void joinPath(char *buffer, const char *directory, const char *name);
