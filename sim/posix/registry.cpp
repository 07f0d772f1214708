// The Win32 registry functions over the world's hive files.
//
// HKEY_LOCAL_MACHINE is system.reg, HKEY_CURRENT_USER is user.reg and
// HKEY_CLASSES_ROOT is HKEY_LOCAL_MACHINE\SOFTWARE\Classes; HKEY_USERS is not
// simulated. An opened key is a path in a hive: when that key is deleted, by
// this or another process, operations on the handle give ERROR_KEY_DELETED.
#include "platform/win32.h"
#include "sim/common/simfail.h"
#include "sim/posix/regfile.h"
#include "sim/posix/reghelp.h"
#include "sim/posix/world.h"

#include <cstring>
#include <map>
#include <memory>
#include <mutex>

namespace kxlsim::posix {

namespace {

using hive::HiveFile;
using hive::Key;
using hive::KeyPath;

enum class HiveId { Machine, User };

struct OpenKey {
  HiveId hiveId = HiveId::Machine;
  KeyPath path;
  bool predefined = false; // a root key: always exists
};

// Serialises the handle table and the hive caches between threads; the hive
// files serialise processes.
std::recursive_mutex registryMutex;
std::map<ULONG_PTR, OpenKey> openKeys;
ULONG_PTR nextHandle = 0x1000;
std::map<std::string, std::unique_ptr<HiveFile>> hiveFiles; // by host path

HiveFile &hiveFile(HiveId which) {
  const bool machine = which == HiveId::Machine;
  std::string path = worldRoot() + (machine ? "/system.reg" : "/user.reg");
  std::unique_ptr<HiveFile> &file = hiveFiles[path];
  if (!file)
    file = std::make_unique<HiveFile>(path, machine ? "HKEY_LOCAL_MACHINE" : "HKEY_CURRENT_USER");
  return *file;
}

// Splits "A\B\C"; empty parts (doubled or trailing separators) are dropped.
KeyPath splitKeyPath(const char *subKey) {
  KeyPath parts;
  if (subKey == nullptr)
    return parts;
  const char *start = subKey;
  for (const char *p = subKey;; ++p) {
    if (*p == '\\' || *p == '\0') {
      if (p > start)
        parts.emplace_back(start, static_cast<size_t>(p - start));
      if (*p == '\0')
        break;
      start = p + 1;
    }
  }
  return parts;
}

// Names that the text form of a hive cannot hold.
bool isStorableName(std::string_view name) {
  return name.find_first_of("\r\n") == std::string_view::npos;
}

bool allStorable(const KeyPath &path) {
  for (const std::string &name : path)
    if (!isStorableName(name) || name.size() > 255)
      return false;
  return true;
}

LONG lookupKey(HKEY hKey, OpenKey &out) {
  if (hKey == HKEY_LOCAL_MACHINE || hKey == HKEY_CURRENT_USER || hKey == HKEY_CLASSES_ROOT) {
    out.hiveId = hKey == HKEY_CURRENT_USER ? HiveId::User : HiveId::Machine;
    out.path = hKey == HKEY_CLASSES_ROOT ? KeyPath{"SOFTWARE", "Classes"} : KeyPath{};
    out.predefined = true;
    return ERROR_SUCCESS;
  }
  auto it = openKeys.find(reinterpret_cast<ULONG_PTR>(hKey));
  if (it == openKeys.end())
    return ERROR_INVALID_HANDLE;
  out = it->second;
  return ERROR_SUCCESS;
}

// On a 64-bit system the 32-bit view of HKEY_LOCAL_MACHINE\SOFTWARE lives in
// its Wow6432Node subkey.
void applyView(REGSAM sam, OpenKey &key) {
  if ((sam & KEY_WOW64_32KEY) == 0 || key.hiveId != HiveId::Machine || key.path.empty() ||
      hive::fold(key.path[0]) != "software")
    return;
  if (key.path.size() > 1 && hive::fold(key.path[1]) == "wow6432node")
    return;
  key.path.insert(key.path.begin() + 1, "Wow6432Node");
}

// The key a handle names, or why there is none.
LONG keyOfHandle(const Key &root, const OpenKey &handle, const Key *&out) {
  out = hive::findKey(root, handle.path);
  if (out != nullptr)
    return ERROR_SUCCESS;
  return handle.predefined ? ERROR_FILE_NOT_FOUND : ERROR_KEY_DELETED;
}

// A subkey path is taken below an opened key only while that key exists; a
// missing root path (HKEY_CLASSES_ROOT) is simply created along the way.
LONG checkBase(const Key &root, const OpenKey &base) {
  const Key *key = nullptr;
  LONG rc = keyOfHandle(root, base, key);
  return base.predefined ? ERROR_SUCCESS : rc;
}

// Runs `fn` on the key behind `hKey` for reading.
LONG readKey(HKEY hKey, const std::function<LONG(const Key &)> &fn) {
  OpenKey handle;
  if (LONG rc = lookupKey(hKey, handle); rc != ERROR_SUCCESS)
    return rc;
  return hiveFile(handle.hiveId).read([&](const Key &root) -> LONG {
    const Key *key = nullptr;
    LONG rc = keyOfHandle(root, handle, key);
    return rc == ERROR_SUCCESS ? fn(*key) : rc;
  });
}

// Runs `fn` on the key behind `hKey` for changing: `fn` describes its change
// of the key, whose path it is given.
LONG changeKey(HKEY hKey, const std::function<LONG(const Key &, const KeyPath &, hive::Change &)> &fn) {
  OpenKey handle;
  if (LONG rc = lookupKey(hKey, handle); rc != ERROR_SUCCESS)
    return rc;
  return hiveFile(handle.hiveId).change([&](const Key &root, hive::Change &change) -> LONG {
    const Key *key = nullptr;
    LONG rc = keyOfHandle(root, handle, key);
    return rc == ERROR_SUCCESS ? fn(*key, handle.path, change) : rc;
  });
}

// The handle and path of `subKey` below `hKey`, in the view `sam` asks for.
LONG resolveSubKey(HKEY hKey, const char *subKey, REGSAM sam, OpenKey &base, OpenKey &target) {
  if (LONG rc = lookupKey(hKey, base); rc != ERROR_SUCCESS)
    return rc;
  target = base;
  target.predefined = false;
  for (std::string &name : splitKeyPath(subKey))
    target.path.push_back(std::move(name));
  if (!allStorable(target.path))
    return ERROR_INVALID_PARAMETER;
  applyView(sam, target);
  return ERROR_SUCCESS;
}

HKEY newHandle(const OpenKey &key) {
  ULONG_PTR id = nextHandle;
  nextHandle += 4;
  openKeys[id] = key;
  return reinterpret_cast<HKEY>(id);
}

// Copies a value's data out as Windows does: the size alone for a null buffer,
// ERROR_MORE_DATA with the size needed for a small one.
LONG copyData(const hive::Value &value, LPDWORD lpType, LPBYTE lpData, LPDWORD lpcbData) {
  if (lpData != nullptr && lpcbData == nullptr)
    return ERROR_INVALID_PARAMETER;
  if (lpType != nullptr)
    *lpType = value.type;
  if (lpcbData == nullptr)
    return ERROR_SUCCESS;
  const DWORD size = static_cast<DWORD>(value.data.size());
  const DWORD room = *lpcbData;
  *lpcbData = size;
  if (lpData == nullptr)
    return ERROR_SUCCESS;
  if (room < size)
    return ERROR_MORE_DATA;
  if (size > 0)
    std::memcpy(lpData, value.data.data(), size);
  return ERROR_SUCCESS;
}

// Copies a name into a buffer of *lpcch characters; on success *lpcch is the
// length without the NUL.
LONG copyName(const std::string &name, LPSTR lpName, LPDWORD lpcch) {
  if (lpName == nullptr || lpcch == nullptr)
    return ERROR_INVALID_PARAMETER;
  if (name.size() + 1 > *lpcch)
    return ERROR_MORE_DATA;
  std::memcpy(lpName, name.c_str(), name.size() + 1);
  *lpcch = static_cast<DWORD>(name.size());
  return ERROR_SUCCESS;
}

// Removes the key `target` names with its whole subtree; with `onlyLeaf` a key
// that has subkeys is refused, as RegDeleteKeyA does.
LONG deleteKey(HKEY hKey, const char *subKey, bool onlyLeaf) {
  OpenKey base, target;
  if (LONG rc = resolveSubKey(hKey, subKey, 0, base, target); rc != ERROR_SUCCESS)
    return rc;
  if (target.path.empty())
    return ERROR_ACCESS_DENIED; // a root key cannot be deleted
  return hiveFile(target.hiveId).change([&](const Key &root, hive::Change &change) -> LONG {
    if (LONG rc = checkBase(root, base); rc != ERROR_SUCCESS)
      return rc;
    const Key *key = hive::findKey(root, target.path);
    if (key == nullptr)
      return ERROR_FILE_NOT_FOUND;
    if (onlyLeaf && !key->subkeys.empty())
      return ERROR_ACCESS_DENIED;
    change.deleteKey(target.path);
    return ERROR_SUCCESS;
  });
}

// Opens (or with `create`, creates) `subKey` below `hKey`.
LONG openOrCreate(HKEY hKey, const char *subKey, REGSAM sam, bool create, PHKEY phkResult,
                  LPDWORD lpdwDisposition) {
  if (phkResult == nullptr)
    return ERROR_INVALID_PARAMETER;
  *phkResult = nullptr;
  OpenKey base, target;
  if (LONG rc = resolveSubKey(hKey, subKey, sam, base, target); rc != ERROR_SUCCESS)
    return rc;
  bool created = false;
  // ERROR_SUCCESS when the key is there, ERROR_FILE_NOT_FOUND when it is not.
  auto find = [&](const Key &root) -> LONG {
    if (LONG rc = checkBase(root, base); rc != ERROR_SUCCESS)
      return rc;
    return hive::findKey(root, target.path) != nullptr ? ERROR_SUCCESS : ERROR_FILE_NOT_FOUND;
  };
  HiveFile &file = hiveFile(target.hiveId);
  LONG rc = !create ? file.read(find) : file.change([&](const Key &root, hive::Change &change) -> LONG {
    LONG found = find(root);
    if (found != ERROR_FILE_NOT_FOUND)
      return found;
    change.createKey(target.path);
    created = true;
    return ERROR_SUCCESS;
  });
  if (rc != ERROR_SUCCESS)
    return rc;
  *phkResult = newHandle(target);
  if (lpdwDisposition != nullptr)
    *lpdwDisposition = created ? REG_CREATED_NEW_KEY : REG_OPENED_EXISTING_KEY;
  return ERROR_SUCCESS;
}

// Common start of every entry point: injected failure, then the world.
bool injectedFailure(const char *function) {
  if (kxlsim::shouldFail(function))
    return true;
  requireWorld();
  return false;
}

// Where the last enumeration by index stood, so that listing a key of n
// entries index after index costs n steps rather than n * n / 2. Kept only
// while no tree of this process changed (the caller holds registryMutex).
template <typename Map> struct EnumCursor {
  unsigned long long edits = 0;
  const Map *map = nullptr;
  DWORD index = 0;
  typename Map::const_iterator at;
};

// The entry at `index` (< map.size()) of `map`.
template <typename Map>
typename Map::const_iterator entryAt(const Map &map, DWORD index, EnumCursor<Map> &cursor) {
  unsigned long long edits = hive::treeEdits();
  bool resume = cursor.map == &map && cursor.edits == edits && cursor.index <= index;
  auto it = resume ? cursor.at : map.begin();
  std::advance(it, index - (resume ? cursor.index : 0));
  cursor = {edits, &map, index, it};
  return it;
}

EnumCursor<std::map<std::string, Key>> subkeyCursor;
EnumCursor<std::map<std::string, hive::Value>> valueCursor;

} // namespace

// One change of the hive: the key (created when missing) and every value.
LONG reg::writeKey(HKEY root, const std::string &path, const std::vector<KeyValue> &values) {
  std::lock_guard<std::recursive_mutex> lock(registryMutex);
  OpenKey base, target;
  if (LONG rc = resolveSubKey(root, path.c_str(), 0, base, target); rc != ERROR_SUCCESS)
    return rc;
  for (const KeyValue &value : values)
    if (!isStorableName(value.name))
      return ERROR_INVALID_PARAMETER;
  return hiveFile(target.hiveId).change([&](const hive::Key &root, hive::Change &change) -> LONG {
    if (LONG rc = checkBase(root, base); rc != ERROR_SUCCESS)
      return rc;
    if (hive::findKey(root, target.path) == nullptr)
      change.createKey(target.path);
    for (const KeyValue &value : values)
      change.setValue(target.path,
                      {value.name, value.type, std::vector<BYTE>(value.data.begin(), value.data.end())});
    return ERROR_SUCCESS;
  });
}

} // namespace kxlsim::posix

