// Small registry and text helpers shared by the product library's families.
// Internal to the product library.
#pragma once

#include "platform/win32.h"

#include <string>
#include <vector>

namespace kxlprod {

// An open registry key, closed on every way out.
class RegKey {
public:
  RegKey() = default;
  RegKey(const RegKey &) = delete;
  RegKey &operator=(const RegKey &) = delete;
  ~RegKey() {
    if (key_ != nullptr)
      RegCloseKey(key_);
  }
  HKEY *out() { return &key_; }
  HKEY get() const { return key_; }

private:
  HKEY key_ = nullptr;
};

// Byte-wise equality ignoring ASCII case.
bool sameName(const std::string &a, const std::string &b);

// A string value of `root`\`path` (REG_SZ or REG_EXPAND_SZ, at most 4096 bytes).
// Returns the registry's result code; `value` is set only on success.
LONG readRegString(HKEY root, const std::string &path, const char *name, std::string &value);

// Writes a REG_SZ value, creating the key when it is missing.
LONG writeRegString(HKEY root, const std::string &path, const char *name, const std::string &value);

// Writes a REG_DWORD value, creating the key when it is missing.
LONG writeRegDword(HKEY root, const std::string &path, const char *name, DWORD value);

// Removes a value; ERROR_FILE_NOT_FOUND when key or value is missing.
LONG deleteRegValue(HKEY root, const std::string &path, const char *name);

bool regKeyExists(HKEY root, const std::string &path);
// Whether the key opens: ERROR_SUCCESS, ERROR_FILE_NOT_FOUND when it is not
// there, any other code when that cannot be told (never taken for either).
LONG regKeyOpens(HKEY root, const std::string &path);

// Subkey names of `root`\`path` in enumeration order. A missing key gives an
// empty list and ERROR_SUCCESS; other failures are returned.
LONG listSubkeys(HKEY root, const std::string &path, std::vector<std::string> &names);

// Copies `text` into `buffer` of `size` bytes, cut to fit and terminated.
// Returns false when it had to be cut (or there is no room at all).
bool copyBounded(const std::string &text, char *buffer, size_t size);

} // namespace kxlprod
