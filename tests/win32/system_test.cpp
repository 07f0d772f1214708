// Modules, environment, text conversion and Windows Installer queries, as Windows has them.
#include "conformance.h"

#include <cstring>
#include <functional>
#include <string>

namespace kxltest {
namespace {

TEST_F(Win32Test, MissingModulesAndEntryPointsAreNotFound) {
  EXPECT_EQ(static_cast<DWORD>(ERROR_MOD_NOT_FOUND),
            errorOf([] { return LoadLibraryA("kxlnosuchmodule.dll") != nullptr; }));
  HMODULE module = LoadLibraryA("odbc32.dll");
  ASSERT_NE(nullptr, module) << "error " << GetLastError();
  EXPECT_EQ(static_cast<DWORD>(ERROR_PROC_NOT_FOUND),
            errorOf([&] { return GetProcAddress(module, "KxlNoSuchEntryPoint") != nullptr; }));
  EXPECT_TRUE(FreeLibrary(module));
}

// A buffer too small gets the size needed with the terminator; one that fits the length without it.
TEST_F(Win32Test, EnvironmentVariablesIgnoreTheNamesCase) {
  const char *name = "KxlConformanceProbe";
  ASSERT_TRUE(SetEnvironmentVariableA(name, "value"));
  char small[3];
  EXPECT_EQ(6u, GetEnvironmentVariableA("KXLCONFORMANCEPROBE", small, sizeof small));
  char buffer[16];
  EXPECT_EQ(5u, GetEnvironmentVariableA(name, buffer, sizeof buffer));
  EXPECT_STREQ("value", buffer);
  ASSERT_TRUE(SetEnvironmentVariableA("kxlconformanceprobe", nullptr));
  EXPECT_EQ(static_cast<DWORD>(ERROR_ENVVAR_NOT_FOUND),
            errorOf([&] { return GetEnvironmentVariableA(name, buffer, sizeof buffer) != 0; }));
}

// The terminator is counted only for a length of -1; the text here is the same in every code page.
TEST_F(Win32Test, ConversionsCountTheTerminatorOnlyForMinusOne) {
  const char narrow[] = "hello";
  const WCHAR wide[] = {'h', 'e', 'l', 'l', 'o', 0};
  WCHAR wideOut[8] = {};
  char narrowOut[8] = {};
  const struct {
    const char *call;
    int expected;
    std::function<int()> run;
  } rows[] = {
      {"wide size", 6, [&] { return MultiByteToWideChar(CP_ACP, 0, narrow, -1, nullptr, 0); }},
      {"wide size unterminated", 5, [&] { return MultiByteToWideChar(CP_ACP, 0, narrow, 5, nullptr, 0); }},
      {"wide", 6, [&] { return MultiByteToWideChar(CP_ACP, 0, narrow, -1, wideOut, 8); }},
      {"narrow size", 6,
       [&] { return WideCharToMultiByte(CP_ACP, 0, wide, -1, nullptr, 0, nullptr, nullptr); }},
      {"narrow size unterminated", 5,
       [&] { return WideCharToMultiByte(CP_ACP, 0, wide, 5, nullptr, 0, nullptr, nullptr); }},
      {"narrow", 6, [&] { return WideCharToMultiByte(CP_ACP, 0, wide, -1, narrowOut, 8, nullptr, nullptr); }},
  };
  for (const auto &row : rows)
    EXPECT_EQ(row.expected, row.run()) << row.call;
  EXPECT_EQ(0, std::memcmp(wide, wideOut, sizeof wide));
  EXPECT_STREQ(narrow, narrowOut);
  const struct {
    const char *call;
    DWORD error;
    std::function<bool()> run;
  } refused[] = {
      {"wide short", ERROR_INSUFFICIENT_BUFFER,
       [&] { return MultiByteToWideChar(CP_ACP, 0, narrow, -1, wideOut, 3); }},
      {"narrow short", ERROR_INSUFFICIENT_BUFFER,
       [&] { return WideCharToMultiByte(CP_ACP, 0, wide, -1, narrowOut, 3, nullptr, nullptr); }},
      {"empty", ERROR_INVALID_PARAMETER, [&] { return MultiByteToWideChar(CP_ACP, 0, "", 0, wideOut, 8); }},
  };
  for (const auto &row : refused)
    EXPECT_EQ(row.error, errorOf([&] { return row.run() != 0; })) << row.call;
}

// A product registered as Windows Installer registers a machine-wide installation, under its
// code's packed form (worked out by hand here): only a whole registration is installed, and only
// the installer's own keys count, never the list of installed programs.
TEST_F(Win32Test, OnlyAWholeInstallerRegistrationIsInstalled) {
  const char product[] = "{0A1B2C3D-4E5F-4061-8273-94A5B6C7D8E9}", location[] = "C:\\Program Files\\Kxl\\";
  const std::string packed = "D3C2B1A0F5E416042837495A6B7C8D9E";
  const std::string advertisement = "SOFTWARE\\Classes\\Installer\\Products\\" + packed;
  const std::string userData =
      "SOFTWARE\\Microsoft\\Windows\\CurrentVersion\\Installer\\UserData\\S-1-5-18\\Products\\" + packed;
  const std::string uninstall =
      "SOFTWARE\\Microsoft\\Windows\\CurrentVersion\\Uninstall\\" + std::string(product);
  auto write = [](const std::string &key, const char *name, DWORD type, const void *data, DWORD size) {
    HKEY handle = nullptr;
    EXPECT_EQ(ERROR_SUCCESS, RegCreateKeyExA(HKEY_LOCAL_MACHINE, key.c_str(), 0, nullptr, 0, KEY_ALL_ACCESS,
                                             nullptr, &handle, nullptr));
    EXPECT_EQ(ERROR_SUCCESS, RegSetValueExA(handle, name, 0, type, static_cast<const BYTE *>(data), size));
    RegCloseKey(handle);
  };
  enum { kAdvertised = 1, kProperties = 2, kUninstallEntry = 4 };
  const struct {
    const char *name;
    int parts;
    INSTALLSTATE state;
    UINT locationRc;
  } rows[] = {
      {"whole", kAdvertised | kProperties, INSTALLSTATE_DEFAULT, ERROR_SUCCESS},
      {"advertisement only", kAdvertised, INSTALLSTATE_ADVERTISED, ERROR_UNKNOWN_PROPERTY},
      {"properties only", kProperties, INSTALLSTATE_UNKNOWN, ERROR_UNKNOWN_PRODUCT},
      {"uninstall entry only", kUninstallEntry, INSTALLSTATE_UNKNOWN, ERROR_UNKNOWN_PRODUCT},
  };
  const DWORD one = 1;
  for (const auto &row : rows) {
    SCOPED_TRACE(row.name);
    if (row.parts & kAdvertised)
      write(advertisement, "ProductName", REG_SZ, "Kxl", 4);
    if (row.parts & kProperties) {
      write(userData + "\\InstallProperties", "InstallLocation", REG_SZ, location, sizeof location);
      write(userData + "\\InstallProperties", "WindowsInstaller", REG_DWORD, &one, sizeof one);
    }
    if (row.parts & kUninstallEntry)
      write(uninstall, "InstallLocation", REG_SZ, location, sizeof location);
    EXPECT_EQ(row.state, MsiQueryProductStateA(product));
    char value[MAX_PATH] = {}, shortBuffer[8] = {};
    DWORD size = sizeof value;
    EXPECT_EQ(row.locationRc, MsiGetProductInfoA(product, INSTALLPROPERTY_INSTALLLOCATION, value, &size));
    if (row.locationRc == ERROR_SUCCESS) {
      EXPECT_STREQ(location, value);          // with the trailing backslash
      EXPECT_EQ(std::strlen(location), size); // characters, without the terminator
      size = sizeof shortBuffer;
      EXPECT_EQ(static_cast<UINT>(ERROR_MORE_DATA),
                MsiGetProductInfoA(product, INSTALLPROPERTY_INSTALLLOCATION, shortBuffer, &size));
      EXPECT_EQ(std::strlen(location), size); // what the value needs; the buffer's content is not defined
    }
    for (const std::string &key : {advertisement, userData, uninstall})
      SHDeleteKeyA(HKEY_LOCAL_MACHINE, key.c_str());
  }
  EXPECT_EQ(INSTALLSTATE_UNKNOWN, MsiQueryProductStateA("{5B6C1E2A-0F3D-4A77-9C21-6D8E0A4B3F19}"));
}

} // namespace
} // namespace kxltest
