// Helpers over the product library's test world for the authority, audit and
// service cases.
#pragma once

#include "world_fixture.h"

#include <string>

namespace kxltest {

class SimWorld : public ProductWorld {
protected:
  static void setDword(const std::string &path, const char *name, DWORD value) {
    HKEY key = nullptr;
    ASSERT_EQ(ERROR_SUCCESS, RegCreateKeyExA(HKEY_LOCAL_MACHINE, path.c_str(), 0, nullptr, 0, KEY_ALL_ACCESS,
                                             nullptr, &key, nullptr));
    LONG rc = RegSetValueExA(key, name, 0, REG_DWORD, reinterpret_cast<const BYTE *>(&value), sizeof value);
    RegCloseKey(key);
    ASSERT_EQ(ERROR_SUCCESS, rc);
  }

  // Writes a file of the world (its folder is created).
  static void writeFile(const std::string &windowsPath, const std::string &text) {
    makeDirectories(windowsPath.substr(0, windowsPath.find_last_of('\\')));
    HANDLE file = CreateFileA(windowsPath.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS,
                              FILE_ATTRIBUTE_NORMAL, nullptr);
    ASSERT_NE(file, INVALID_HANDLE_VALUE) << windowsPath;
    DWORD written = 0;
    BOOL ok = WriteFile(file, text.data(), static_cast<DWORD>(text.size()), &written, nullptr);
    CloseHandle(file);
    ASSERT_TRUE(ok);
  }

  // The "State" of a service of this machine ("") or of another one.
  static void setServiceState(const std::string &machine, const std::string &name, DWORD state) {
    std::string prefix = machine.empty() ? "" : "SOFTWARE\\ZAV\\KXLSIM\\Machines\\" + machine + "\\";
    setDword(prefix + "SOFTWARE\\ZAV\\KXLSIM\\Services\\" + name, "State", state);
  }

  static constexpr const char *kIdentity = "SOFTWARE\\ZAV\\KXLSIM\\Identity";
};

} // namespace kxltest
