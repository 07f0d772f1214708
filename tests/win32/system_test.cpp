// Modules, environment, text conversion and Windows Installer queries, as
// Windows has them.
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
  SetLastError(0);
  EXPECT_EQ(nullptr, LoadLibraryA("kxlnosuchmodule.dll"));
  EXPECT_EQ(static_cast<DWORD>(ERROR_MOD_NOT_FOUND), GetLastError());
}

TEST_F(Win32Test, MissingEntryPointIsProcNotFound) {
  HMODULE module = LoadLibraryA("odbc32.dll");
  ASSERT_NE(nullptr, module) << "error " << GetLastError();
  SetLastError(0);
  EXPECT_EQ(nullptr, GetProcAddress(module, "KxlNoSuchEntryPoint"));
  EXPECT_EQ(static_cast<DWORD>(ERROR_PROC_NOT_FOUND), GetLastError());
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
  SetLastError(0);
  EXPECT_EQ(0u, GetEnvironmentVariableA(name, buffer, sizeof buffer));
  EXPECT_EQ(static_cast<DWORD>(ERROR_ENVVAR_NOT_FOUND), GetLastError());
}

// --- Text ----------------------------------------------------------------

TEST_F(Win32Test, MultiByteToWideCharCountsTheTerminatorOnlyForMinusOne) {
  EXPECT_EQ(6, MultiByteToWideChar(CP_UTF8, 0, utf8, -1, nullptr, 0));
  EXPECT_EQ(5, MultiByteToWideChar(CP_UTF8, 0, utf8, static_cast<int>(std::strlen(utf8)), nullptr, 0));
  WCHAR wide[8] = {};
  ASSERT_EQ(6, MultiByteToWideChar(CP_UTF8, 0, utf8, -1, wide, 8));
  EXPECT_EQ(0, std::memcmp(utf16, wide, sizeof utf16));
  SetLastError(0);
  EXPECT_EQ(0, MultiByteToWideChar(CP_UTF8, 0, utf8, -1, wide, 3));
  EXPECT_EQ(static_cast<DWORD>(ERROR_INSUFFICIENT_BUFFER), GetLastError());
}

TEST_F(Win32Test, WideCharToMultiByteCountsTheTerminatorOnlyForMinusOne) {
  EXPECT_EQ(7, WideCharToMultiByte(CP_UTF8, 0, utf16, -1, nullptr, 0, nullptr, nullptr));
  EXPECT_EQ(6, WideCharToMultiByte(CP_UTF8, 0, utf16, 5, nullptr, 0, nullptr, nullptr));
  char narrow[8] = {};
  ASSERT_EQ(7, WideCharToMultiByte(CP_UTF8, 0, utf16, -1, narrow, sizeof narrow, nullptr, nullptr));
  EXPECT_STREQ(utf8, narrow);
  SetLastError(0);
  EXPECT_EQ(0, WideCharToMultiByte(CP_UTF8, 0, utf16, -1, narrow, 3, nullptr, nullptr));
  EXPECT_EQ(static_cast<DWORD>(ERROR_INSUFFICIENT_BUFFER), GetLastError());
}

// --- Windows Installer ---------------------------------------------------

TEST_F(Win32Test, UnknownProductIsUnknownToTheInstaller) {
  EXPECT_EQ(INSTALLSTATE_UNKNOWN, MsiQueryProductStateA(unknownProduct));
  char location[MAX_PATH] = {};
  DWORD size = sizeof location;
  EXPECT_EQ(static_cast<UINT>(ERROR_UNKNOWN_PRODUCT),
            MsiGetProductInfoA(unknownProduct, INSTALLPROPERTY_INSTALLLOCATION, location, &size));
}

} // namespace
} // namespace kxltest
