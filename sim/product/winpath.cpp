#include "sim/product/winpath.h"

#include "platform/kxlsys.h"
#include "sim/product/installation.h"

namespace kxlprod {

bool startsWithIgnoringCase(std::string_view text, std::string_view prefix) {
  if (text.size() < prefix.size())
    return false;
  for (std::size_t i = 0; i < prefix.size(); ++i) {
    char a = text[i] >= 'a' && text[i] <= 'z' ? char(text[i] - 32) : text[i];
    char b = prefix[i] >= 'a' && prefix[i] <= 'z' ? char(prefix[i] - 32) : prefix[i];
    if (a != b)
      return false;
  }
  return true;
}

std::string unquotedPath(const char *path) {
  std::string text = path ? path : "";
  if (!text.empty() && text.front() == '"') {
    text.erase(0, 1);
    if (!text.empty() && text.back() == '"')
      text.pop_back();
  }
  return text;
}

std::string joinPath(const std::string &dir, const std::string &name) {
  if (dir.empty())
    return name;
  if (dir.back() == '\\' || dir.back() == '/')
    return dir + name;
  return dir + "\\" + name;
}

std::string parentPath(const std::string &path) {
  std::string trimmed = path;
  while (trimmed.size() > 1 && (trimmed.back() == '\\' || trimmed.back() == '/'))
    trimmed.pop_back();
  std::size_t cut = trimmed.find_last_of("\\/");
  if (cut == std::string::npos)
    return "";
  // Keep the backslash of a drive root: the parent of "C:\A" is "C:\".
  if (cut == 2 && trimmed[1] == ':')
    return trimmed.substr(0, 3);
  return trimmed.substr(0, cut);
}

bool isRootPath(const std::string &path) {
  if (path.empty())
    return true;
  if (path.size() <= 3 && path.size() >= 2 && path[1] == ':') {
    return path.size() == 2 || path[2] == '\\' || path[2] == '/';
  }
  if (path.rfind("\\\\", 0) == 0) {
    std::size_t server = path.find('\\', 2);
    if (server == std::string::npos)
      return true;
    std::size_t share = path.find('\\', server + 1);
    return share == std::string::npos || share + 1 == path.size();
  }
  return false;
}

bool isDirectoryPath(const std::string &path) {
  DWORD attributes = GetFileAttributesA(path.c_str());
  return attributes != INVALID_FILE_ATTRIBUTES && (attributes & FILE_ATTRIBUTE_DIRECTORY) != 0;
}

bool createDirectoryTree(const std::string &path, bool parents) {
  if (isDirectoryPath(path))
    return true;
  if (isRootPath(path))
    return false;
  std::string parent = parentPath(path);
  if (parents && !parent.empty() && !isDirectoryPath(parent) && !createDirectoryTree(parent, true)) {
    return false;
  }
  if (CreateDirectoryA(path.c_str(), nullptr))
    return true;
  // Another process may have created it in the meantime.
  return isDirectoryPath(path);
}

namespace {

// The running program lives in <installation>\bin.
bool installPathFromModule(std::string &path) {
  char module[SQLO_PATH_SZ] = {};
  DWORD length = GetModuleFileNameA(nullptr, module, sizeof module);
  if (length == 0 || length >= sizeof module)
    return false;
  path = parentPath(parentPath(module));
  return !path.empty();
}

} // namespace

bool currentInstallationPath(std::string &path) {
  CopyInfo copy;
  bool found = false;
  if (currentCopy(copy) && !copy.path.empty()) {
    path = unquotedPath(copy.path.c_str());
    found = true;
  } else {
    found = installPathFromModule(path);
  }
  while (found && path.size() > 3 && path.back() == '\\')
    path.pop_back();
  return found;
}

} // namespace kxlprod
