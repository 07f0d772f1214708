// Helpers of the product library cases: files of the world written and read
// through the Win32 surface, host files, and a current installation.
#pragma once

#include "tests/product/world_fixture.h"

#include <fstream>
#include <iterator>
#include <string>
#include <vector>

namespace kxltest {

inline std::vector<unsigned char> hostFileBytes(const char *hostPath) {
  std::ifstream in(hostPath, std::ios::binary);
  return std::vector<unsigned char>(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

inline std::string hostFileText(const std::string &hostPath) {
  std::ifstream in(hostPath, std::ios::binary);
  return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

class LibraryWorld : public ProductWorld {
protected:
  static constexpr const char *kCopy = "KXL101";
  static constexpr const char *kInstall = "C:\\KXL101";

  void SetUp() override {
    ProductWorld::SetUp();
    if (IsSkipped() || HasFatalFailure())
      return;
    registerCopy(kCopy, kInstall);
    makeDirectories(kInstall);
    ASSERT_EQ(0, sqloSwitchToInstallationName(kCopy));
  }

  // Writes a file of the world, creating its directories.
  static void writeFile(const std::string &windowsPath, const std::string &bytes) {
    makeDirectories(windowsPath.substr(0, windowsPath.find_last_of('\\')));
    HANDLE file = CreateFileA(windowsPath.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS,
                              FILE_ATTRIBUTE_NORMAL, nullptr);
    ASSERT_NE(INVALID_HANDLE_VALUE, file) << windowsPath;
    DWORD written = 0;
    WriteFile(file, bytes.data(), DWORD(bytes.size()), &written, nullptr);
    CloseHandle(file);
    ASSERT_EQ(bytes.size(), written);
  }

  // A file of the world, or "<missing>".
  static std::string readFile(const std::string &windowsPath) {
    HANDLE file = CreateFileA(windowsPath.c_str(), GENERIC_READ, FILE_SHARE_READ, nullptr, OPEN_EXISTING,
                              FILE_ATTRIBUTE_NORMAL, nullptr);
    if (file == INVALID_HANDLE_VALUE)
      return "<missing>";
    std::string text;
    char chunk[512];
    DWORD got = 0;
    while (ReadFile(file, chunk, sizeof chunk, &got, nullptr) && got > 0)
      text.append(chunk, got);
    CloseHandle(file);
    return text;
  }

  static bool exists(const std::string &windowsPath) {
    return GetFileAttributesA(windowsPath.c_str()) != INVALID_FILE_ATTRIBUTES;
  }
};

} // namespace kxltest
