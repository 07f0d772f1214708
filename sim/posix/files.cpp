// Files and directories of the world: attributes, searches, create/remove,
// copy/move and the C run time's _access, with Windows' results and codes.
#include "platform/win32.h"
#include "sim/common/simfail.h"
#include "sim/posix/handles.h"
#include "sim/posix/reghelp.h"
#include "sim/posix/win32util.h"
#include "sim/posix/world.h"

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <linux/fs.h>
#include <string>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <sys/xattr.h>
#include <unistd.h>
#include <vector>

using namespace kxlsim::posix;

namespace {

constexpr unsigned long long kUnixEpochInFileTime = 116444736000000000ULL;

FILETIME toFileTime(const struct timespec &when) {
  unsigned long long ticks = static_cast<unsigned long long>(when.tv_sec) * 10000000ULL +
                             static_cast<unsigned long long>(when.tv_nsec) / 100ULL + kUnixEpochInFileTime;
  FILETIME result;
  result.dwLowDateTime = static_cast<DWORD>(ticks & 0xFFFFFFFFULL);
  result.dwHighDateTime = static_cast<DWORD>(ticks >> 32);
  return result;
}

DWORD attributesOf(const struct stat &info) {
  if (S_ISDIR(info.st_mode))
    return FILE_ATTRIBUTE_DIRECTORY;
  DWORD attributes = FILE_ATTRIBUTE_ARCHIVE;
  if ((info.st_mode & S_IWUSR) == 0)
    attributes |= FILE_ATTRIBUTE_READONLY;
  return attributes;
}

bool isReadOnlyFile(const struct stat &info) {
  return !S_ISDIR(info.st_mode) && (info.st_mode & S_IWUSR) == 0;
}

// Windows wildcard match: '*' any run, '?' one character, letters ignoring
// case; "*.*" matches every name, dotted or not.
bool wildcardMatch(const char *pattern, const char *name) {
  if (std::strcmp(pattern, "*.*") == 0)
    return true;
  const char *starPattern = nullptr;
  const char *starName = nullptr;
  while (*name != '\0') {
    if (*pattern == '*') {
      starPattern = ++pattern;
      starName = name;
    } else if (*pattern == '?' || (*pattern != '\0' && equalsIgnoringCase(std::string_view(pattern, 1),
                                                                          std::string_view(name, 1)))) {
      ++pattern;
      ++name;
    } else if (starPattern != nullptr) {
      pattern = starPattern;
      name = ++starName;
    } else {
      return false;
    }
  }
  while (*pattern == '*')
    ++pattern;
  return *pattern == '\0';
}

struct FindObject : HandleObject {
  std::vector<WIN32_FIND_DATAA> entries;
  size_t next = 0;
  bool closableByCloseHandle() const override { return false; }
};

// `folder` is the listed folder opened, so each entry costs one lookup in it
// rather than a walk of the whole path.
bool fillFindData(int folder, const std::string &name, WIN32_FIND_DATAA &data) {
  struct stat info {};
  if (name.size() >= MAX_PATH || fstatat(folder, name.c_str(), &info, 0) != 0)
    return false;
  std::memset(&data, 0, sizeof data);
  data.dwFileAttributes = attributesOf(info);
  data.ftCreationTime = toFileTime(info.st_ctim);
  data.ftLastAccessTime = toFileTime(info.st_atim);
  data.ftLastWriteTime = toFileTime(info.st_mtim);
  if (!S_ISDIR(info.st_mode)) {
    unsigned long long size = static_cast<unsigned long long>(info.st_size);
    data.nFileSizeHigh = static_cast<DWORD>(size >> 32);
    data.nFileSizeLow = static_cast<DWORD>(size & 0xFFFFFFFFULL);
  }
  std::snprintf(data.cFileName, sizeof data.cFileName, "%s", name.c_str());
  return true;
}

bool lessIgnoringCase(const std::string &a, const std::string &b) {
  return std::lexicographical_compare(a.begin(), a.end(), b.begin(), b.end(), [](char x, char y) {
    return std::tolower(static_cast<unsigned char>(x)) < std::tolower(static_cast<unsigned char>(y));
  });
}

// Names in `directory` matching `pattern`, sorted as a Windows volume lists
// them; "." and ".." head the list outside a drive's root, as on Windows.
// False, with errno set, when the folder cannot be read to its end.
bool matchingNames(const std::string &directory, const std::string &pattern,
                   std::vector<std::string> &names) {
  DIR *stream = opendir(directory.c_str());
  if (stream == nullptr)
    return false;
  for (;;) {
    errno = 0;
    const dirent *entry = readdir(stream);
    if (entry == nullptr)
      break;
    std::string name = entry->d_name;
    if (name != "." && name != ".." && wildcardMatch(pattern.c_str(), name.c_str()))
      names.push_back(name);
  }
  int readError = errno;
  closedir(stream);
  if (readError != 0) {
    errno = readError;
    return false;
  }
  std::sort(names.begin(), names.end(), lessIgnoringCase);
  std::string windowsDir = windowsPath(directory);
  bool driveRoot = windowsDir.size() <= 3;
  if (!driveRoot) {
    for (const char *dots : {"..", "."})
      if (wildcardMatch(pattern.c_str(), dots))
        names.insert(names.begin(), dots);
  }
  return true;
}

// Splits "dir\pattern" at the last separator.
void splitSearch(const std::string &search, std::string &directory, std::string &pattern) {
  auto cut = search.find_last_of("\\/");
  if (cut == std::string::npos) {
    auto colon = search.find(':');
    directory = colon == std::string::npos ? "." : search.substr(0, colon + 1);
    pattern = colon == std::string::npos ? search : search.substr(colon + 1);
    return;
  }
  directory = search.substr(0, cut + 1);
  pattern = search.substr(cut + 1);
}

bool statWindowsPath(LPCSTR path, std::string &host, struct stat &info) {
  if (!mapPath(path, host))
    return false;
  if (stat(host.c_str(), &info) != 0) {
    SetLastError(win32ErrorFromErrno(errno, host));
    return false;
  }
  return true;
}

// How the calls on an existing path begin: the injected fault (access
// denied), then the path mapped and looked at. False with the last error set.
bool startOnExisting(const char *function, LPCSTR path, std::string &host, struct stat &info) {
  if (kxlsim::shouldFail(function))
    return failWith(ERROR_ACCESS_DENIED, false);
  return statWindowsPath(path, host, info);
}

// The same for a copy or a move, whose target is mapped too.
bool startTransfer(const char *function, LPCSTR from, LPCSTR to, std::string &source, struct stat &info,
                   std::string &target) {
  return startOnExisting(function, from, source, info) && mapPath(to, target);
}

// What a content copy tells its caller's progress routine, as CopyFileExA
// does: the bytes copied so far after each piece, until it is told to be quiet.
class CopyReport {
public:
  CopyReport(LPPROGRESS_ROUTINE routine, LPVOID data, LPBOOL cancel)
      : routine_(routine), data_(data), cancel_(cancel) {}

