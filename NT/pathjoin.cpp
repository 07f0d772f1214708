#include "NT/pathjoin.h"

#include <cstring>

namespace {

constexpr std::size_t kMaxChars = KXL_JOINED_PATH_SZ - 1;

// Appends at most `length` characters, never past the path's capacity.
void appendBounded(char *buffer, std::size_t &used, const char *text, std::size_t length) {
  std::size_t room = kMaxChars - used;
  std::size_t n = length < room ? length : room;
  std::memcpy(buffer + used, text, n);
  used += n;
  buffer[used] = '\0';
}

} // namespace

void joinPath(char *buffer, const char *directory, const char *name) {
  const char *dir = directory != nullptr ? directory : "";
  const char *file = name != nullptr ? name : "";
  std::size_t dirLength = std::strlen(dir);
  bool quoted = dirLength > 0 && dir[0] == '"';
  if (dirLength > 0 && dir[dirLength - 1] == '"')
    --dirLength;
  std::size_t used = 0;
  buffer[0] = '\0';
  appendBounded(buffer, used, dir, dirLength);
  if (file[0] != '\\')
    appendBounded(buffer, used, "\\", 1);
  appendBounded(buffer, used, file, std::strlen(file));
  if (quoted && used < kMaxChars)
    appendBounded(buffer, used, "\"", 1);
}
