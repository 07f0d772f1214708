// Reading and writing the world's registry through the Reg* entry points, for
// the parts of the surface (computer name, Windows Installer, cluster, ODBC)
// whose state lives there.
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
  LONG create(HKEY root, const std::string &path);
  HKEY get() const { return key_; }

private:
  HKEY key_ = nullptr;
};

bool keyExists(HKEY root, const std::string &path);
// REG_SZ or REG_EXPAND_SZ data.
bool readString(HKEY root, const std::string &path, const char *value, std::string &out);
bool readDword(HKEY root, const std::string &path, const char *value, DWORD &out);
bool readMultiString(HKEY root, const std::string &path, const char *value, std::vector<std::string> &out);
LONG writeString(HKEY root, const std::string &path, const char *value, const std::string &data);
LONG writeDword(HKEY root, const std::string &path, const char *value, DWORD data);
LONG writeMultiString(HKEY root, const std::string &path, const char *value,
                      const std::vector<std::string> &data);
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

// Names of the subkeys, in the registry's order.
std::vector<std::string> subkeys(HKEY root, const std::string &path);
// Name and data of every string value, in the registry's order.
std::vector<std::pair<std::string, std::string>> stringValues(HKEY root, const std::string &path);
LONG deleteTree(HKEY root, const std::string &path);

} // namespace kxlsim::posix::reg
