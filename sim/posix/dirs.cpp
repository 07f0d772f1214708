// The current directory, the temporary directory and unique temporary names.
#include "platform/win32.h"
#include "sim/common/simfail.h"
#include "sim/posix/win32util.h"
#include "sim/posix/world.h"

#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

using namespace kxlsim::posix;

namespace {

constexpr const char *kDefaultTempDir = "C:\\windows\\temp";

bool isDirectory(const std::string &host) {
  struct stat info {};
  return stat(host.c_str(), &info) == 0 && S_ISDIR(info.st_mode);
}

bool makeDirectory(const std::string &host) {
  if (mkdir(host.c_str(), 0777) != 0)
    return false;
  noteEntryAdded(host);
  return true;
}

// Creates every missing directory of `host` below the world root.
bool makeDirectories(const std::string &host) {
  for (size_t cut = host.find('/', worldRoot().size() + 1); cut != std::string::npos;
       cut = host.find('/', cut + 1)) {
    std::string prefix = host.substr(0, cut);
    if (!prefix.empty() && !isDirectory(prefix) && !makeDirectory(prefix) && errno != EEXIST)
      return false;
  }
  return isDirectory(host) || makeDirectory(host);
}

// Windows writes directories without a trailing backslash except roots.
std::string withoutTrailingSeparator(std::string path) {
  while (path.size() > 3 && (path.back() == '\\' || path.back() == '/'))
    path.pop_back();
  return path;
}

std::string withTrailingSeparator(std::string path) {
  if (path.empty() || path.back() != '\\')
    path.push_back('\\');
  return path;
}

std::string currentWindowsDirectory() {
  char cwd[PATH_MAX];
  if (getcwd(cwd, sizeof cwd) == nullptr)
    return "C:\\";
  std::string mapped = windowsPath(cwd);
  return mapped.empty() ? "C:\\" : withoutTrailingSeparator(mapped);
}

// A directory of the world named by the Windows path `variable` holds, or "".
std::string existingDirectoryFromEnvironment(const char *variable) {
  const char *value = std::getenv(variable);
  std::string host;
  if (value == nullptr || *value == '\0' || !hostPath(value, host) || !isDirectory(host))
    return "";
  return withoutTrailingSeparator(windowsPath(host));
}

std::string temporaryDirectory() {
  for (const char *variable : {"TMP", "TEMP"}) {
    std::string found = existingDirectoryFromEnvironment(variable);
    if (!found.empty())
      return found;
  }
  std::string host;
  if (!hostPath(kDefaultTempDir, host) || !makeDirectories(host))
    return "";
  std::string mapped = windowsPath(host);
  return mapped.empty() ? "" : withoutTrailingSeparator(mapped);
}

// The directory _tempnam works in: `dir` when it exists, else TMP, else the
// current directory.
std::string tempnamDirectory(const char *dir) {
  std::string host;
  if (dir != nullptr && *dir != '\0' && hostPath(dir, host) && isDirectory(host))
    return withoutTrailingSeparator(dir);
  std::string fromTmp = existingDirectoryFromEnvironment("TMP");
  return fromTmp.empty() ? currentWindowsDirectory() : fromTmp;
}

bool windowsPathExists(const std::string &path) {
  std::string host;
  struct stat info {};
  return hostPath(path, host) && lstat(host.c_str(), &info) == 0;
}

} // namespace

extern "C" {

DWORD GetCurrentDirectoryA(DWORD nBufferLength, LPSTR lpBuffer) {
  if (kxlsim::shouldFail("GetCurrentDirectoryA"))
    return failWith(ERROR_ACCESS_DENIED, DWORD{0});
  requireWorld();
  return copyStringOut(currentWindowsDirectory(), lpBuffer, nBufferLength);
}

DWORD GetTempPathA(DWORD nBufferLength, LPSTR lpBuffer) {
  if (kxlsim::shouldFail("GetTempPathA"))
    return failWith(ERROR_PATH_NOT_FOUND, DWORD{0});
  requireWorld();
  std::string directory = temporaryDirectory();
  if (directory.empty())
    return failWith(ERROR_PATH_NOT_FOUND, DWORD{0});
  return copyStringOut(withTrailingSeparator(directory), lpBuffer, nBufferLength);
}

char *_tempnam(const char *dir, const char *prefix) {
  if (kxlsim::shouldFail("_tempnam")) {
    errno = EEXIST;
    return nullptr;
  }
  requireWorld();
  static unsigned counter = static_cast<unsigned>(getpid()) % 100000U;
  std::string base = withTrailingSeparator(tempnamDirectory(dir)) + (prefix != nullptr ? prefix : "");
  for (int attempt = 0; attempt < 100000; ++attempt) {
    std::string candidate = base + std::to_string(++counter);
    if (candidate.size() >= _MAX_PATH) {
      errno = EINVAL;
      return nullptr;
    }
    if (!windowsPathExists(candidate))
      return strdup(candidate.c_str());
  }
  errno = EEXIST;
  return nullptr;
}

} // extern "C"
