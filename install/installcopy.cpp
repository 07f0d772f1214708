#include "install/installcopy.h"

#include "install/installedprod.h"
#include "install/iutil.h"
#include "install/kxlinstance.h"
#include "platform/win32.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <new>
#include <vector>

namespace {

constexpr const char kProductKey[] = "SOFTWARE\\ZAV\\KXL";
constexpr const char kCopiesKey[] = "SOFTWARE\\ZAV\\KXL\\InstalledCopies";
constexpr const char kCurrentVersionKey[] = "SOFTWARE\\ZAV\\KXL\\CurrentVersion";
constexpr const char kPathValue[] = "KXL Path Name";
constexpr DWORD kNameBufferSz = 256;
constexpr DWORD kVersionValueSz = 64;

void removeTrailingBackslash(char *path) {
  size_t length = std::strlen(path);
  if (length > 0 && path[length - 1] == '\\')
    path[length - 1] = '\0';
}

// The leading number of one value of the version key. The value is read into
// a buffer of its own, cleared before the read.
LONG readVersionNumber(HKEY key, const char *valueName, int32_t &number) {
  char text[kVersionValueSz + 1];
  LONG rc = kxliQueryString(key, valueName, text, sizeof text);
  if (rc == ERROR_SUCCESS)
    number = std::atoi(text);
  return rc;
}

} // namespace

// ---------------------------------------------------------------------------
// InstallCopy
// ---------------------------------------------------------------------------

InstallCopy::InstallCopy(const char *copyName, bool asView32, bool asView64)
    : name{}, path{}, registryKey{}, isV8(0), perUser(0), view32(asView32 ? KXLI_VIEW32 : 0),
      view64(asView64 ? KXLI_VIEW64 : 0), installedProducts(nullptr), instances(nullptr),
      status(KXLI_COPY_OK) {
  kxliSetString(name, sizeof name, copyName);
  if (kxliSameName(name, KXLI_V8_COPY_NAME)) {
    isV8 = 1;
    kxliSetString(registryKey, sizeof registryKey, kProductKey);
  } else {
    std::snprintf(registryKey, sizeof registryKey, "%s\\%s", kCopiesKey, name);
  }
  if (!readRegistration()) {
    status = KXLI_COPY_UNREADABLE;
    return;
  }
  readUsersKey();
  readComponentsKey();
  readComponentNames();
}

InstallCopy::~InstallCopy() {
  delete installedProducts;
  delete instances;
}

bool InstallCopy::readRegistration() {
  if (kxliReadRegString(HKEY_LOCAL_MACHINE, registryKey, view32 | KEY_QUERY_VALUE | view64, kPathValue, path,
                        sizeof path) != ERROR_SUCCESS)
    return false;
  removeTrailingBackslash(path);
  return true;
}

void InstallCopy::readUsersKey() {
  char key[KXLI_PATH_BUFFER_SZ];
  std::snprintf(key, sizeof key, "%s\\Users", registryKey);
  if (kxliKeyOpens(HKEY_LOCAL_MACHINE, key, KEY_QUERY_VALUE))
    perUser = 1;
}

// A copy registered for the 32-bit view must have its Components key there.
void InstallCopy::readComponentsKey() {
  if (view32 == 0)
    return;
  char key[KXLI_PATH_BUFFER_SZ];
  std::snprintf(key, sizeof key, "%s\\Components", registryKey);
  if (!kxliKeyOpens(HKEY_LOCAL_MACHINE, key, view32 | KEY_QUERY_VALUE))
    status = KXLI_COPY_NO_COMPONENTS;
}

void InstallCopy::readComponentNames() {
  char key[KXLI_PATH_BUFFER_SZ];
  std::snprintf(key, sizeof key, "%s\\COMPONENTS", registryKey);
  if (perUser)
    kxliReadValueNames(HKEY_CURRENT_USER, key, view32 | KEY_QUERY_VALUE, components);
  else
    kxliReadValueNames(HKEY_LOCAL_MACHINE, key, view32 | KEY_QUERY_VALUE | view64, components);
}

uint32_t InstallCopy::GetName(char *buffer, uint32_t size) const {
  return kxliGetString(name, buffer, size);
}

uint32_t InstallCopy::GetPath(char *buffer, uint32_t size) const {
  return kxliGetString(path, buffer, size);
}

uint32_t InstallCopy::GetRegistryKey(char *buffer, uint32_t size) const {
  return kxliGetString(registryKey, buffer, size);
}

uint32_t InstallCopy::GetVersion(CopyVersion **out) {
  if (out == nullptr)
    return KXLI_RC_NULL_ARGUMENT;
  *out = new (std::nothrow) CopyVersion{};
  if (*out == nullptr)
    return KXLI_RC_NO_MEMORY;
  CopyVersion &record = **out;
  char keyName[KXLI_PATH_BUFFER_SZ];
  std::snprintf(keyName, sizeof keyName, "%s\\CurrentVersion", registryKey);
  HKEY key = nullptr;
  LONG rc = RegOpenKeyExA(HKEY_LOCAL_MACHINE, keyName, 0, view32 | KEY_QUERY_VALUE | view64, &key);
  if (rc != ERROR_SUCCESS)
    return static_cast<uint32_t>(rc);
  rc = readVersionNumber(key, "Version", record.version);
  if (rc == ERROR_SUCCESS)
    rc = readVersionNumber(key, "Release", record.release);
  if (rc == ERROR_SUCCESS)
    rc = readVersionNumber(key, "Modification", record.modification);
  if (rc == ERROR_SUCCESS && !isV8)
    rc = readVersionNumber(key, "Fix Level", record.fixLevel);
  if (rc == ERROR_SUCCESS) {
    char level[kVersionValueSz + 1];
    rc = kxliQueryString(key, "Service Level", level, sizeof level);
    if (rc == ERROR_SUCCESS)
      kxliSetString(record.serviceLevel, sizeof record.serviceLevel, level);
  }
  RegCloseKey(key);
  return static_cast<uint32_t>(rc);
}

