// Small readers of the simulation's state shared by the authority, audit and
// service families.
#include "sim/product/simstate.h"

#include <vector>

namespace kxlprod {

LONG readRegDword(HKEY root, const std::string &path, const char *name, DWORD &value) {
  HKEY key = nullptr;
  LONG rc = RegOpenKeyExA(root, path.c_str(), 0, KEY_QUERY_VALUE, &key);
  if (rc != ERROR_SUCCESS)
    return rc;
  DWORD data = 0;
  DWORD size = sizeof data;
  DWORD type = REG_NONE;
  rc = RegQueryValueExA(key, name, nullptr, &type, reinterpret_cast<BYTE *>(&data), &size);
  RegCloseKey(key);
  if (rc != ERROR_SUCCESS)
    return rc;
  if (type != REG_DWORD || size != sizeof data)
    return ERROR_BAD_FORMAT;
  value = data;
  return ERROR_SUCCESS;
}

LONG readSmallTextFile(const std::string &windowsPath, size_t maxBytes, std::string &text) {
  HANDLE file = CreateFileA(windowsPath.c_str(), GENERIC_READ, FILE_SHARE_READ, nullptr, OPEN_EXISTING,
                            FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE)
    return static_cast<LONG>(GetLastError());
  std::vector<char> data(maxBytes + 1);
  DWORD total = 0;
  LONG rc = ERROR_SUCCESS;
  for (;;) {
    DWORD got = 0;
    DWORD room = static_cast<DWORD>(data.size() - total);
    if (!ReadFile(file, data.data() + total, room, &got, nullptr)) {
      rc = static_cast<LONG>(GetLastError());
      break;
    }
    total += got;
    if (got == 0 || total == data.size())
      break;
  }
  CloseHandle(file);
  if (rc == ERROR_SUCCESS && total > maxBytes)
    rc = ERROR_MORE_DATA;
  if (rc == ERROR_SUCCESS)
    text.assign(data.data(), total);
  return rc;
}

} // namespace kxlprod
