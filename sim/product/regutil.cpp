#include "sim/product/regutil.h"

#include <cctype>
#include <cstring>

namespace kxlprod {

namespace {

constexpr DWORD kMaxValueBytes = 4096;

// Sets a value of `root`\`path`, creating the key when it is missing.
LONG setRegValue(HKEY root, const std::string &path, const char *name, DWORD type, const BYTE *data,
                 DWORD size) {
  RegKey key;
  LONG rc = RegCreateKeyExA(root, path.c_str(), 0, nullptr, REG_OPTION_NON_VOLATILE, KEY_SET_VALUE, nullptr,
                            key.out(), nullptr);
  if (rc != ERROR_SUCCESS)
    return rc;
  return RegSetValueExA(key.get(), name, 0, type, data, size);
}

} // namespace

bool sameName(const std::string &a, const std::string &b) {
  if (a.size() != b.size())
    return false;
  for (size_t i = 0; i < a.size(); ++i)
    if (std::tolower(static_cast<unsigned char>(a[i])) != std::tolower(static_cast<unsigned char>(b[i])))
      return false;
  return true;
}

LONG readRegString(HKEY root, const std::string &path, const char *name, std::string &value) {
  RegKey key;
  LONG rc = RegOpenKeyExA(root, path.c_str(), 0, KEY_QUERY_VALUE, key.out());
  if (rc != ERROR_SUCCESS)
    return rc;
  std::vector<char> data(kMaxValueBytes + 1, '\0');
  DWORD size = kMaxValueBytes;
  DWORD type = REG_NONE;
  rc = RegQueryValueExA(key.get(), name, nullptr, &type, reinterpret_cast<BYTE *>(data.data()), &size);
  if (rc != ERROR_SUCCESS)
    return rc;
  if (type != REG_SZ && type != REG_EXPAND_SZ)
    return ERROR_BAD_FORMAT;
  data[size < kMaxValueBytes ? size : kMaxValueBytes] = '\0';
  value.assign(data.data());
  return ERROR_SUCCESS;
}

LONG writeRegString(HKEY root, const std::string &path, const char *name, const std::string &value) {
  return setRegValue(root, path, name, REG_SZ, reinterpret_cast<const BYTE *>(value.c_str()),
                     static_cast<DWORD>(value.size() + 1));
}

LONG writeRegDword(HKEY root, const std::string &path, const char *name, DWORD value) {
  return setRegValue(root, path, name, REG_DWORD, reinterpret_cast<const BYTE *>(&value), sizeof value);
}

LONG deleteRegValue(HKEY root, const std::string &path, const char *name) {
  RegKey key;
  LONG rc = RegOpenKeyExA(root, path.c_str(), 0, KEY_SET_VALUE, key.out());
  if (rc != ERROR_SUCCESS)
    return rc;
  return RegDeleteValueA(key.get(), name);
}

bool regKeyExists(HKEY root, const std::string &path) {
  return regKeyOpens(root, path) == ERROR_SUCCESS;
}

LONG regKeyOpens(HKEY root, const std::string &path) {
  RegKey key;
  return RegOpenKeyExA(root, path.c_str(), 0, KEY_QUERY_VALUE, key.out());
}

LONG listSubkeys(HKEY root, const std::string &path, std::vector<std::string> &names) {
  names.clear();
  RegKey key;
  LONG rc = RegOpenKeyExA(root, path.c_str(), 0, KEY_ENUMERATE_SUB_KEYS | KEY_QUERY_VALUE, key.out());
  if (rc == ERROR_FILE_NOT_FOUND)
    return ERROR_SUCCESS;
  if (rc != ERROR_SUCCESS)
    return rc;
  for (DWORD index = 0;; ++index) {
    char name[256];
    DWORD size = sizeof name;
    rc = RegEnumKeyExA(key.get(), index, name, &size, nullptr, nullptr, nullptr, nullptr);
    if (rc == ERROR_NO_MORE_ITEMS)
      return ERROR_SUCCESS;
    if (rc != ERROR_SUCCESS)
      return rc;
    names.emplace_back(name, size < sizeof name ? size : sizeof name - 1);
  }
}

bool copyBounded(const std::string &text, char *buffer, size_t size) {
  if (buffer == nullptr || size == 0)
    return false;
  size_t n = text.size() < size ? text.size() : size - 1;
  std::memcpy(buffer, text.data(), n);
  buffer[n] = '\0';
  return n == text.size();
}

} // namespace kxlprod
