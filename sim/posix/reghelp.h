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
// Names of the subkeys, in the registry's order.
std::vector<std::string> subkeys(HKEY root, const std::string &path);
// Name and data of every string value, in the registry's order.
std::vector<std::pair<std::string, std::string>> stringValues(HKEY root, const std::string &path);
LONG deleteTree(HKEY root, const std::string &path);

} // namespace kxlsim::posix::reg
