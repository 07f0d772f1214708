// Files and directories of the product library, over the Win32 file calls.
// Paths may come wrapped in double quotes; the quotes are dropped before the
// file system sees them.
#include "platform/kxlsys.h"
#include "sim/common/simfail.h"
#include "sim/product/winpath.h"

#include <algorithm>
#include <chrono>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <new>
#include <vector>

struct sqlo_file {
  HANDLE handle;
};

namespace kxlprod {
namespace {

// Deepest directory tree the tree operations walk: deeper trees cannot have
// paths within MAX_PATH anyway.
constexpr int kMaxTreeDepth = 64;

int32_t codeForLastError(int32_t notFound) {
  switch (GetLastError()) {
  case ERROR_FILE_NOT_FOUND:
    return notFound;
  case ERROR_PATH_NOT_FOUND:
    return SQLO_RC_PATH_NOT_FOUND;
  case ERROR_ACCESS_DENIED:
    return SQLO_RC_ACCESS_DENIED;
  case ERROR_NOT_ENOUGH_MEMORY:
    return SQLO_RC_NO_MEMORY;
  default:
    return SQLO_RC_IO_ERROR;
  }
}

// Why a path that should exist does not: its own name or a directory above it.
int32_t missingPathCode(const std::string &path) {
  std::string parent = parentPath(path);
  return parent.empty() || isDirectoryPath(parent) ? SQLO_RC_FILE_NOT_FOUND : SQLO_RC_PATH_NOT_FOUND;
}

// After attributes that could not be read: true when the system says the
// path is not there. Any other failure (a denied or failed read) is never
// taken for a missing file; `code` then gets the failure's code.
bool isMissing(const std::string &path, int32_t &code) {
  DWORD error = GetLastError();
  if (error == ERROR_FILE_NOT_FOUND || error == ERROR_PATH_NOT_FOUND) {
    code = missingPathCode(path);
    return true;
  }
  code = codeForLastError(SQLO_RC_IO_ERROR);
  return false;
}

DWORD accessFor(uint32_t flags) {
  DWORD access = 0;
  if (flags & SQLO_READONLY)
    access |= GENERIC_READ;
  if (flags & SQLO_WRITEONLY)
    access |= GENERIC_WRITE;
  return access ? access : GENERIC_READ;
}

DWORD shareFor(uint32_t flags) {
  DWORD share = 0;
  if (flags & SQLO_SHAREREAD)
    share |= FILE_SHARE_READ;
  if (flags & SQLO_SHAREWRITE)
    share |= FILE_SHARE_WRITE;
  return share;
}

// SQLO_OPEN alone: the file must exist. SQLO_CREATE alone: create it, or
// replace the content of an existing one. Both: open it, creating it when
// missing. Neither: open an existing file.
DWORD dispositionFor(uint32_t flags, bool exists) {
  bool create = (flags & SQLO_CREATE) != 0;
  bool open = (flags & SQLO_OPEN) != 0;
  if (create && open)
    return OPEN_ALWAYS;
  if (create)
    return exists ? TRUNCATE_EXISTING : CREATE_NEW;
  return OPEN_EXISTING;
}

bool isDotEntry(const char *name) {
  return name[0] == '.' && (name[1] == '\0' || (name[1] == '.' && name[2] == '\0'));
}

bool fitsPath(const std::string &path) {
  return path.size() < SQLO_PATH_SZ;
}

// True when `inner` is `outer` or lies below it (ignoring case).
bool isWithin(const std::string &inner, const std::string &outer) {
  if (!startsWithIgnoringCase(inner, outer))
    return false;
  return inner.size() == outer.size() || inner[outer.size()] == '\\' || outer.back() == '\\';
}

// Calls visit(name, isDirectory) for each entry of a directory; stops at
// the first non-zero result and returns it. A listing that fails before its
// end fails the walk: only ERROR_NO_MORE_FILES ends it. Outside a drive's
// root a listing always holds "." and "..", so finding nothing there is a
// failure too.
template <typename Visit> int32_t forEachEntry(const std::string &dir, Visit visit) {
  WIN32_FIND_DATAA data;
  HANDLE search = FindFirstFileA(joinPath(dir, "*").c_str(), &data);
  if (search == INVALID_HANDLE_VALUE) {
    bool emptyRoot = GetLastError() == ERROR_FILE_NOT_FOUND && isRootPath(dir);
    return emptyRoot ? 0 : codeForLastError(SQLO_RC_PATH_NOT_FOUND);
  }
  int32_t rc = 0;
  do {
    data.cFileName[sizeof data.cFileName - 1] = '\0';
    if (!isDotEntry(data.cFileName)) {
      ULONGLONG size = static_cast<ULONGLONG>(data.nFileSizeHigh) << 32 | data.nFileSizeLow;
      rc = visit(std::string(data.cFileName), (data.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY) != 0, size);
    }
  } while (rc == 0 && FindNextFileA(search, &data));
  if (rc == 0 && GetLastError() != ERROR_NO_MORE_FILES)
    rc = codeForLastError(SQLO_RC_IO_ERROR);
  FindClose(search);
  return rc;
}

// What a tree takes on a drive, as the room check counts it: each file
// rounded up to whole 4 KiB blocks, and a block for each folder.
constexpr ULONGLONG kBlock = 4096;

ULONGLONG blocksOf(ULONGLONG size) {
  return (size + kBlock - 1) / kBlock * kBlock;
}

// A folder's entries as one listing found them, each folder with its own.
struct TreeEntry {
  std::string name;
  bool directory;
  ULONGLONG size;
  std::vector<TreeEntry> entries;
};

// Lists the tree below `dir` into `entries` and adds what it takes on a drive
// to `total`. A tree copy lists its source once: the room check and the copy
// both work from this listing.
int32_t listTree(const std::string &dir, int depth, std::vector<TreeEntry> &entries, ULONGLONG &total) {
  if (depth > kMaxTreeDepth)
    return SQLO_RC_IO_ERROR;
  total += kBlock;
  return forEachEntry(dir, [&](const std::string &name, bool directory, ULONGLONG size) -> int32_t {
    entries.push_back({name, directory, size, {}});
    if (directory)
      return listTree(joinPath(dir, name), depth + 1, entries.back().entries, total);
    total += blocksOf(size);
    return 0;
  });
}

// 0 when the drive of `target` (or of its nearest existing folder) has room
// for `needed` bytes; SQLO_RC_DISK_FULL when it has not, SQLO_RC_IO_ERROR when
// its free space cannot be read (never taken for room).
int32_t checkRoom(const std::string &target, ULONGLONG needed) {
  std::string dir = target;
  while (!dir.empty() && !isDirectoryPath(dir))
    dir = parentPath(dir);
  ULARGE_INTEGER available{};
  if (dir.empty() || !GetDiskFreeSpaceExA(dir.c_str(), &available, nullptr, nullptr))
    return SQLO_RC_IO_ERROR;
  return available.QuadPart >= needed ? 0 : SQLO_RC_DISK_FULL;
}

// The progress of a long tree copy on standard error: one line rewritten in
// place, shown once the copy has run for a second, only when asked for and
// standard error is a console. Standard output never sees it. A large file
// reports its progress while it is copied.
class CopyProgress {
public:
  CopyProgress(const std::string &target, ULONGLONG total, bool wanted)
      : target_(target), total_(total), enabled_(wanted && errorIsConsole()), after_(showAfter()),
        start_(std::chrono::steady_clock::now()) {}
  ~CopyProgress() {
    if (shown_) {
      show(done_);
      std::fputc('\n', stderr);
      std::fflush(stderr);
    }
  }
  CopyProgress(const CopyProgress &) = delete;
  CopyProgress &operator=(const CopyProgress &) = delete;