uint32_t InstallCopy::GetInstanceList(IKXLINSTANCELIST **out) {
  if (instances == nullptr && family != nullptr)
    family->BuildInstanceLists();
  return subList(instances, out, name);
}

uint32_t InstallCopy::GetInstalledProdList(InstalledProdList **out) {
  return subList(installedProducts, out, this);
}

// Builds a sub-list on first use and keeps it. A list whose build failed is not
// kept: the next call tries again instead of handing out a partial list as if
// it were whole. The list is built from `source`: this copy, or its name.
template <class List, class Source> uint32_t InstallCopy::subList(List *&kept, List **out, Source source) {
  if (out == nullptr)
    return KXLI_RC_NULL_ARGUMENT;
  *out = nullptr;
  if (name[0] == '\0')
    return KXLI_RC_NOT_USABLE;
  if (kept == nullptr) {
    List *built = new (std::nothrow) List(source);
    if (built == nullptr)
      return KXLI_RC_NO_MEMORY;
    if (built->status != 0) {
      delete built;
      return KXLI_RC_NOT_USABLE;
    }
    kept = built;
  }
  *out = kept;
  return 0;
}

// ---------------------------------------------------------------------------
// InstallCopyList
// ---------------------------------------------------------------------------

InstallCopyList::InstallCopyList(bool asView32, bool asView64)
    : v8Copy(nullptr), view32(asView32 ? KXLI_VIEW32 : 0), view64(asView64 ? KXLI_VIEW64 : 0), status(0) {
  if (!addV8Copy()) {
    status = 1;
    return;
  }
  addInstalledCopies();
}

InstallCopyList::~InstallCopyList() = default;

// The version-8 installation, when CurrentVersion says version 8, comes first.
// False when it is registered but cannot be read: then no other copy counts.
bool InstallCopyList::addV8Copy() {
  char version[kNameBufferSz];
  if (kxliReadRegString(HKEY_LOCAL_MACHINE, kCurrentVersionKey, KEY_QUERY_VALUE | view32 | view64, "Version",
                        version, sizeof version) != ERROR_SUCCESS ||
      std::atoi(version) != 8)
    return true;
  InstallCopy *copy = new (std::nothrow) InstallCopy(KXLI_V8_COPY_NAME, view32 != 0, false);
  if (copy == nullptr || copy->status != KXLI_COPY_OK) {
    delete copy;
    return false;
  }
  if (adopt(copy) != 0)
    return false;
  v8Copy = copy;
  return true;
}

void InstallCopyList::addInstalledCopies() {
  HKEY key = nullptr;
  if (RegOpenKeyExA(HKEY_LOCAL_MACHINE, kCopiesKey, 0,
                    KEY_QUERY_VALUE | KEY_ENUMERATE_SUB_KEYS | view32 | view64, &key) != ERROR_SUCCESS)
    return;
  LONG rc = ERROR_SUCCESS;
  for (DWORD index = 0; rc == ERROR_SUCCESS; ++index) {
    char copyName[kNameBufferSz] = {};
    DWORD length = sizeof copyName;
    rc = RegEnumKeyExA(key, index, copyName, &length, nullptr, nullptr, nullptr, nullptr);
    if (rc != ERROR_SUCCESS)
      break;
    copyName[sizeof copyName - 1] = '\0';
    InstallCopy *copy = new (std::nothrow) InstallCopy(copyName, view32 != 0, false);
    if (copy == nullptr) {
      rc = ERROR_NOT_ENOUGH_MEMORY;
      break;
    }
    if (copy->status != KXLI_COPY_OK) {
      OutputDebugStringA("Invalid Installation Name");
      OutputDebugStringA(copyName);
      delete copy;
      continue;
    }
    if (adopt(copy) != 0)
      rc = ERROR_NOT_ENOUGH_MEMORY;
  }
  if (rc != ERROR_NO_MORE_ITEMS)
    status = 1;
  RegCloseKey(key);
}

uint32_t InstallCopyList::adopt(InstallCopy *copy) {
  uint32_t rc = Append(copy); // destroys the copy when it fails
  if (rc == 0)
    copy->family = this;
  return rc;
}

void InstallCopyList::BuildInstanceLists() {
  // Walked by node, so that a caller's walk of this list keeps its place.
  std::vector<InstallCopy *> owners;
  std::vector<const char *> names;
  for (INODE<InstallCopy> *node = head; node != nullptr; node = node->next)
    if (node->data->instances == nullptr && node->data->name[0] != '\0') {
      owners.push_back(node->data);
      names.push_back(node->data->name);
    }
  std::vector<IKXLINSTANCELIST *> lists(owners.size(), nullptr);
  if (owners.empty() ||
      IKXLINSTANCELIST::BuildForCopies(names.data(), static_cast<uint32_t>(names.size()), lists.data()) != 0)
    return;
  for (size_t i = 0; i < owners.size(); ++i) {
    if (lists[i]->status == 0)
      owners[i]->instances = lists[i];
    else
      delete lists[i];
  }
}

uint32_t InstallCopyList::Find(const char *copyName, InstallCopy **out) {
  return FindByName(copyName, out);
}
