#include "NT/pathjoin.h"

#include "platform/win32.h"

#include <cctype>
#include <cstdio>
#include <cstring>
#include <string>

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

void expandLongPath(const char *path, char *output, std::size_t size) {
  if (output == nullptr || size == 0)
    return;
  const char *in = path != nullptr ? path : "";
  std::string out;
  std::size_t i = 0;
  if (std::isalpha(static_cast<unsigned char>(in[0])) && in[1] == ':') {
    i = 2;
  } else if (in[0] == '\\' && in[1] == '\\') {
    const char *server = std::strchr(in + 2, '\\');
    i = server != nullptr ? static_cast<std::size_t>(server - in) : std::strlen(in);
  }
  out.assign(in, i);
  while (in[i] == '\\') {
    std::size_t end = i + 1;
    while (in[end] != '\0' && in[end] != '\\')
      ++end;
    std::size_t componentAt = out.size() + 1;
    out.append(in + i, end - i);
    WIN32_FIND_DATAA found;
    HANDLE search = FindFirstFileA(out.c_str(), &found);
    i = end;
    if (search == INVALID_HANDLE_VALUE)
      break;
    FindClose(search);
    out.resize(componentAt);
    out.append(found.cFileName);
  }
  out.append(in + i);
  std::snprintf(output, size, "%s", out.c_str());
}
