// Shared fixtures of the Win32 conformance suite. The cases are written against
// the Win32 surface only, so the same expectations hold for the real system
// (Windows, Wine) and for the simulated machine of non-Windows hosts.
#pragma once

#include "platform/win32.h"
#include "tests/support/temp_world.h"

#include <gtest/gtest.h>

#include <cctype>
#include <cstdio>
#include <random>
#include <string>
#include <vector>

namespace kxltest {

// True under Wine (its ntdll exports wine_get_version). Where Wine and Windows
// differ the cases follow Windows and skip under Wine.
inline bool runningUnderWine() {
#ifdef _WIN32
  HMODULE ntdll = GetModuleHandleA("ntdll.dll");
  return ntdll != nullptr && GetProcAddress(ntdll, "wine_get_version") != nullptr;
#else
  return false;
#endif
}

// A name no other run uses: the current test's name and a random suffix.
inline std::string uniqueName() {
  char suffix[16];
  std::snprintf(suffix, sizeof suffix, "_%08x", static_cast<unsigned>(std::random_device()()));
  return ::testing::UnitTest::GetInstance()->current_test_info()->name() + std::string(suffix);
}

// Byte-wise equality ignoring ASCII case, as Windows compares names.
inline bool sameIgnoringCase(const std::string &a, const std::string &b) {
  auto lower = [](std::string text) {
    for (char &c : text)
      c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    return text;
  };
  return lower(a) == lower(b);
}

// The last error a call that must fail leaves (cleared first); ERROR_SUCCESS when it worked after all.
template <typename Call> DWORD errorOf(Call call) {
  SetLastError(0);
  return call() ? static_cast<DWORD>(ERROR_SUCCESS) : GetLastError();
}

// Every case runs in a machine of its own: a fresh temporary world with the
// run-time modules' files on non-Windows hosts, the real machine on Windows.
class Win32Test : public ::testing::Test {
protected:
#ifndef _WIN32
  void SetUp() override {
    ASSERT_FALSE(world_.root().empty()) << "cannot create a temporary world";
    world_.enter();
  }
  void TearDown() override {
    world_.leave();
  }

private:
  kxltestsupport::TempWorld world_{"kxlconf", kxltestsupport::Machine::kModules};
#endif
};

// An open registry key, closed when it goes out of scope.
class Key {
public:
  Key() = default;
  Key(const Key &) = delete;
  Key &operator=(const Key &) = delete;
  ~Key() { reset(); }
  HKEY get() const { return h_; }
  HKEY *put() {
    reset();
    return &h_;
  }
  void reset() {
    if (h_ != nullptr)
      RegCloseKey(h_);
    h_ = nullptr;
  }

private:
  HKEY h_ = nullptr;
};

// Registry cases work below HKCU\Software\KxlConformance\<unique>, removed at the end.
class RegistryTest : public Win32Test {
protected:
  void SetUp() override {
    Win32Test::SetUp();
    if (HasFatalFailure())
      return;
    base_ = "Software\\KxlConformance\\" + uniqueName();
    ASSERT_EQ(ERROR_SUCCESS, RegCreateKeyExA(HKEY_CURRENT_USER, base_.c_str(), 0, nullptr, 0, KEY_ALL_ACCESS,
                                             nullptr, root_.put(), nullptr));
  }
  void TearDown() override {
    root_.reset();
    if (!base_.empty()) {
      SHDeleteKeyA(HKEY_CURRENT_USER, base_.c_str());
      RegDeleteKeyA(HKEY_CURRENT_USER, "Software\\KxlConformance"); // only when no other run has keys there
    }
    Win32Test::TearDown();
  }