  void sized(off_t total) { total_ = total; }

  // False when the caller stops the copy (its cancel flag, or its answer).
  bool tell(off_t done, DWORD reason) {
    if (cancel_ != nullptr && *cancel_)
      return false;
    if (routine_ == nullptr || quiet_)
      return true;
    LARGE_INTEGER total{}, copied{};
    total.QuadPart = total_;
    copied.QuadPart = done;
    DWORD answer = routine_(total, copied, total, copied, 1, reason, nullptr, nullptr, data_);
    quiet_ = answer == PROGRESS_QUIET;
    return answer == PROGRESS_CONTINUE || answer == PROGRESS_QUIET;
  }

private:
  LPPROGRESS_ROUTINE routine_;
  LPVOID data_;
  LPBOOL cancel_;
  off_t total_ = 0;
  bool quiet_ = false;
};

enum class CopyOutcome { Copied, Failed, Stopped };

// The kernel's copy piece by piece, so the caller hears of a large file's
// progress; Failed with errno at EXDEV and the like when it is not offered.
CopyOutcome kernelCopy(int from, int to, CopyReport &report, bool &started) {
  constexpr size_t kPiece = size_t(64) << 20;
  off_t done = 0;
  for (;;) {
    ssize_t got = copy_file_range(from, nullptr, to, nullptr, kPiece, 0);
    if (got < 0 && errno == EINTR)
      continue;
    if (got < 0)
      return CopyOutcome::Failed;
    if (got == 0)
      return CopyOutcome::Copied;
    started = true;
    done += got;
    if (!report.tell(done, CALLBACK_CHUNK_FINISHED))
      return CopyOutcome::Stopped;
  }
}

CopyOutcome copyByHand(int from, int to, CopyReport &report) {
  std::vector<char> chunk(size_t(1) << 20);
  off_t done = 0;
  for (;;) {
    ssize_t got = read(from, chunk.data(), chunk.size());
    if (got < 0 && errno == EINTR)
      continue;
    if (got <= 0)
      return got == 0 ? CopyOutcome::Copied : CopyOutcome::Failed;
    for (ssize_t put = 0, offset = 0; offset < got; offset += put) {
      put = write(to, chunk.data() + offset, static_cast<size_t>(got - offset));
      if (put < 0 && errno == EINTR)
        put = 0;
      else if (put <= 0)
        return CopyOutcome::Failed;
    }
    done += got;
    if (!report.tell(done, CALLBACK_CHUNK_FINISHED))
      return CopyOutcome::Stopped;
  }
}

// Shares the source's blocks where the file system can (FICLONE), else lets
// the kernel copy (copy_file_range), else reads and writes large blocks.
CopyOutcome copyFileContents(int from, int to, off_t size, CopyReport &report) {
  report.sized(size);
  if (!report.tell(0, CALLBACK_STREAM_SWITCH))
    return CopyOutcome::Stopped;
  if (ioctl(to, FICLONE, from) == 0)
    return report.tell(size, CALLBACK_CHUNK_FINISHED) ? CopyOutcome::Copied : CopyOutcome::Stopped;
  bool started = false;
  CopyOutcome outcome = kernelCopy(from, to, report, started);
  bool offered = started || (errno != EXDEV && errno != EINVAL && errno != ENOSYS && errno != EOPNOTSUPP);
  if (outcome != CopyOutcome::Failed || offered)
    return outcome;
  return copyByHand(from, to, report);
}

// Extended attributes as `cp -a` copies them: each one the source lists,
// where this process may read it and the target's file system takes it. One
// that cannot be copied is left out without failing the copy, as `cp -a`
// leaves it (its warning aside: the Win32 call has no channel for one).
void copyExtendedAttributes(int from, int to) {
  char listed[4096];
  std::vector<char> larger;
  char *names = listed;
  ssize_t length = flistxattr(from, listed, sizeof listed);
  if (length < 0 && errno == ERANGE) {
    ssize_t wanted = flistxattr(from, nullptr, 0);
    larger.resize(wanted > 0 ? static_cast<size_t>(wanted) : 0);
    names = larger.data();
    length = larger.empty() ? -1 : flistxattr(from, names, larger.size());
  }
  std::vector<char> value;
  for (ssize_t at = 0; at < length; at += static_cast<ssize_t>(std::strlen(names + at)) + 1) {
    ssize_t size = fgetxattr(from, names + at, nullptr, 0);
    if (size < 0)
      continue;
    value.resize(static_cast<size_t>(size));
    size = fgetxattr(from, names + at, value.data(), value.size());
    if (size >= 0)
      (void)!fsetxattr(to, names + at, value.data(), static_cast<size_t>(size), 0);
  }
}

// What `cp -a` keeps of a copied file: its permission bits exactly (not
// narrowed by the umask), owner and group where this process may set them,
// extended attributes, and its access and modification times.
bool keepMetadata(int from, int to, const struct stat &source) {
  // Giving a file away needs privilege; without it the copy stays this
  // process's (its group kept where allowed), as with cp -a.
  if (fchown(to, source.st_uid, source.st_gid) != 0)
    (void)!fchown(to, static_cast<uid_t>(-1), source.st_gid);
  if (fchmod(to, source.st_mode & 07777) != 0)
    return false;
  // After the owner and the mode: a change of owner drops capabilities, and
  // an access list set last agrees with the mode it was listed with.
  copyExtendedAttributes(from, to);
  struct timespec times[2] = {source.st_atim, source.st_mtim};
  return futimens(to, times) == 0;
}

// Why an existing `target` may not be replaced by a copy of `source`; 0 when it may.
DWORD replaceRefusal(const std::string &target, const struct stat &source, DWORD flags) {
  struct stat existing {};
  if (stat(target.c_str(), &existing) != 0)
    return 0; // a link to nothing: the copy is made where it points
  if (flags & COPY_FILE_FAIL_IF_EXISTS)
    return ERROR_FILE_EXISTS;
  if (S_ISDIR(existing.st_mode) || isReadOnlyFile(existing) || existing.st_ino == source.st_ino)
    return ERROR_ACCESS_DENIED;
  return 0;
}

// The target opened for the copy: made new (`created`), or an existing file
// replaced when it may be. -1 with the last error set.
int openCopyTarget(const std::string &target, const struct stat &source, DWORD flags, bool &created) {
  int to = open(target.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, source.st_mode & 0777);
  created = to >= 0;
  if (to < 0 && errno == EEXIST) {
    if (DWORD refused = replaceRefusal(target, source, flags))
      return failWith(refused, -1);
    to = open(target.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, source.st_mode & 0777);
  }
  if (to < 0)
    return failWith(win32ErrorFromErrno(errno, target), -1);
  return to;
}

BOOL copyFile(const char *function, LPCSTR existingName, LPCSTR newName, CopyReport report, DWORD flags) {
  std::string source, target;
  struct stat info {};
  if (!startTransfer(function, existingName, newName, source, info, target))
    return FALSE;
  if (S_ISDIR(info.st_mode))
    return failWith(ERROR_ACCESS_DENIED, FALSE);
  int from = open(source.c_str(), O_RDONLY | O_CLOEXEC);
  if (from < 0)
    return failWith(win32ErrorFromErrno(errno, source), FALSE);
  bool created = false;
  int to = openCopyTarget(target, info, flags, created);
  if (to < 0) {
    close(from);
    return FALSE;
  }
  if (created)
    noteEntryAdded(target);
  CopyOutcome outcome = copyFileContents(from, to, info.st_size, report);
  bool copied = outcome == CopyOutcome::Copied && keepMetadata(from, to, info);
  close(from);
  if (close(to) != 0 || !copied) {
    unlink(target.c_str());
    noteEntryRemoved(target);
    return failWith(outcome == CopyOutcome::Stopped ? ERROR_REQUEST_ABORTED : ERROR_WRITE_FAULT, FALSE);
  }
  return TRUE;
}

// The host target of a rename: the mapped path, except that renaming a name to
// itself in another letter case keeps the new spelling.
std::string renameTarget(const std::string &sourceHost, const std::string &targetHost, LPCSTR targetWindows) {
  if (sourceHost != targetHost)
    return targetHost;
  std::string written = targetWindows;
  auto cut = written.find_last_of("\\/");
  std::string last = cut == std::string::npos ? written : written.substr(cut + 1);
  auto slash = targetHost.rfind('/');
  return targetHost.substr(0, slash + 1) + last;
}

// Free bytes the world gives drive `letter`: "FreeBytes" (decimal text) of
// HKLM\SOFTWARE\ZAV\KXLSIM\Drives\<letter>, so a world can be set up with a
// drive that is nearly full; false when it sets none.
bool worldFreeBytes(char letter, ULONGLONG &bytes) {
  std::string text;
  if (letter == 0 ||
      !reg::readString(HKEY_LOCAL_MACHINE, std::string("SOFTWARE\\ZAV\\KXLSIM\\Drives\\") + letter,
                       "FreeBytes", text))
    return false;
  char *end = nullptr;
  bytes = std::strtoull(text.c_str(), &end, 10);
  return end != text.c_str();
}

} // namespace

