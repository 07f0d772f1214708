// Modules, environment, text conversion and Windows Installer queries, as Windows has them.
#include "conformance.h"

#include <cstring>
#include <string>

namespace kxltest {
namespace {

// "héllo" in UTF-8 and in UTF-16.
const char utf8[] = "h\xC3\xA9llo";
const WCHAR utf16[] = {'h', 0xE9, 'l', 'l', 'o', 0};

// A product code no machine has registered.
const char unknownProduct[] = "{5B6C1E2A-0F3D-4A77-9C21-6D8E0A4B3F19}";

// --- Modules -------------------------------------------------------------

TEST_F(Win32Test, LoadOfAMissingModuleIsModNotFound) {
  EXPECT_EQ(static_cast<DWORD>(ERROR_MOD_NOT_FOUND),
            errorOf([] { return LoadLibraryA("kxlnosuchmodule.dll") != nullptr; }));
}

TEST_F(Win32Test, MissingEntryPointIsProcNotFound) {
  HMODULE module = LoadLibraryA("odbc32.dll");
  ASSERT_NE(nullptr, module) << "error " << GetLastError();
  EXPECT_EQ(static_cast<DWORD>(ERROR_PROC_NOT_FOUND),
            errorOf([&] { return GetProcAddress(module, "KxlNoSuchEntryPoint") != nullptr; }));
  EXPECT_TRUE(FreeLibrary(module));
}

// --- Environment ---------------------------------------------------------

TEST_F(Win32Test, EnvironmentVariableSizesFollowTheBufferRules) {
  const char *name = "KXL_CONFORMANCE_PROBE";
  ASSERT_TRUE(SetEnvironmentVariableA(name, "value"));
  char small[3];
  EXPECT_EQ(6u, GetEnvironmentVariableA(name, small, sizeof small)); // needed size with the terminator
  char buffer[16];
  EXPECT_EQ(5u, GetEnvironmentVariableA(name, buffer, sizeof buffer)); // length without it
  EXPECT_STREQ("value", buffer);
  ASSERT_TRUE(SetEnvironmentVariableA(name, nullptr));
  EXPECT_EQ(static_cast<DWORD>(ERROR_ENVVAR_NOT_FOUND),
            errorOf([&] { return GetEnvironmentVariableA(name, buffer, sizeof buffer) != 0; }));
}

// --- Text ----------------------------------------------------------------

TEST_F(Win32Test, MultiByteToWideCharCountsTheTerminatorOnlyForMinusOne) {
  EXPECT_EQ(6, MultiByteToWideChar(CP_UTF8, 0, utf8, -1, nullptr, 0));
  EXPECT_EQ(5, MultiByteToWideChar(CP_UTF8, 0, utf8, static_cast<int>(std::strlen(utf8)), nullptr, 0));
  WCHAR wide[8] = {};
  ASSERT_EQ(6, MultiByteToWideChar(CP_UTF8, 0, utf8, -1, wide, 8));
  EXPECT_EQ(0, std::memcmp(utf16, wide, sizeof utf16));
  EXPECT_EQ(static_cast<DWORD>(ERROR_INSUFFICIENT_BUFFER),
            errorOf([&] { return MultiByteToWideChar(CP_UTF8, 0, utf8, -1, wide, 3) != 0; }));
}

TEST_F(Win32Test, WideCharToMultiByteCountsTheTerminatorOnlyForMinusOne) {
  EXPECT_EQ(7, WideCharToMultiByte(CP_UTF8, 0, utf16, -1, nullptr, 0, nullptr, nullptr));
  EXPECT_EQ(6, WideCharToMultiByte(CP_UTF8, 0, utf16, 5, nullptr, 0, nullptr, nullptr));
  char narrow[8] = {};
  ASSERT_EQ(7, WideCharToMultiByte(CP_UTF8, 0, utf16, -1, narrow, sizeof narrow, nullptr, nullptr));
  EXPECT_STREQ(utf8, narrow);
  EXPECT_EQ(static_cast<DWORD>(ERROR_INSUFFICIENT_BUFFER), errorOf([&] {
              return WideCharToMultiByte(CP_UTF8, 0, utf16, -1, narrow, 3, nullptr, nullptr) != 0;
            }));
}

// --- Windows Installer ---------------------------------------------------

TEST_F(Win32Test, UnknownProductIsUnknownToTheInstaller) {
  EXPECT_EQ(INSTALLSTATE_UNKNOWN, MsiQueryProductStateA(unknownProduct));
  char location[MAX_PATH] = {};
  DWORD size = sizeof location;
  EXPECT_EQ(static_cast<UINT>(ERROR_UNKNOWN_PRODUCT),
            MsiGetProductInfoA(unknownProduct, INSTALLPROPERTY_INSTALLLOCATION, location, &size));
}

// A product registered the way Windows Installer registers a machine-wide
// installation, under its code's packed form (worked out by hand here).
const char registeredProduct[] = "{0A1B2C3D-4E5F-4061-8273-94A5B6C7D8E9}";
const char productKey[] = "SOFTWARE\\Classes\\Installer\\Products\\D3C2B1A0F5E416042837495A6B7C8D9E";
#define KXL_USERDATA_PRODUCT                                                                                 \
  "SOFTWARE\\Microsoft\\Windows\\CurrentVersion\\Installer\\UserData\\S-1-5-18\\Products\\"                  \
  "D3C2B1A0F5E416042837495A6B7C8D9E"
const char userDataKey[] = KXL_USERDATA_PRODUCT;
const char propertiesKey[] = KXL_USERDATA_PRODUCT "\\InstallProperties";
const char uninstallKey[] =
    "SOFTWARE\\Microsoft\\Windows\\CurrentVersion\\Uninstall\\{0A1B2C3D-4E5F-4061-8273-94A5B6C7D8E9}";
const char location[] = "C:\\Program Files\\KxlConformance\\";

class InstallerTest : public Win32Test {
protected:
  void TearDown() override {
    unregister();
    Win32Test::TearDown();
  }