  // The routine CopyFileExA calls as a file's content is copied; none when
  // there is nothing to show.
  LPPROGRESS_ROUTINE routine() const { return enabled_ ? &onFileProgress : nullptr; }

  void copied(ULONGLONG bytes) {
    done_ += bytes;
    update(done_);
  }

private:
  static DWORD CALLBACK onFileProgress(LARGE_INTEGER, LARGE_INTEGER transferred, LARGE_INTEGER, LARGE_INTEGER,
                                       DWORD, DWORD, HANDLE, HANDLE, LPVOID self) {
    auto *progress = static_cast<CopyProgress *>(self);
    progress->update(progress->done_ + static_cast<ULONGLONG>(transferred.QuadPart));
    return PROGRESS_CONTINUE;
  }
  // A second, as for an administrator watching; KXLSIM_PROGRESS_AFTER_MS lets
  // a test see the line without a copy that takes that long.
  static std::chrono::milliseconds showAfter() {
    const char *setting = std::getenv("KXLSIM_PROGRESS_AFTER_MS");
    char *end = nullptr;
    long value = setting != nullptr ? std::strtol(setting, &end, 10) : -1;
    bool valid = setting != nullptr && end != setting && *end == '\0' && value >= 0;
    return std::chrono::milliseconds(valid ? value : 1000);
  }
  static bool errorIsConsole() {
    DWORD mode = 0;
    return GetConsoleMode(GetStdHandle(STD_ERROR_HANDLE), &mode) != 0;
  }
  void update(ULONGLONG done) {
    if (!enabled_)
      return;
    auto now = std::chrono::steady_clock::now();
    if (now - start_ < after_ || (shown_ && now - last_ < std::chrono::milliseconds(250)))
      return;
    last_ = now;
    shown_ = true;
    show(done);
  }
  void show(ULONGLONG done) {
    const ULONGLONG mib = 1024 * 1024;
    unsigned percent =
        total_ == 0 ? 100u : static_cast<unsigned>(std::min<ULONGLONG>(100, done * 100 / total_));
    std::fprintf(stderr, "\rcopying to %s: %llu of %llu MiB (%u%%)", target_.c_str(),
                 static_cast<unsigned long long>(done / mib), static_cast<unsigned long long>(total_ / mib),
                 percent);
    std::fflush(stderr);
  }

