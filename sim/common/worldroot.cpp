// Where the world lives on a POSIX host.
#include "sim/common/worldroot.h"

#include <sys/stat.h>
#include <unistd.h>

#include <climits>
#include <cstdlib>
#include <fstream>
#include <mutex>

namespace kxlsim::posix {

namespace {

// Kept for the whole life of the process, never destroyed: registry writes
// flushed while the process exits still ask where the world is.
struct RootCache {
  std::mutex mutex;
  std::string root;
  bool known = false;
};

RootCache &rootCache() {
  static RootCache *cache = new RootCache;
  return *cache;
}

bool isFile(const std::string &path) {
  struct stat st {};
  return stat(path.c_str(), &st) == 0 && S_ISREG(st.st_mode);
}

// The program path as it was started (first word of the command line), made
// absolute but not resolved, so a link placed inside a world counts there.
std::string startedProgramPath() {
  std::ifstream in("/proc/self/cmdline", std::ios::binary);
  std::string argv0;
  std::getline(in, argv0, '\0');
  if (argv0.find('/') == std::string::npos)
    return "";
  if (argv0[0] == '/')
    return argv0;
  return currentHostDirectory() + "/" + argv0;
}

// Nearest directory at or above `start` that holds system.reg.
std::string worldAbove(std::string dir) {
  while (!dir.empty()) {
    std::string base = dir == "/" ? "" : dir;
    if (isFile(base + "/system.reg"))
      return dir;
    if (dir == "/")
      break;
    dir = parentDirectory(dir);
  }
  return "";
}

std::string findRoot() {
  if (const char *env = std::getenv("KXLSIM_ROOT"); env != nullptr && env[0] != '\0')
    return stripTrailingSlashes(env);
  for (const std::string &program : {startedProgramPath(), resolvedProgramPath()}) {
    if (program.empty())
      continue;
    std::string found = worldAbove(parentDirectory(program));
    if (!found.empty())
      return found;
  }
  return "";
}

} // namespace

std::string parentDirectory(const std::string &path) {
  size_t slash = path.find_last_of('/');
  if (slash == std::string::npos)
    return "";
  return slash == 0 ? "/" : path.substr(0, slash);
}

std::string currentHostDirectory() {
  char buffer[PATH_MAX];
  if (getcwd(buffer, sizeof buffer) == nullptr)
    return "";
  return buffer;
}

std::string stripTrailingSlashes(std::string path) {
  while (path.size() > 1 && path.back() == '/')
    path.pop_back();
  return path;
}

const std::string &worldRoot() {
  RootCache &cache = rootCache();
  std::lock_guard<std::mutex> lock(cache.mutex);
  if (!cache.known) {
    cache.root = findRoot();
    cache.known = true;
  }
  return cache.root;
}

void resetWorldRoot() {
  RootCache &cache = rootCache();
  std::lock_guard<std::mutex> lock(cache.mutex);
  cache.known = false;
  cache.root.clear();
}

std::string resolvedProgramPath() {
  char buffer[PATH_MAX];
  ssize_t n = readlink("/proc/self/exe", buffer, sizeof buffer - 1);
  if (n <= 0)
    return "";
  buffer[n] = '\0';
  return buffer;
}

} // namespace kxlsim::posix
