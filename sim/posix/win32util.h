// Small helpers shared by the Win32 entry points of the simulated machine.
#pragma once

#include "platform/win32.h"
#include "sim/common/names.h"

#include <string>
#include <string_view>

namespace kxlsim::posix {

using kxlsim::equalsIgnoringCase;

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

// Maps a Windows path into the world; sets ERROR_PATH_NOT_FOUND when it
// cannot lie there.
bool mapPath(LPCSTR windowsPath, std::string &host);

} // namespace kxlsim::posix