  std::string target_;
  ULONGLONG total_;
  ULONGLONG done_ = 0;
  bool enabled_;
  std::chrono::milliseconds after_;
  bool shown_ = false;
  std::chrono::steady_clock::time_point start_, last_;
};

// Copies the listed tree of `source` into `target`.
int32_t copyTree(const std::string &target, const std::string &source, const std::vector<TreeEntry> &entries,
                 CopyProgress &progress) {
  if (!createDirectoryTree(target, true))
    return SQLO_RC_PATH_NOT_FOUND;
  progress.copied(kBlock); // counted as the room check counts
  for (const TreeEntry &entry : entries) {
    std::string from = joinPath(source, entry.name);
    std::string to = joinPath(target, entry.name);
    if (!fitsPath(from) || !fitsPath(to))
      return SQLO_RC_IO_ERROR;
    int32_t rc = 0;
    if (entry.directory)
      rc = copyTree(to, from, entry.entries, progress);
    else if (!CopyFileExA(from.c_str(), to.c_str(), progress.routine(), &progress, nullptr, 0))
      rc = codeForLastError(SQLO_RC_FILE_NOT_FOUND);
    else
      progress.copied(blocksOf(entry.size));
    if (rc != 0)
      return rc;
  }
  return 0;
}

int32_t deleteTree(const std::string &dir, int depth) {
  if (depth > kMaxTreeDepth)
    return SQLO_RC_IO_ERROR;
  int32_t rc = forEachEntry(dir, [&](const std::string &name, bool directory, ULONGLONG) -> int32_t {
    std::string path = joinPath(dir, name);
    if (!fitsPath(path))
      return SQLO_RC_IO_ERROR;
    if (directory)
      return deleteTree(path, depth + 1);
    return DeleteFileA(path.c_str()) ? 0 : codeForLastError(SQLO_RC_FILE_NOT_FOUND);
  });
  if (rc != 0)
    return rc;
  return RemoveDirectoryA(dir.c_str()) ? 0 : codeForLastError(SQLO_RC_PATH_NOT_FOUND);
}

bool validPathParam(const OSSPathParam *param) {
  return param != nullptr && param->version == OSS_PATH_PARAM_VERSION && param->path != nullptr;
}

} // namespace

int32_t removeDirectoryTree(const std::string &path) {
  if (isRootPath(path))
    return SQLO_RC_INVALID_ARGUMENT;
  if (!isDirectoryPath(path))
    return SQLO_RC_PATH_NOT_FOUND;
  return deleteTree(path, 0);
}

} // namespace kxlprod

using namespace kxlprod;

