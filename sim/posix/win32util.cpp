#include "sim/posix/win32util.h"

#include "sim/posix/world.h"

#include <cerrno>
#include <cstring>
#include <sys/stat.h>

namespace kxlsim::posix {

DWORD copyStringOut(std::string_view text, LPSTR buffer, DWORD capacity) {
  if (buffer == nullptr || capacity <= text.size())
    return static_cast<DWORD>(text.size() + 1);
  std::memcpy(buffer, text.data(), text.size());
  buffer[text.size()] = '\0';
  return static_cast<DWORD>(text.size());
}

namespace {

bool parentExists(const std::string &host) {
  std::string trimmed = host;
  while (trimmed.size() > 1 && trimmed.back() == '/')
    trimmed.pop_back();
  auto slash = trimmed.rfind('/');
  if (slash == std::string::npos)
    return true;
  std::string parent = slash == 0 ? "/" : trimmed.substr(0, slash);
  struct stat info {};
  return stat(parent.c_str(), &info) == 0 && S_ISDIR(info.st_mode);
}

} // namespace

DWORD win32ErrorFromErrno(int err, const std::string &host) {
  switch (err) {
  case ENOENT:
    return parentExists(host) ? ERROR_FILE_NOT_FOUND : ERROR_PATH_NOT_FOUND;
  case ENOTDIR:
    return ERROR_PATH_NOT_FOUND;
  case EEXIST:
    return ERROR_ALREADY_EXISTS;
  case EACCES:
  case EPERM:
  case EROFS:
  case EISDIR:
    return ERROR_ACCESS_DENIED;
  case ENOTEMPTY:
    return ERROR_DIR_NOT_EMPTY;
  case ENAMETOOLONG:
    return ERROR_INVALID_NAME;
  case ENOMEM:
    return ERROR_NOT_ENOUGH_MEMORY;
  case EXDEV:
    return kErrorNotSameDevice;
  case EBADF:
    return ERROR_INVALID_HANDLE;
  default:
    return ERROR_ACCESS_DENIED;
  }
}

bool mapPath(LPCSTR windowsPath, std::string &host) {
  if (windowsPath == nullptr || *windowsPath == '\0' || !hostPath(windowsPath, host)) {
    SetLastError(ERROR_PATH_NOT_FOUND);
    return false;
  }
  return true;
}

} // namespace kxlsim::posix
