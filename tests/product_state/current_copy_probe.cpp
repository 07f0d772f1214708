// Started from a copy's bin folder by the installation tests: reports the
// current installation name the library finds for the running program in
// SOFTWARE\ZAV\KXLSIM\Test "CurrentCopy" and exits with the call's result.
#include "platform/kxlsys.h"
#include "platform/win32.h"

#include <cstring>

int main() {
  char name[SQLO_COPY_NAME_SZ] = {};
  int32_t rc = sqloGetCurrentInstallationName(name, sizeof name);
  HKEY key = nullptr;
  if (RegCreateKeyExA(HKEY_LOCAL_MACHINE, "SOFTWARE\\ZAV\\KXLSIM\\Test", 0, nullptr, 0, KEY_ALL_ACCESS,
                      nullptr, &key, nullptr) != ERROR_SUCCESS)
    return 99;
  RegSetValueExA(key, "CurrentCopy", 0, REG_SZ, reinterpret_cast<const BYTE *>(name),
                 static_cast<DWORD>(std::strlen(name) + 1));
  RegCloseKey(key);
  return rc == 0 ? 0 : 1;
}