extern "C" {

int32_t sqloopenp(const char *path, uint32_t flags, uint32_t mode, SQLO_FHANDLE *handle, uint32_t reserved) {
  (void)mode; // permission bits: the Windows file system has none to set
  (void)reserved;
  if (handle != nullptr)
    *handle = nullptr;
  if (kxlsim::shouldFail("sqloopenp"))
    return SQLO_RC_IO_ERROR;
  if (path == nullptr || handle == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  std::string name = unquotedPath(path);
  DWORD attributes = GetFileAttributesA(name.c_str());
  bool exists = attributes != INVALID_FILE_ATTRIBUTES;
  int32_t missing = 0;
  if (!exists && !isMissing(name, missing))
    return missing;
  if (exists && (attributes & FILE_ATTRIBUTE_DIRECTORY))
    return SQLO_RC_ACCESS_DENIED;
  DWORD disposition = dispositionFor(flags, exists);
  if (disposition == OPEN_EXISTING && !exists)
    return missing;
  HANDLE file =
      CreateFileA(name.c_str(), accessFor(flags) | (disposition == TRUNCATE_EXISTING ? GENERIC_WRITE : 0),
                  shareFor(flags), nullptr, disposition, FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE)
    return codeForLastError(missingPathCode(name));
  *handle = new (std::nothrow) sqlo_file{file};
  if (*handle == nullptr) {
    CloseHandle(file);
    return SQLO_RC_NO_MEMORY;
  }
  return disposition == TRUNCATE_EXISTING ? SQLO_RC_FILE_EXISTED : 0;
}

int32_t sqloread(SQLO_FHANDLE handle, void *buffer, uint32_t size, uint32_t *bytesRead) {
  if (bytesRead != nullptr)
    *bytesRead = 0;
  if (kxlsim::shouldFail("sqloread"))
    return SQLO_RC_IO_ERROR;
  if (handle == nullptr || (buffer == nullptr && size > 0))
    return SQLO_RC_INVALID_ARGUMENT;
  DWORD got = 0;
  if (size > 0 && !ReadFile(handle->handle, buffer, size, &got, nullptr))
    return SQLO_RC_IO_ERROR;
  if (bytesRead != nullptr)
    *bytesRead = got;
  return 0;
}

int32_t sqlowrite(SQLO_FHANDLE handle, const void *buffer, uint32_t size, uint32_t *bytesWritten) {
  if (bytesWritten != nullptr)
    *bytesWritten = 0;
  if (kxlsim::shouldFail("sqlowrite"))
    return SQLO_RC_IO_ERROR;
  if (handle == nullptr || (buffer == nullptr && size > 0))
    return SQLO_RC_INVALID_ARGUMENT;
  DWORD put = 0;
  bool ok = size == 0 || WriteFile(handle->handle, buffer, size, &put, nullptr);
  if (bytesWritten != nullptr)
    *bytesWritten = put;
  return ok && put == size ? 0 : SQLO_RC_IO_ERROR;
}

int32_t sqloclose(SQLO_FHANDLE handle) {
  if (handle == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  // The handle is released even when the call is made to fail, so that a
  // failing close never leaks it.
  bool ok = CloseHandle(handle->handle) != 0;
  delete handle;
  if (kxlsim::shouldFail("sqloclose"))
    return SQLO_RC_IO_ERROR;
  return ok ? 0 : SQLO_RC_IO_ERROR;
}

int32_t sqlocopy(const char *source, const char *target, uint32_t flags) {
  (void)flags; // 0: replace the target; no other mode is offered
  if (kxlsim::shouldFail("sqlocopy"))
    return SQLO_RC_IO_ERROR;
  if (source == nullptr || target == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  std::string from = unquotedPath(source);
  std::string to = unquotedPath(target);
  DWORD attributes = GetFileAttributesA(from.c_str());
  // A missing file is reported as the warning callers tolerate as "missing".
  int32_t missing = 0;
  if (attributes == INVALID_FILE_ATTRIBUTES)
    return isMissing(from, missing) && missing == SQLO_RC_FILE_NOT_FOUND ? SQLO_RC_FILE_NOT_FOUND_W : missing;
  if (attributes & FILE_ATTRIBUTE_DIRECTORY)
    return SQLO_RC_ACCESS_DENIED;
  // A missing target directory is made, so that a file being carried over is
  // never dropped for want of its folder.
  std::string toDir = parentPath(to);
  if (!toDir.empty() && !createDirectoryTree(toDir, true))
    return SQLO_RC_PATH_NOT_FOUND;
  return CopyFileA(from.c_str(), to.c_str(), FALSE) ? 0 : codeForLastError(SQLO_RC_FILE_NOT_FOUND);
}

int32_t sqlocopydir(const char *target, const char *source, uint32_t flags) {
  // The whole tree is copied, files of the target replaced.
  if (kxlsim::shouldFail("sqlocopydir"))
    return SQLO_RC_IO_ERROR;
  if (source == nullptr || target == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  std::string from = unquotedPath(source);
  std::string to = unquotedPath(target);
  if (!isDirectoryPath(from))
    return SQLO_RC_PATH_NOT_FOUND;
  // A target inside the source would be copied into itself without end.
  if (isWithin(to, from))
    return SQLO_RC_INVALID_ARGUMENT;
  // Room for the tree, less what the target holds already (its files are
  // replaced), before anything is written.
  ULONGLONG needed = 0, present = 0;
  std::vector<TreeEntry> tree, targetTree;
  int32_t rc = listTree(from, 0, tree, needed);
  if (rc == 0 && isDirectoryPath(to))
    rc = listTree(to, 0, targetTree, present);
  if (rc == 0)
    rc = checkRoom(to, needed > present ? needed - present : 0);
  if (rc != 0)
    return rc;
  CopyProgress progress(to, needed, (flags & SQLO_COPYDIR_SHOW_PROGRESS) != 0);
  return copyTree(to, from, tree, progress);
}

int32_t sqlodelete(const char *path, uint32_t flags) {
  (void)flags;
  if (kxlsim::shouldFail("sqlodelete"))
    return SQLO_RC_IO_ERROR;
  if (path == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  std::string name = unquotedPath(path);
  DWORD attributes = GetFileAttributesA(name.c_str());
  int32_t missing = 0;
  if (attributes == INVALID_FILE_ATTRIBUTES) {
    isMissing(name, missing);
    return missing;
  }
  if (attributes & FILE_ATTRIBUTE_DIRECTORY)
    return SQLO_RC_ACCESS_DENIED;
  return DeleteFileA(name.c_str()) ? 0 : codeForLastError(SQLO_RC_FILE_NOT_FOUND);
}

int32_t sqlodeletedir(const char *path) {
  if (kxlsim::shouldFail("sqlodeletedir"))
    return SQLO_RC_IO_ERROR;
  if (path == nullptr)
    return SQLO_RC_INVALID_ARGUMENT;
  // A whole drive or share is never removed.
  return removeDirectoryTree(unquotedPath(path));
}

uint32_t ossPathTest(OSSPathParam *param) {
  if (kxlsim::shouldFail("ossPathTest"))
    return OSS_RC_FAILED;
  if (!validPathParam(param))
    return OSS_RC_NULL_ARGUMENT;
  std::string name = unquotedPath(param->path);
  if (GetFileAttributesA(name.c_str()) != INVALID_FILE_ATTRIBUTES)
    return 0;
  int32_t missing = 0;
  return isMissing(name, missing) ? OSS_RC_PATH_NOT_FOUND : OSS_RC_FAILED;
}

uint32_t ossDirectoryCreate(OSSPathParam *param) {
  if (kxlsim::shouldFail("ossDirectoryCreate"))
    return OSS_RC_FAILED;
  if (!validPathParam(param))
    return OSS_RC_NULL_ARGUMENT;
  std::string dir = unquotedPath(param->path);
  bool parents = (param->mode & 2) != 0;
  if (!parents && !isDirectoryPath(parentPath(dir)) && !isRootPath(parentPath(dir))) {
    return OSS_RC_PATH_NOT_FOUND;
  }
  return createDirectoryTree(dir, parents) ? 0 : OSS_RC_FAILED;
}

bool ossPathExists(const char *path) {
  if (kxlsim::shouldFail("ossPathExists") || path == nullptr)
    return false;
  return GetFileAttributesA(unquotedPath(path).c_str()) != INVALID_FILE_ATTRIBUTES;
}

bool ossIsDirectory(const char *path) {
  if (kxlsim::shouldFail("ossIsDirectory") || path == nullptr)
    return false;
  return isDirectoryPath(unquotedPath(path));
}

int ossSnprintf(char *buffer, size_t size, const char *format, ...) {
  if (buffer == nullptr || size == 0)
    return -1;
  buffer[0] = '\0';
  if (kxlsim::shouldFail("ossSnprintf") || format == nullptr)
    return -1;
  va_list args;
  va_start(args, format);
  int wanted = std::vsnprintf(buffer, size, format, args);
  va_end(args);
  buffer[size - 1] = '\0';
  if (wanted < 0) {
    buffer[0] = '\0';
    return -1;
  }
  // The length actually stored: a cut text reports what it holds.
  return size_t(wanted) < size ? wanted : int(size - 1);
}

} // extern "C"
