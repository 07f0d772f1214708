// CreateFileA and the handle operations over files and standard streams.
#include "sim/posix/filehandles.h"

#include "platform/win32.h"
#include "sim/common/simfail.h"
#include "sim/posix/win32util.h"
#include "sim/posix/world.h"

#include <cerrno>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

using namespace kxlsim::posix;

namespace kxlsim::posix {

FileObject::~FileObject() {
  if (owned && fd >= 0)
    close(fd);
}

} // namespace kxlsim::posix

namespace {


// open(2) flags for a creation disposition; false for an unknown one.
bool dispositionFlags(DWORD disposition, int &flags) {
  switch (disposition) {
  case CREATE_NEW:
    flags |= O_CREAT | O_EXCL;
    return true;
  case CREATE_ALWAYS:
    flags |= O_CREAT | O_TRUNC;
    return true;
  case OPEN_EXISTING:
    return true;
  case OPEN_ALWAYS:
    flags |= O_CREAT;
    return true;
  case TRUNCATE_EXISTING:
    flags |= O_TRUNC;
    return true;
  default:
    return false;
  }
}

int accessFlags(DWORD desiredAccess) {
  bool reads = (desiredAccess & GENERIC_READ) != 0;
  bool writes = (desiredAccess & GENERIC_WRITE) != 0;
  if (reads && writes)
    return O_RDWR;
  return writes ? O_WRONLY : O_RDONLY;
}

FileObject *fileOf(HANDLE handle) {
  return lookupHandleAs<FileObject>(handle);
}

} // namespace

extern "C" {

HANDLE CreateFileA(LPCSTR lpFileName, DWORD dwDesiredAccess, DWORD, LPSECURITY_ATTRIBUTES,
                   DWORD dwCreationDisposition, DWORD, HANDLE) {
  if (kxlsim::shouldFail("CreateFileA"))
    return failWith(ERROR_ACCESS_DENIED, INVALID_HANDLE_VALUE);
  int flags = accessFlags(dwDesiredAccess) | O_CLOEXEC;
  if (!dispositionFlags(dwCreationDisposition, flags) ||
      (dwCreationDisposition == TRUNCATE_EXISTING && (dwDesiredAccess & GENERIC_WRITE) == 0))
    return failWith(ERROR_INVALID_PARAMETER, INVALID_HANDLE_VALUE);
  std::string host;
  if (!mapPath(lpFileName, host))
    return INVALID_HANDLE_VALUE;
  struct stat before {};
  bool existed = stat(host.c_str(), &before) == 0;
  if (existed && S_ISDIR(before.st_mode))
    return failWith(ERROR_ACCESS_DENIED, INVALID_HANDLE_VALUE);
  if (existed && dwCreationDisposition == CREATE_NEW)
    return failWith(ERROR_FILE_EXISTS, INVALID_HANDLE_VALUE);
  if (existed && (flags & (O_WRONLY | O_RDWR | O_TRUNC)) != 0 && (before.st_mode & S_IWUSR) == 0)
    return failWith(ERROR_ACCESS_DENIED, INVALID_HANDLE_VALUE);
  int fd = open(host.c_str(), flags, 0666);
  if (fd < 0)
    return failWith(errno == EEXIST ? ERROR_FILE_EXISTS : win32ErrorFromErrno(errno, host),
                    INVALID_HANDLE_VALUE);
  if (!existed)
    noteEntryAdded(host);
  auto file = std::make_unique<FileObject>();
  file->fd = fd;
  bool reportsExisting = dwCreationDisposition == CREATE_ALWAYS || dwCreationDisposition == OPEN_ALWAYS;
  SetLastError(existed && reportsExisting ? ERROR_ALREADY_EXISTS : ERROR_SUCCESS);
  return registerHandle(std::move(file));
}

BOOL ReadFile(HANDLE hFile, LPVOID lpBuffer, DWORD nNumberOfBytesToRead, LPDWORD lpNumberOfBytesRead,
              LPOVERLAPPED) {
  if (lpNumberOfBytesRead != nullptr)
    *lpNumberOfBytesRead = 0;
  if (kxlsim::shouldFail("ReadFile"))
    return failWith(ERROR_READ_FAULT, FALSE);
  FileObject *file = fileOf(hFile);
  if (file == nullptr)
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  DWORD total = 0;
  auto *into = static_cast<char *>(lpBuffer);
  while (total < nNumberOfBytesToRead) {
    ssize_t got = read(file->fd, into + total, nNumberOfBytesToRead - total);
    if (got < 0 && errno == EINTR)
      continue;
    if (got < 0)
      return failWith(errno == EBADF ? ERROR_ACCESS_DENIED : ERROR_READ_FAULT, FALSE);
    if (got == 0)
      break;
    total += static_cast<DWORD>(got);
  }
  if (lpNumberOfBytesRead != nullptr)
    *lpNumberOfBytesRead = total;
  return TRUE;
}

BOOL WriteFile(HANDLE hFile, LPCVOID lpBuffer, DWORD nNumberOfBytesToWrite, LPDWORD lpNumberOfBytesWritten,
               LPOVERLAPPED) {
  if (lpNumberOfBytesWritten != nullptr)
    *lpNumberOfBytesWritten = 0;
  if (kxlsim::shouldFail("WriteFile"))
    return failWith(ERROR_WRITE_FAULT, FALSE);
  FileObject *file = fileOf(hFile);
  if (file == nullptr)
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  DWORD total = 0;
  const auto *from = static_cast<const char *>(lpBuffer);
  while (total < nNumberOfBytesToWrite) {
    ssize_t put = write(file->fd, from + total, nNumberOfBytesToWrite - total);
    if (put < 0 && errno == EINTR)
      continue;
    if (put <= 0)
      return failWith(errno == EBADF ? ERROR_ACCESS_DENIED : ERROR_WRITE_FAULT, FALSE);
    total += static_cast<DWORD>(put);
  }
  if (lpNumberOfBytesWritten != nullptr)
    *lpNumberOfBytesWritten = total;
  return TRUE;
}

DWORD GetFileSize(HANDLE hFile, LPDWORD lpFileSizeHigh) {
  if (kxlsim::shouldFail("GetFileSize"))
    return failWith(ERROR_INVALID_HANDLE, INVALID_FILE_SIZE);
  FileObject *file = fileOf(hFile);
  struct stat info {};
  if (file == nullptr || fstat(file->fd, &info) != 0)
    return failWith(ERROR_INVALID_HANDLE, INVALID_FILE_SIZE);
  unsigned long long size = static_cast<unsigned long long>(info.st_size);
  if (lpFileSizeHigh != nullptr)
    *lpFileSizeHigh = static_cast<DWORD>(size >> 32);
  SetLastError(ERROR_SUCCESS);
  return static_cast<DWORD>(size & 0xFFFFFFFFULL);
}

BOOL CloseHandle(HANDLE hObject) {
  if (kxlsim::shouldFail("CloseHandle"))
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  HandleObject *object = lookupHandle(hObject);
  if (object == nullptr || !object->closableByCloseHandle())
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  if (!object->persistent())
    releaseHandle(hObject);
  return TRUE;
}

} // extern "C"