using namespace kxlsim::posix;

extern "C" {

LONG RegOpenKeyExA(HKEY hKey, LPCSTR lpSubKey, DWORD, REGSAM samDesired, PHKEY phkResult) {
  if (injectedFailure("RegOpenKeyExA")) {
    if (phkResult != nullptr)
      *phkResult = nullptr;
    return ERROR_ACCESS_DENIED;
  }
  std::lock_guard<std::recursive_mutex> lock(registryMutex);
  return openOrCreate(hKey, lpSubKey, samDesired, false, phkResult, nullptr);
}

LONG RegCreateKeyExA(HKEY hKey, LPCSTR lpSubKey, DWORD, LPSTR, DWORD, REGSAM samDesired,
                     LPSECURITY_ATTRIBUTES, PHKEY phkResult, LPDWORD lpdwDisposition) {
  if (injectedFailure("RegCreateKeyExA")) {
    if (phkResult != nullptr)
      *phkResult = nullptr;
    return ERROR_ACCESS_DENIED;
  }
  std::lock_guard<std::recursive_mutex> lock(registryMutex);
  return openOrCreate(hKey, lpSubKey, samDesired, true, phkResult, lpdwDisposition);
}

LONG RegQueryValueExA(HKEY hKey, LPCSTR lpValueName, LPDWORD, LPDWORD lpType, LPBYTE lpData,
                      LPDWORD lpcbData) {
  if (injectedFailure("RegQueryValueExA"))
    return ERROR_ACCESS_DENIED;
  std::lock_guard<std::recursive_mutex> lock(registryMutex);
  std::string name = hive::fold(lpValueName == nullptr ? "" : lpValueName);
  return readKey(hKey, [&](const hive::Key &key) -> LONG {
    auto it = key.values.find(name);
    if (it == key.values.end())
      return ERROR_FILE_NOT_FOUND;
    return copyData(it->second, lpType, lpData, lpcbData);
  });
}

LONG RegSetValueExA(HKEY hKey, LPCSTR lpValueName, DWORD, DWORD dwType, const BYTE *lpData, DWORD cbData) {
  if (injectedFailure("RegSetValueExA"))
    return ERROR_ACCESS_DENIED;
  std::lock_guard<std::recursive_mutex> lock(registryMutex);
  std::string name = lpValueName == nullptr ? "" : lpValueName;
  if ((lpData == nullptr && cbData != 0) || !isStorableName(name))
    return ERROR_INVALID_PARAMETER;
  std::vector<BYTE> data(lpData, lpData + cbData);
  // A string given without its terminating NUL is stored with one, so every
  // reader gets a terminated string back.
  if ((dwType == REG_SZ || dwType == REG_EXPAND_SZ) && !data.empty() && data.back() != 0)
    data.push_back(0);
  const hive::Value value{name, dwType, std::move(data)};
  return changeKey(hKey, [&](const Key &, const KeyPath &path, hive::Change &change) -> LONG {
    change.setValue(path, value);
    return ERROR_SUCCESS;
  });
}

LONG RegEnumKeyExA(HKEY hKey, DWORD dwIndex, LPSTR lpName, LPDWORD lpcchName, LPDWORD, LPSTR lpClass,
                   LPDWORD lpcchClass, PFILETIME lpftLastWriteTime) {
  if (injectedFailure("RegEnumKeyExA"))
    return ERROR_ACCESS_DENIED;
  std::lock_guard<std::recursive_mutex> lock(registryMutex);
  return readKey(hKey, [&](const hive::Key &key) -> LONG {
    if (dwIndex >= key.subkeys.size())
      return ERROR_NO_MORE_ITEMS;
    LONG rc = copyName(entryAt(key.subkeys, dwIndex, subkeyCursor)->second.name, lpName, lpcchName);
    if (rc == ERROR_SUCCESS && lpClass != nullptr && lpcchClass != nullptr && *lpcchClass > 0) {
      lpClass[0] = '\0';
      *lpcchClass = 0;
    }
    if (rc == ERROR_SUCCESS && lpftLastWriteTime != nullptr)
      *lpftLastWriteTime = FILETIME{0, 0};
    return rc;
  });
}

LONG RegEnumValueA(HKEY hKey, DWORD dwIndex, LPSTR lpValueName, LPDWORD lpcchValueName, LPDWORD,
                   LPDWORD lpType, LPBYTE lpData, LPDWORD lpcbData) {
  if (injectedFailure("RegEnumValueA"))
    return ERROR_ACCESS_DENIED;
  std::lock_guard<std::recursive_mutex> lock(registryMutex);
  return readKey(hKey, [&](const hive::Key &key) -> LONG {
    if (dwIndex >= key.values.size())
      return ERROR_NO_MORE_ITEMS;
    const hive::Value &value = entryAt(key.values, dwIndex, valueCursor)->second;
    LONG rc = copyName(value.name, lpValueName, lpcchValueName);
    return rc == ERROR_SUCCESS ? copyData(value, lpType, lpData, lpcbData) : rc;
  });
}

LONG RegDeleteValueA(HKEY hKey, LPCSTR lpValueName) {
  if (injectedFailure("RegDeleteValueA"))
    return ERROR_ACCESS_DENIED;
  std::lock_guard<std::recursive_mutex> lock(registryMutex);
  std::string name = hive::fold(lpValueName == nullptr ? "" : lpValueName);
  return changeKey(hKey, [&](const Key &key, const KeyPath &path, hive::Change &change) -> LONG {
    auto it = key.values.find(name);
    if (it == key.values.end())
      return ERROR_FILE_NOT_FOUND;
    change.deleteValue(path, it->second.name);
    return ERROR_SUCCESS;
  });
}

LONG RegDeleteKeyA(HKEY hKey, LPCSTR lpSubKey) {
  if (injectedFailure("RegDeleteKeyA"))
    return ERROR_ACCESS_DENIED;
  if (lpSubKey == nullptr)
    return ERROR_INVALID_PARAMETER;
  std::lock_guard<std::recursive_mutex> lock(registryMutex);
  return deleteKey(hKey, lpSubKey, true);
}

LONG RegCloseKey(HKEY hKey) {
  if (injectedFailure("RegCloseKey"))
    return ERROR_ACCESS_DENIED;
  if (hKey == HKEY_LOCAL_MACHINE || hKey == HKEY_CURRENT_USER || hKey == HKEY_CLASSES_ROOT ||
      hKey == HKEY_USERS)
    return ERROR_SUCCESS;
  std::lock_guard<std::recursive_mutex> lock(registryMutex);
  return openKeys.erase(reinterpret_cast<ULONG_PTR>(hKey)) != 0 ? ERROR_SUCCESS : ERROR_INVALID_HANDLE;
}

LONG SHCopyKeyA(HKEY hkeySrc, LPCSTR pszSrcSubKey, HKEY hkeyDest, DWORD) {
  if (injectedFailure("SHCopyKeyA"))
    return ERROR_ACCESS_DENIED;
  std::lock_guard<std::recursive_mutex> lock(registryMutex);
  OpenKey base, source;
  if (LONG rc = resolveSubKey(hkeySrc, pszSrcSubKey, 0, base, source); rc != ERROR_SUCCESS)
    return rc;
  // Take the source whole first, so copying a key into its own subtree ends.
  hive::Key copy;
  LONG rc = hiveFile(source.hiveId).read([&](const hive::Key &root) -> LONG {
    if (LONG rc = checkBase(root, base); rc != ERROR_SUCCESS)
      return rc;
    const hive::Key *found = hive::findKey(root, source.path);
    if (found == nullptr)
      return ERROR_FILE_NOT_FOUND;
    copy = *found;
    return ERROR_SUCCESS;
  });
  if (rc != ERROR_SUCCESS)
    return rc;
  return changeKey(hkeyDest, [&](const Key &, const KeyPath &path, hive::Change &change) -> LONG {
    change.mergeKey(path, copy);
    return ERROR_SUCCESS;
  });
}

LONG SHDeleteKeyA(HKEY hkey, LPCSTR pszSubKey) {
  if (injectedFailure("SHDeleteKeyA"))
    return ERROR_ACCESS_DENIED;
  std::lock_guard<std::recursive_mutex> lock(registryMutex);
  return deleteKey(hkey, pszSubKey, false);
}

} // extern "C"