  static void unregister() {
    for (const char *key : {productKey, userDataKey, uninstallKey})
      SHDeleteKeyA(HKEY_LOCAL_MACHINE, key);
  }

  static void write(const char *key, const char *name, DWORD type, const void *data, DWORD size) {
    HKEY handle = nullptr;
    ASSERT_EQ(ERROR_SUCCESS, RegCreateKeyExA(HKEY_LOCAL_MACHINE, key, 0, nullptr, 0, KEY_ALL_ACCESS, nullptr,
                                             &handle, nullptr));
    ASSERT_EQ(ERROR_SUCCESS, RegSetValueExA(handle, name, 0, type, static_cast<const BYTE *>(data), size));
    RegCloseKey(handle);
  }
  static void write(const char *key, const char *name, const char *text) {
    write(key, name, REG_SZ, text, static_cast<DWORD>(std::strlen(text) + 1));
  }

  static void advertise() { write(productKey, "ProductName", "KxlConformance"); }
  static void installProperties() {
    write(propertiesKey, "InstallLocation", location);
    const DWORD one = 1;
    write(propertiesKey, "WindowsInstaller", REG_DWORD, &one, sizeof one);
  }
};

TEST_F(InstallerTest, RegisteredProductIsInstalledAtItsLocationWithTheTrailingBackslash) {
  advertise();
  installProperties();
  EXPECT_EQ(INSTALLSTATE_DEFAULT, MsiQueryProductStateA(registeredProduct));
  char value[MAX_PATH] = {};
  DWORD size = sizeof value;
  ASSERT_EQ(static_cast<UINT>(ERROR_SUCCESS),
            MsiGetProductInfoA(registeredProduct, INSTALLPROPERTY_INSTALLLOCATION, value, &size));
  EXPECT_STREQ(location, value);
  EXPECT_EQ(std::strlen(location), size); // characters, without the terminator

  char shortBuffer[8] = {};
  size = sizeof shortBuffer;
  EXPECT_EQ(static_cast<UINT>(ERROR_MORE_DATA),
            MsiGetProductInfoA(registeredProduct, INSTALLPROPERTY_INSTALLLOCATION, shortBuffer, &size));
  EXPECT_EQ(std::strlen(location), size); // what the value needs; the buffer's content is not defined
}

// What the installer makes of each partial registration; only the installer's
// own keys count, never the list of installed programs.
TEST_F(InstallerTest, PartialRegistrationsAreNotInstalled) {
  struct Case {
    const char *name;
    bool advertised, properties, uninstallEntry;
    INSTALLSTATE state;
    UINT locationRc;
  };
  const Case cases[] = {
      {"advertisement only", true, false, false, INSTALLSTATE_ADVERTISED, ERROR_UNKNOWN_PROPERTY},
      {"properties only", false, true, false, INSTALLSTATE_UNKNOWN, ERROR_UNKNOWN_PRODUCT},
      {"uninstall entry only", false, false, true, INSTALLSTATE_UNKNOWN, ERROR_UNKNOWN_PRODUCT},
  };
  for (const Case &c : cases) {
    SCOPED_TRACE(c.name);
    if (c.advertised)
      advertise();
    if (c.properties)
      installProperties();
    if (c.uninstallEntry)
      write(uninstallKey, "InstallLocation", location);
    EXPECT_EQ(c.state, MsiQueryProductStateA(registeredProduct));
    char value[MAX_PATH] = {};
    DWORD size = sizeof value;
    EXPECT_EQ(c.locationRc,
              MsiGetProductInfoA(registeredProduct, INSTALLPROPERTY_INSTALLLOCATION, value, &size));
    unregister();
  }
}

} // namespace
} // namespace kxltest
