// Small helpers shared by the Win32 entry points of the simulated machine.
#pragma once

#include "platform/win32.h"

#include <string>
#include <string_view>

namespace kxlsim::posix {

// Error codes the surface reports that the public header does not list.
constexpr DWORD kErrorDirectory = 267;
constexpr DWORD kErrorBufferOverflow = 111;
constexpr DWORD kErrorNotSameDevice = 17;

// Sets the thread's last error and returns `result` (for one-line failure returns).
template <typename T> T failWith(DWORD code, T result) {
  SetLastError(code);
  return result;
}

// Windows' rule for "copy a string out": when it fits (with its NUL) it is
// copied and its length returned; otherwise nothing is copied and the size
// needed, NUL included, is returned.
DWORD copyStringOut(std::string_view text, LPSTR buffer, DWORD capacity);

// The Windows error for a failed host call on `host` (errno in `err`): a
// missing file whose directory exists is 2, a missing directory is 3.
DWORD win32ErrorFromErrno(int err, const std::string &host);

// ASCII case-insensitive equality, as Windows compares names.
inline bool equalsIgnoringCase(std::string_view a, std::string_view b) {
  if (a.size() != b.size())
    return false;
  for (size_t i = 0; i < a.size(); ++i) {
    unsigned char x = static_cast<unsigned char>(a[i]);
    unsigned char y = static_cast<unsigned char>(b[i]);
    if (x >= 'A' && x <= 'Z')
      x = static_cast<unsigned char>(x - 'A' + 'a');
    if (y >= 'A' && y <= 'Z')
      y = static_cast<unsigned char>(y - 'A' + 'a');
    if (x != y)
      return false;
  }
  return true;
}

// Maps a Windows path into the world; sets ERROR_PATH_NOT_FOUND when it
// cannot lie there.
bool mapPath(LPCSTR windowsPath, std::string &host);

} // namespace kxlsim::posix
