// The engine's path forms: the one way a file path is joined from a directory
// and a relative name, so that quoted directories stay quoted and no path
// buffer overflows, and the long spelling of a path.
#pragma once

#include <cstddef>
#include <cstdint>

inline constexpr uint32_t KXL_JOINED_PATH_SZ = 261;

// Writes `directory` + `name` into `buffer` (KXL_JOINED_PATH_SZ bytes). A
// directory ending in a double quote loses it; "\" is put between the two
// unless `name` brings it; the result is cut at 260 characters; a directory
// that began with a double quote gets a closing one when there is room.
void joinPath(char *buffer, const char *directory, const char *name);

// `path` with every existing component spelled as the file system has it
// (drive prefix and \\server kept); the rest from the first missing component
// on is kept as given. `output` holds `size` bytes and is always terminated.
void expandLongPath(const char *path, char *output, std::size_t size);
