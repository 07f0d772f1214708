#include "conformance.h"

#include <cctype>
#include <cstdio>
#include <random>
#include <vector>

namespace kxltest {

bool runningUnderWine() {
#ifdef _WIN32
  HMODULE ntdll = GetModuleHandleA("ntdll.dll");
  return ntdll != nullptr && GetProcAddress(ntdll, "wine_get_version") != nullptr;
#else
  return false;
#endif
}

std::string uniqueName() {
  const ::testing::TestInfo *info = ::testing::UnitTest::GetInstance()->current_test_info();
  std::random_device seed;
  char suffix[16];
  std::snprintf(suffix, sizeof suffix, "_%08x", static_cast<unsigned>(seed()));
  return std::string(info != nullptr ? info->name() : "case") + suffix;
}

bool sameIgnoringCase(const std::string &a, const std::string &b) {
  if (a.size() != b.size())
    return false;
  for (size_t i = 0; i < a.size(); ++i)
    if (std::tolower(static_cast<unsigned char>(a[i])) != std::tolower(static_cast<unsigned char>(b[i])))
      return false;
  return true;
}

void Win32Test::SetUp() {
#ifndef _WIN32
  ASSERT_FALSE(world_.root().empty()) << "cannot create a temporary world";
  world_.enter();
#endif
}

void Win32Test::TearDown() {
#ifndef _WIN32
  world_.leave();
#endif
}

void Key::reset() {
  if (h_ != nullptr)
    RegCloseKey(h_);
  h_ = nullptr;
}

void RegistryTest::SetUp() {
  Win32Test::SetUp();
  if (HasFatalFailure())
    return;
  base_ = "Software\\KxlConformance\\" + uniqueName();
  ASSERT_EQ(ERROR_SUCCESS,
            RegCreateKeyExA(HKEY_CURRENT_USER, base_.c_str(), 0, nullptr, REG_OPTION_NON_VOLATILE,
                            KEY_ALL_ACCESS, nullptr, root_.put(), nullptr));
}

void RegistryTest::TearDown() {
  root_.reset();
  if (!base_.empty()) {
    SHDeleteKeyA(HKEY_CURRENT_USER, base_.c_str());
    // Goes only when no other run still has keys there.
    RegDeleteKeyA(HKEY_CURRENT_USER, "Software\\KxlConformance");
  }
  Win32Test::TearDown();
}

LONG RegistryTest::create(const char *path, Key &key, DWORD *disposition) {
  return RegCreateKeyExA(root_.get(), path, 0, nullptr, REG_OPTION_NON_VOLATILE, KEY_ALL_ACCESS, nullptr,
                         key.put(), disposition);
}

LONG RegistryTest::open(const char *path, Key &key) {
  return RegOpenKeyExA(root_.get(), path, 0, KEY_ALL_ACCESS, key.put());
}

void RegistryTest::setString(HKEY key, const char *name, const std::string &value, DWORD type) {
  ASSERT_EQ(ERROR_SUCCESS, RegSetValueExA(key, name, 0, type, reinterpret_cast<const BYTE *>(value.c_str()),
                                          static_cast<DWORD>(value.size() + 1)));
}

void RegistryTest::setDword(HKEY key, const char *name, DWORD value) {
  ASSERT_EQ(ERROR_SUCCESS,
            RegSetValueExA(key, name, 0, REG_DWORD, reinterpret_cast<const BYTE *>(&value), sizeof value));
}

LONG RegistryTest::query(HKEY key, const char *name, DWORD &type, std::string &data) {
  BYTE buffer[1024];
  DWORD size = sizeof buffer;
  type = REG_NONE;
  LONG rc = RegQueryValueExA(key, name, nullptr, &type, buffer, &size);
  data.assign(rc == ERROR_SUCCESS ? reinterpret_cast<const char *>(buffer) : "",
              rc == ERROR_SUCCESS ? size : 0);
  return rc;
}

void FilesTest::SetUp() {
  Win32Test::SetUp();
  if (HasFatalFailure())
    return;
  char buffer[MAX_PATH];
  DWORD n = GetTempPathA(sizeof buffer, buffer);
  ASSERT_TRUE(n > 0 && n < sizeof buffer);
  dir_ = std::string(buffer) + uniqueName();
  ASSERT_TRUE(CreateDirectoryA(dir_.c_str(), nullptr)) << dir_ << " error " << GetLastError();
}

void FilesTest::TearDown() {
  if (!dir_.empty())
    removeTree(dir_);
  Win32Test::TearDown();
}

std::string FilesTest::at(const std::string &name) const {
  return dir_ + "\\" + name;
}

bool FilesTest::writeFile(const std::string &path, const std::string &content) {
  HANDLE h =
      CreateFileA(path.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, FILE_ATTRIBUTE_NORMAL, nullptr);
  if (h == INVALID_HANDLE_VALUE)
    return false;
  DWORD written = 0;
  BOOL ok = WriteFile(h, content.data(), static_cast<DWORD>(content.size()), &written, nullptr);
  CloseHandle(h);
  return ok && written == content.size();
}

std::string FilesTest::readFile(const std::string &path) {
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

void FilesTest::removeTree(const std::string &path) {
  WIN32_FIND_DATAA entry;
  HANDLE find = FindFirstFileA((path + "\\*").c_str(), &entry);
  if (find != INVALID_HANDLE_VALUE) {
    do {
      std::string name = entry.cFileName;
      if (name == "." || name == "..")
        continue;
      std::string child = path + "\\" + name;
      if (entry.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY)
        removeTree(child);
      else
        DeleteFileA(child.c_str());
    } while (FindNextFileA(find, &entry));
    FindClose(find);
  }
  RemoveDirectoryA(path.c_str());
}

} // namespace kxltest
