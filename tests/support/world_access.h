// Reading and writing the registry and the files of the test's machine
// through the Win32 surface: what the in-process fixtures set up before a case
// and look at afterwards. HKEY_LOCAL_MACHINE throughout. And the fixture that
// gives each case a machine of its own.
#pragma once

#include "platform/win32.h"
#include "tests/support/temp_world.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace kxltest {

// Static helpers, so that every fixture deriving from this can call them by
// their plain names.
struct WorldAccess {
  // Sets a value, creating its key; both steps must work.
  static void setRegValue(const std::string &path, const char *name, DWORD type, const void *data,
                          DWORD size) {
    HKEY key = nullptr;
    ASSERT_EQ(ERROR_SUCCESS, RegCreateKeyExA(HKEY_LOCAL_MACHINE, path.c_str(), 0, nullptr, 0, KEY_ALL_ACCESS,
                                             nullptr, &key, nullptr))
        << path;
    LONG rc = RegSetValueExA(key, name, 0, type, static_cast<const BYTE *>(data), size);
    RegCloseKey(key);
    ASSERT_EQ(ERROR_SUCCESS, rc) << path << " " << name;
  }

  static void setString(const std::string &path, const char *name, const std::string &value) {
    setRegValue(path, name, REG_SZ, value.c_str(), static_cast<DWORD>(value.size() + 1));
  }

  static void setDword(const std::string &path, const char *name, DWORD value) {
    setRegValue(path, name, REG_DWORD, &value, sizeof value);
  }

  static bool keyExists(const std::string &path) {
    HKEY key = nullptr;
    if (RegOpenKeyExA(HKEY_LOCAL_MACHINE, path.c_str(), 0, KEY_QUERY_VALUE, &key) != ERROR_SUCCESS)
      return false;
    RegCloseKey(key);
    return true;
  }

  // A string value (at most 1023 bytes), or `noKey` / `noValue` for what is missing.
  static std::string regStringOr(const std::string &path, const char *name, const char *noKey,
                                 const char *noValue) {
    HKEY key = nullptr;
    if (RegOpenKeyExA(HKEY_LOCAL_MACHINE, path.c_str(), 0, KEY_QUERY_VALUE, &key) != ERROR_SUCCESS)
      return noKey;
    char data[1024] = {};
    DWORD size = sizeof data - 1;
    LONG rc = RegQueryValueExA(key, name, nullptr, nullptr, reinterpret_cast<BYTE *>(data), &size);
    RegCloseKey(key);
    return rc == ERROR_SUCCESS ? std::string(data) : noValue;
  }

  // A string value, or "<missing>".
  static std::string getString(const std::string &path, const char *name) {
    return regStringOr(path, name, "<missing>", "<missing>");
  }

  // A dword value, or 0xDEAD when key or value is missing.
  static DWORD getDword(const std::string &path, const char *name) {
    HKEY key = nullptr;
    if (RegOpenKeyExA(HKEY_LOCAL_MACHINE, path.c_str(), 0, KEY_QUERY_VALUE, &key) != ERROR_SUCCESS)
      return 0xDEADu;
    DWORD value = 0xDEADu, size = sizeof value;
    RegQueryValueExA(key, name, nullptr, nullptr, reinterpret_cast<BYTE *>(&value), &size);
    RegCloseKey(key);
    return value;
  }

  // Creates every missing directory of a Windows path.
  static void makeDirectories(const std::string &windowsPath) {
    for (size_t at = windowsPath.find('\\', 3);; at = windowsPath.find('\\', at + 1)) {
      CreateDirectoryA(windowsPath.substr(0, at).c_str(), nullptr);
      if (at == std::string::npos)
        return;
    }
  }

  // Writes a whole file at a Windows path, creating its directories.
  static void writeFile(const std::string &windowsPath, const void *bytes, size_t size) {
    makeDirectories(windowsPath.substr(0, windowsPath.find_last_of('\\')));
    HANDLE file = CreateFileA(windowsPath.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS,
                              FILE_ATTRIBUTE_NORMAL, nullptr);
    ASSERT_NE(INVALID_HANDLE_VALUE, file) << windowsPath;
    DWORD written = 0;
    WriteFile(file, bytes, static_cast<DWORD>(size), &written, nullptr);
    CloseHandle(file);
    ASSERT_EQ(size, written) << windowsPath;
  }

  static void writeFile(const std::string &windowsPath, const std::string &text) {
    writeFile(windowsPath, text.data(), text.size());
  }

  static void writeFile(const std::string &windowsPath, const std::vector<unsigned char> &bytes) {
    writeFile(windowsPath, bytes.data(), bytes.size());
  }

  // The whole content of a file at a Windows path; false when it cannot be opened.
  static bool readWholeFile(const std::string &windowsPath, std::vector<unsigned char> &bytes) {
    bytes.clear();
    HANDLE file = CreateFileA(windowsPath.c_str(), GENERIC_READ, FILE_SHARE_READ, nullptr, OPEN_EXISTING,
                              FILE_ATTRIBUTE_NORMAL, nullptr);
    if (file == INVALID_HANDLE_VALUE)
      return false;
    unsigned char chunk[4096];
    DWORD got = 0;
    while (ReadFile(file, chunk, sizeof chunk, &got, nullptr) && got > 0)
      bytes.insert(bytes.end(), chunk, chunk + got);
    CloseHandle(file);
    return true;
  }

  // The whole content of a file at a Windows path, or "<missing>".
  static std::string readText(const std::string &windowsPath) {
    std::vector<unsigned char> bytes;
    return readWholeFile(windowsPath, bytes) ? std::string(bytes.begin(), bytes.end()) : "<missing>";
  }

  static bool pathExists(const std::string &windowsPath) {
    return GetFileAttributesA(windowsPath.c_str()) != INVALID_FILE_ATTRIBUTES;
  }

  // KXLSIM_FAIL for the rest of the case ("name:n,..."; nullptr: none).
  static void failCalls(const char *faults) {
    if (faults != nullptr)
      setenv("KXLSIM_FAIL", faults, 1);
    else
      unsetenv("KXLSIM_FAIL");
    kxlsim::resetFaults();
  }
};

// A fresh temporary machine per case (see temp_world.h), entered for the case
// and removed after it.
class WorldTest : public ::testing::Test, public WorldAccess {
protected:
  explicit WorldTest(kxltestsupport::Machine machine = kxltestsupport::Machine::kEmpty)
      : world_("kxltest", machine) {}
  explicit WorldTest(const kxltestsupport::CopyOf &source) : world_("kxltest", source) {}
  void SetUp() override {
    ASSERT_FALSE(world_.root().empty()) << "cannot create a temporary world";
    world_.enter();
  }
  void TearDown() override { world_.leave(); }

  // The world's host folder, and host paths in it ("drive_c/A/b").
  const std::string &worldRoot() const { return world_.root(); }
  std::string host(const std::string &relative) const { return world_.host(relative); }

  kxltestsupport::TempWorld world_;
};

} // namespace kxltest
