#include "install/iutil.h"

#include "platform/kxlsys.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>

uint32_t kxliGetString(const char *field, char *buffer, uint32_t size) {
  if (buffer == nullptr)
    return KXLI_RC_NULL_ARGUMENT;
  size_t length = std::strlen(field);
  if (size < length + 1)
    return KXLI_RC_BUFFER_TOO_SMALL;
  std::memcpy(buffer, field, length + 1);
  return 0;
}

void kxliSetString(char *field, size_t fieldSize, const char *text) {
  if (fieldSize == 0)
    return;
  size_t length = text != nullptr ? strnlen(text, fieldSize - 1) : 0;
  if (length > 0)
    std::memcpy(field, text, length);
  field[length] = '\0';
}

LONG kxliQueryString(HKEY key, const char *valueName, char *buffer, DWORD size) {
  if (size == 0)
    return ERROR_INSUFFICIENT_BUFFER;
  std::memset(buffer, 0, size);
  // One byte is kept back so that a value stored without its terminator still
  // ends inside the buffer.
  DWORD length = size - 1;
  LONG rc = RegQueryValueExA(key, valueName, nullptr, nullptr, reinterpret_cast<BYTE *>(buffer), &length);
  if (rc != ERROR_SUCCESS)
    buffer[0] = '\0';
  buffer[size - 1] = '\0';
  return rc;
}

LONG kxliReadRegString(HKEY root, const char *key, REGSAM access, const char *valueName, char *buffer,
                       DWORD size) {
  HKEY handle = nullptr;
  LONG rc = RegOpenKeyExA(root, key, 0, access, &handle);
  if (rc != ERROR_SUCCESS) {
    if (size > 0)
      buffer[0] = '\0';
    return rc;
  }
  rc = kxliQueryString(handle, valueName, buffer, size);
  RegCloseKey(handle);
  return rc;
}

bool kxliKeyOpens(HKEY root, const char *key, REGSAM access) {
  HKEY handle = nullptr;
  if (RegOpenKeyExA(root, key, 0, access, &handle) != ERROR_SUCCESS)
    return false;
  RegCloseKey(handle);
  return true;
}

void kxliReadValueNames(HKEY root, const char *key, REGSAM access, ILIST<char> &names) {
  HKEY handle = nullptr;
  if (RegOpenKeyExA(root, key, 0, access, &handle) != ERROR_SUCCESS)
    return;
  for (DWORD index = 0;; ++index) {
    char name[255] = {};
    DWORD length = sizeof name;
    if (RegEnumValueA(handle, index, name, &length, nullptr, nullptr, nullptr, nullptr) != ERROR_SUCCESS)
      break;
    name[sizeof name - 1] = '\0';
    size_t bytes = std::strlen(name) + 1;
    char *owned = static_cast<char *>(std::malloc(bytes));
    if (owned == nullptr)
      break;
    std::memcpy(owned, name, bytes);
    if (names.Append(owned) != 0)
      break;
  }
  RegCloseKey(handle);
}

bool kxliReadDbmCfg(const char *directory, unsigned char *image, uint32_t size) {
  char path[KXLI_PATH_BUFFER_SZ];
  if (std::snprintf(path, sizeof path, "%s\\kxlsystm", directory != nullptr ? directory : "") >=
      static_cast<int>(sizeof path))
    return false;
  SQLO_FHANDLE file = nullptr;
  // Opened for update: the file must exist and be writable.
  if (sqloopenp(path, SQLO_READWRITE | SQLO_OPEN | SQLO_BINARY | SQLO_SHAREREAD | SQLO_SHAREWRITE,
                SQLO_MODE_FILE, &file, 0) != 0)
    return false;
  std::memset(image, 0, size);
  uint32_t filled = 0;
  while (filled < size) {
    uint32_t got = 0;
    if (sqloread(file, image + filled, size - filled, &got) != 0 || got == 0)
      break;
    filled += got;
  }
  sqloclose(file);
  return true;
}
