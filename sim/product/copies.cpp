#include "sim/common/names.h"
#include "sim/posix/reghelp.h"
#include "sim/product/installation.h"

#include <cstdlib>

namespace reg = kxlsim::posix::reg;

namespace kxlprod {

namespace {

std::string switchedCopy; // empty: the program's own copy

std::string withoutTrailingSeparator(std::string path) {
  if (path.size() > 1 && (path.back() == '\\' || path.back() == '/'))
    path.pop_back();
  return path;
}

// True when `file` lies below the directory `dir` (compared ignoring case).
bool isBelow(const std::string &file, const std::string &dir) {
  if (dir.empty() || file.size() <= dir.size())
    return false;
  char next = file[dir.size()];
  return (next == '\\' || next == '/') && kxlsim::equalsIgnoringCase(file.substr(0, dir.size()), dir);
}

bool readV8Copy(CopyInfo &copy) {
  std::string version;
  if (reg::queryString(HKEY_LOCAL_MACHINE, std::string(kProductRoot) + "\\CurrentVersion", "Version",
                       version) != ERROR_SUCCESS ||
      std::atoi(version.c_str()) != 8)
    return false;
  std::string path;
  if (reg::queryString(HKEY_LOCAL_MACHINE, kProductRoot, "KXL Path Name", path) != ERROR_SUCCESS)
    return false;
  copy = CopyInfo{kV8CopyName, withoutTrailingSeparator(path), true};
  return true;
}

} // namespace

LONG listCopies(std::vector<CopyInfo> &copies) {
  copies.clear();
  CopyInfo v8;
  if (readV8Copy(v8))
    copies.push_back(v8);
  std::vector<std::string> names;
  std::string installed = std::string(kProductRoot) + "\\InstalledCopies";
  LONG rc = reg::listSubkeys(HKEY_LOCAL_MACHINE, installed, names);
  for (const std::string &name : names) {
    std::string path;
    if (reg::queryString(HKEY_LOCAL_MACHINE, installed + "\\" + name, "KXL Path Name", path) == ERROR_SUCCESS)
      copies.push_back(CopyInfo{name, withoutTrailingSeparator(path), false});
  }
  return rc;
}

bool findCopy(const std::string &name, CopyInfo &copy) {
  std::vector<CopyInfo> copies;
  listCopies(copies);
  for (const CopyInfo &candidate : copies) {
    if (kxlsim::equalsIgnoringCase(candidate.name, name)) {
      copy = candidate;
      return true;
    }
  }
  return false;
}

bool ownCopy(CopyInfo &copy) {
  char module[1024];
  DWORD length = GetModuleFileNameA(nullptr, module, sizeof module);
  if (length == 0 || length >= sizeof module)
    return false;
  std::vector<CopyInfo> copies;
  listCopies(copies);
  const CopyInfo *best = nullptr;
  for (const CopyInfo &candidate : copies)
    if (isBelow(module, candidate.path) && (best == nullptr || candidate.path.size() > best->path.size()))
      best = &candidate;
  if (best == nullptr)
    return false;
  copy = *best;
  return true;
}

bool currentCopy(CopyInfo &copy) {
  if (!switchedCopy.empty())
    return findCopy(switchedCopy, copy);
  return ownCopy(copy);
}

std::string copyKey(const CopyInfo &copy) {
  if (copy.v8)
    return kProductRoot;
  return std::string(kProductRoot) + "\\InstalledCopies\\" + copy.name;
}

std::string profileKey(const CopyInfo &copy, const std::string &instance) {
  return copyKey(copy) + "\\PROFILES\\" + instance;
}

std::string globalProfileKey(const CopyInfo &copy) {
  return copyKey(copy) + "\\GLOBAL_PROFILE";
}

void setSwitchedCopy(const std::string &name) {
  switchedCopy = name;
}

void resetInstallationState() {
  switchedCopy.clear();
}

} // namespace kxlprod
