// Helpers of the product library cases: files of the world written and read
// through the Win32 surface, host files, and a current installation.
#pragma once

#include "tests/support/product_world.h"

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

  // A file of the world, or "<missing>".
  static std::string readFile(const std::string &windowsPath) {
    std::vector<unsigned char> bytes;
    if (!readWholeFile(windowsPath, bytes))
      return "<missing>";
    return std::string(bytes.begin(), bytes.end());
  }

  static bool exists(const std::string &windowsPath) { return pathExists(windowsPath); }
};

} // namespace kxltest
