// Shared fixtures of the Win32 conformance suite. The cases are written against
// the Win32 surface only, so the same expectations hold for the real system
// (Windows, Wine) and for the simulated machine of non-Windows hosts.
#pragma once

#include "platform/win32.h"
#include "tests/support/temp_world.h"

#include <gtest/gtest.h>

#include <string>

namespace kxltest {

// True under Wine (its ntdll exports wine_get_version). Where Wine and Windows
// differ the cases follow Windows and skip under Wine.
bool runningUnderWine();

// A name no other run uses: the current test's name and a random suffix.
std::string uniqueName();

// Byte-wise equality ignoring ASCII case, as Windows compares names.
bool sameIgnoringCase(const std::string &a, const std::string &b);

// The last error a call that must fail leaves (cleared first); ERROR_SUCCESS when it worked after all.
template <typename Call> DWORD errorOf(Call call) {
  SetLastError(0);
  return call() ? static_cast<DWORD>(ERROR_SUCCESS) : GetLastError();
}

// Every case runs in a machine of its own: a fresh temporary world with the
// run-time modules' files on non-Windows hosts, the real machine on Windows.
class Win32Test : public ::testing::Test {
protected:
  void SetUp() override;
  void TearDown() override;

#ifndef _WIN32
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
  void reset();

private:
  HKEY h_ = nullptr;
};

// Registry cases work below HKCU\Software\KxlConformance\<unique>, removed at the end.
class RegistryTest : public Win32Test {
protected:
  void SetUp() override;
  void TearDown() override;

  // Creates (or opens) a key below the test's root; returns the result code.
  LONG create(const char *path, Key &key, DWORD *disposition = nullptr);
  LONG open(const char *path, Key &key);
  void setString(HKEY key, const char *name, const std::string &value, DWORD type = REG_SZ);
  void setDword(HKEY key, const char *name, DWORD value);
  // The value's type and bytes; the result code of the query.
  LONG query(HKEY key, const char *name, DWORD &type, std::string &data);

  std::string base_;
  Key root_;
};

// File cases work in a fresh folder below the temporary folder, removed at the end.
class FilesTest : public Win32Test {
protected:
  void SetUp() override;
  void TearDown() override;

  // dir_ joined with a name by one backslash.
  std::string at(const std::string &name) const;
  // Writes (replacing) a whole file; false when it cannot be written.
  static bool writeFile(const std::string &path, const std::string &content);
  // The whole file (up to 64 KiB); "<missing>" when it cannot be opened.
  static std::string readFile(const std::string &path);
  static void removeTree(const std::string &path);

  std::string dir_;
};

} // namespace kxltest