extern "C" {

BOOL GetDiskFreeSpaceExA(LPCSTR lpDirectoryName, PULARGE_INTEGER lpFreeBytesAvailableToCaller,
                         PULARGE_INTEGER lpTotalNumberOfBytes, PULARGE_INTEGER lpTotalNumberOfFreeBytes) {
  std::string host;
  struct stat info {};
  if (!startOnExisting("GetDiskFreeSpaceExA", lpDirectoryName == nullptr ? "\\" : lpDirectoryName, host,
                       info))
    return FALSE;
  if (!S_ISDIR(info.st_mode))
    return failWith(kErrorDirectory, FALSE);
  struct statvfs volume {};
  if (statvfs(host.c_str(), &volume) != 0)
    return failWith(win32ErrorFromErrno(errno, host), FALSE);
  ULONGLONG available = static_cast<ULONGLONG>(volume.f_bavail) * volume.f_frsize;
  ULONGLONG total = static_cast<ULONGLONG>(volume.f_blocks) * volume.f_frsize;
  ULONGLONG free = static_cast<ULONGLONG>(volume.f_bfree) * volume.f_frsize;
  std::string windows = windowsPath(host);
  ULONGLONG limit = 0;
  if (windows.size() >= 2 && windows[1] == ':' && worldFreeBytes(windows[0], limit)) {
    available = std::min(available, limit);
    free = std::min(free, limit);
  }
  if (lpFreeBytesAvailableToCaller != nullptr)
    lpFreeBytesAvailableToCaller->QuadPart = available;
  if (lpTotalNumberOfBytes != nullptr)
    lpTotalNumberOfBytes->QuadPart = total;
  if (lpTotalNumberOfFreeBytes != nullptr)
    lpTotalNumberOfFreeBytes->QuadPart = free;
  return TRUE;
}

DWORD GetFileAttributesA(LPCSTR lpFileName) {
  std::string host;
  struct stat info {};
  if (!startOnExisting("GetFileAttributesA", lpFileName, host, info))
    return INVALID_FILE_ATTRIBUTES;
  return attributesOf(info);
}

HANDLE FindFirstFileA(LPCSTR lpFileName, LPWIN32_FIND_DATAA lpFindFileData) {
  if (kxlsim::shouldFail("FindFirstFileA"))
    return failWith(ERROR_FILE_NOT_FOUND, INVALID_HANDLE_VALUE);
  if (lpFileName == nullptr || lpFindFileData == nullptr)
    return failWith(ERROR_INVALID_PARAMETER, INVALID_HANDLE_VALUE);
  std::string directory, pattern, hostDir;
  splitSearch(lpFileName, directory, pattern);
  if (pattern.empty())
    return failWith(ERROR_FILE_NOT_FOUND, INVALID_HANDLE_VALUE);
  struct stat info {};
  if (!statWindowsPath(directory.c_str(), hostDir, info))
    return failWith(ERROR_PATH_NOT_FOUND, INVALID_HANDLE_VALUE);
  if (!S_ISDIR(info.st_mode))
    return failWith(ERROR_PATH_NOT_FOUND, INVALID_HANDLE_VALUE);
  std::vector<std::string> names;
  if (!matchingNames(hostDir, pattern, names))
    return failWith(win32ErrorFromErrno(errno, hostDir), INVALID_HANDLE_VALUE);
  int folder = open(hostDir.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (folder < 0)
    return failWith(win32ErrorFromErrno(errno, hostDir), INVALID_HANDLE_VALUE);
  auto search = std::make_unique<FindObject>();
  search->entries.reserve(names.size());
  for (const std::string &name : names) {
    WIN32_FIND_DATAA data;
    if (fillFindData(folder, name, data))
      search->entries.push_back(data);
  }
  close(folder);
  if (search->entries.empty())
    return failWith(ERROR_FILE_NOT_FOUND, INVALID_HANDLE_VALUE);
  *lpFindFileData = search->entries[0];
  search->next = 1;
  return registerHandle(std::move(search));
}

BOOL FindNextFileA(HANDLE hFindFile, LPWIN32_FIND_DATAA lpFindFileData) {
  // An injected failure is a failed read of the folder, never its end.
  if (kxlsim::shouldFail("FindNextFileA"))
    return failWith(ERROR_READ_FAULT, FALSE);
  auto *search = lookupHandleAs<FindObject>(hFindFile);
  if (search == nullptr || lpFindFileData == nullptr)
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  if (search->next >= search->entries.size())
    return failWith(ERROR_NO_MORE_FILES, FALSE);
  *lpFindFileData = search->entries[search->next++];
  return TRUE;
}

BOOL FindClose(HANDLE hFindFile) {
  if (kxlsim::shouldFail("FindClose"))
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  if (lookupHandleAs<FindObject>(hFindFile) == nullptr || !releaseHandle(hFindFile))
    return failWith(ERROR_INVALID_HANDLE, FALSE);
  return TRUE;
}

BOOL CreateDirectoryA(LPCSTR lpPathName, LPSECURITY_ATTRIBUTES) {
  if (kxlsim::shouldFail("CreateDirectoryA"))
    return failWith(ERROR_ACCESS_DENIED, FALSE);
  std::string host;
  if (!mapPath(lpPathName, host))
    return FALSE;
  if (mkdir(host.c_str(), 0777) != 0)
    return failWith(win32ErrorFromErrno(errno, host), FALSE);
  noteEntryAdded(host);
  return TRUE;
}

BOOL RemoveDirectoryA(LPCSTR lpPathName) {
  std::string host;
  struct stat info {};
  if (!startOnExisting("RemoveDirectoryA", lpPathName, host, info))
    return FALSE;
  if (!S_ISDIR(info.st_mode))
    return failWith(kErrorDirectory, FALSE);
  if (rmdir(host.c_str()) != 0)
    return failWith(errno == EEXIST ? ERROR_DIR_NOT_EMPTY : win32ErrorFromErrno(errno, host), FALSE);
  noteEntryRemoved(host);
  return TRUE;
}

BOOL DeleteFileA(LPCSTR lpFileName) {
  std::string host;
  struct stat info {};
  if (!startOnExisting("DeleteFileA", lpFileName, host, info))
    return FALSE;
  if (S_ISDIR(info.st_mode) || isReadOnlyFile(info))
    return failWith(ERROR_ACCESS_DENIED, FALSE);
  if (unlink(host.c_str()) != 0)
    return failWith(win32ErrorFromErrno(errno, host), FALSE);
  noteEntryRemoved(host);
  return TRUE;
}

BOOL CopyFileA(LPCSTR lpExistingFileName, LPCSTR lpNewFileName, BOOL bFailIfExists) {
  return copyFile("CopyFileA", lpExistingFileName, lpNewFileName, CopyReport(nullptr, nullptr, nullptr),
                  bFailIfExists ? COPY_FILE_FAIL_IF_EXISTS : 0);
}

BOOL CopyFileExA(LPCSTR lpExistingFileName, LPCSTR lpNewFileName, LPPROGRESS_ROUTINE lpProgressRoutine,
                 LPVOID lpData, LPBOOL pbCancel, DWORD dwCopyFlags) {
  return copyFile("CopyFileExA", lpExistingFileName, lpNewFileName,
                  CopyReport(lpProgressRoutine, lpData, pbCancel), dwCopyFlags);
}

BOOL MoveFileExA(LPCSTR lpExistingFileName, LPCSTR lpNewFileName, DWORD dwFlags) {
  std::string source, target;
  struct stat info {
  }, existing{};
  if (!startTransfer("MoveFileExA", lpExistingFileName, lpNewFileName, source, info, target))
    return FALSE;
  target = renameTarget(source, target, lpNewFileName);
  if (target != source && stat(target.c_str(), &existing) == 0) {
    if ((dwFlags & MOVEFILE_REPLACE_EXISTING) == 0)
      return failWith(ERROR_ALREADY_EXISTS, FALSE);
    if (S_ISDIR(existing.st_mode) || S_ISDIR(info.st_mode))
      return failWith(ERROR_ACCESS_DENIED, FALSE);
  }
  if (rename(source.c_str(), target.c_str()) != 0)
    return failWith(win32ErrorFromErrno(errno, target), FALSE);
  noteEntryRemoved(source);
  noteEntryAdded(target);
  return TRUE;
}

int _access(const char *path, int mode) {
  if (kxlsim::shouldFail("_access")) {
    errno = EACCES;
    return -1;
  }
  if (mode != 0 && mode != 2 && mode != 4 && mode != 6) {
    errno = EINVAL;
    return -1;
  }
  std::string host;
  struct stat info {};
  if (path == nullptr || !hostPath(path, host) || stat(host.c_str(), &info) != 0) {
    errno = ENOENT;
    return -1;
  }
  if ((mode & 2) != 0 && isReadOnlyFile(info)) {
    errno = EACCES;
    return -1;
  }
  return 0;
}

} // extern "C"
