// The simulator's one set of registry helpers, written over the Reg* entry
// points: the Win32 surface's own state (computer name, Windows Installer,
// cluster, ODBC) and the product library's registry keys are read and written
// through them. Built for both targets: on Windows over the system's registry.
#pragma once

#include "platform/win32.h"

#include <string>
#include <utility>
#include <vector>

namespace kxlsim::posix::reg {

// Owns an open key and closes it.
class Key {
public:
  Key() = default;
  Key(const Key &) = delete;
  Key &operator=(const Key &) = delete;
  ~Key();
  // RegOpenKeyExA / RegCreateKeyExA on `path` below `root`; the Windows code.
  LONG open(HKEY root, const std::string &path, REGSAM access = KEY_READ);
  LONG create(HKEY root, const std::string &path, REGSAM access = KEY_ALL_ACCESS);
  HKEY get() const { return key_; }

private:
  HKEY key_ = nullptr;
};

// Whether the key opens: ERROR_SUCCESS, ERROR_FILE_NOT_FOUND when it is not
// there, any other code when that cannot be told (never taken for either).
LONG keyOpens(HKEY root, const std::string &path);
bool keyExists(HKEY root, const std::string &path);

// REG_SZ or REG_EXPAND_SZ data of any length (its size asked first); false
// when it is missing or cannot be read.
bool readString(HKEY root, const std::string &path, const char *value, std::string &out);
// REG_SZ or REG_EXPAND_SZ data of at most 4096 bytes, read in one query; the
// registry's code (ERROR_BAD_FORMAT for another type). `out` is set only on
// success.
LONG queryString(HKEY root, const std::string &path, const char *value, std::string &out);
bool readDword(HKEY root, const std::string &path, const char *value, DWORD &out);
bool readMultiString(HKEY root, const std::string &path, const char *value, std::vector<std::string> &out);

// Each creates the key when it is missing.
LONG writeString(HKEY root, const std::string &path, const char *value, const std::string &data);
LONG writeDword(HKEY root, const std::string &path, const char *value, DWORD data);
LONG writeMultiString(HKEY root, const std::string &path, const char *value,
                      const std::vector<std::string> &data);
// Removes a value; ERROR_FILE_NOT_FOUND when key or value is missing.
LONG deleteValue(HKEY root, const std::string &path, const char *value);

// One value of a key written whole by writeKey: its name, type and raw data.
struct KeyValue {
  std::string name;
  DWORD type = REG_NONE;
  std::string data;
};
KeyValue stringValue(const char *name, const std::string &data);
KeyValue dwordValue(const char *name, DWORD data);
KeyValue multiStringValue(const char *name, const std::vector<std::string> &data);

// Creates the key at `path` (or keeps it) and sets `values` in one change of
// the simulated machine's registry: another process, or a kill, sees all of
// them or none, as with the cluster service's own database on Windows. In the
// Windows build, where the store is the system's, value by value.
LONG writeKey(HKEY root, const std::string &path, const std::vector<KeyValue> &values);

// Subkey names in enumeration order. A missing key gives an empty list and
// ERROR_SUCCESS; other failures are returned.
LONG listSubkeys(HKEY root, const std::string &path, std::vector<std::string> &names);
// The same for callers that take a key that cannot be listed as an empty one.
std::vector<std::string> subkeys(HKEY root, const std::string &path);
// Name and data of every string value, in the registry's order.
std::vector<std::pair<std::string, std::string>> stringValues(HKEY root, const std::string &path);
LONG deleteTree(HKEY root, const std::string &path);

} // namespace kxlsim::posix::reg