  // Creates (or opens) a key below the test's root; returns the result code.
  LONG create(const char *path, Key &key, DWORD *disposition = nullptr) {
    return RegCreateKeyExA(root_.get(), path, 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, key.put(), disposition);
  }
  LONG open(const char *path, Key &key) {
    return RegOpenKeyExA(root_.get(), path, 0, KEY_ALL_ACCESS, key.put());
  }
  static void setString(HKEY key, const char *name, const std::string &value) {
    ASSERT_EQ(ERROR_SUCCESS,
              RegSetValueExA(key, name, 0, REG_SZ, reinterpret_cast<const BYTE *>(value.c_str()),
                             static_cast<DWORD>(value.size() + 1)));
  }
  static void setDword(HKEY key, const char *name, DWORD value) {
    ASSERT_EQ(ERROR_SUCCESS,
              RegSetValueExA(key, name, 0, REG_DWORD, reinterpret_cast<const BYTE *>(&value), sizeof value));
  }
  // The value's type and bytes; the result code of the query.
  static LONG query(HKEY key, const char *name, DWORD &type, std::string &data) {
    BYTE buffer[1024];
    DWORD size = sizeof buffer;
    type = REG_NONE;
    LONG rc = RegQueryValueExA(key, name, nullptr, &type, buffer, &size);
    data.assign(reinterpret_cast<const char *>(buffer), rc == ERROR_SUCCESS ? size : 0);
    return rc;
  }

  std::string base_;
  Key root_;
};

// File cases work in a fresh folder below the temporary folder, removed at the end.
class FilesTest : public Win32Test {
protected:
  void SetUp() override {
    Win32Test::SetUp();
    if (HasFatalFailure())
      return;
    char buffer[MAX_PATH];
    DWORD n = GetTempPathA(sizeof buffer, buffer);
    ASSERT_TRUE(n > 0 && n < sizeof buffer);
    dir_ = std::string(buffer) + uniqueName();
    ASSERT_TRUE(CreateDirectoryA(dir_.c_str(), nullptr)) << dir_ << " error " << GetLastError();
  }
  void TearDown() override {
    if (!dir_.empty())
      removeTree(dir_);
    Win32Test::TearDown();
  }

  // dir_ joined with a name by one backslash.
  std::string at(const std::string &name) const { return dir_ + "\\" + name; }
  // Writes (replacing) a whole file; false when it cannot be written.
  static bool writeFile(const std::string &path, const std::string &content) {
    HANDLE h =
        CreateFileA(path.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, FILE_ATTRIBUTE_NORMAL, nullptr);
    DWORD written = 0;
    bool ok = h != INVALID_HANDLE_VALUE &&
              WriteFile(h, content.data(), static_cast<DWORD>(content.size()), &written, nullptr);
    return (h == INVALID_HANDLE_VALUE || CloseHandle(h)) && ok && written == content.size();
  }
  // The whole file (up to 64 KiB); "<missing>" when it cannot be opened.
  static std::string readFile(const std::string &path) {
    HANDLE h = CreateFileA(path.c_str(), GENERIC_READ, FILE_SHARE_READ, nullptr, OPEN_EXISTING,
                           FILE_ATTRIBUTE_NORMAL, nullptr);
    if (h == INVALID_HANDLE_VALUE)
      return "<missing>";
    std::vector<char> buffer(64 * 1024);
    DWORD got = 0;
    BOOL ok = ReadFile(h, buffer.data(), static_cast<DWORD>(buffer.size()), &got, nullptr);
    CloseHandle(h);
    return ok ? std::string(buffer.data(), got) : "<unreadable>";
  }
  static void removeTree(const std::string &path) {
    WIN32_FIND_DATAA entry;
    HANDLE find = FindFirstFileA((path + "\\*").c_str(), &entry);
    for (bool more = find != INVALID_HANDLE_VALUE; more; more = FindNextFileA(find, &entry)) {
      std::string name = entry.cFileName, child = path + "\\" + name;
      if (name == "." || name == "..")
        continue;
      if (entry.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY)
        removeTree(child);
      else
        DeleteFileA(child.c_str());
    }
    if (find != INVALID_HANDLE_VALUE)
      FindClose(find);
    RemoveDirectoryA(path.c_str());
  }

  std::string dir_;
};

} // namespace kxltest
