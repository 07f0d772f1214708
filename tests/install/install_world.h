// A temporary machine for the installation registry cases, with helpers that
// lay out copies, instances, configuration files and installer registrations.
#pragma once

#include "tests/support/product_world.h"
#include "install/ilist.h"
#include "sim/common/installer.h"
#include "sim/product/diag.h"

#include <cstdint>
#include <cstdio>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

namespace kxltest {

class InstallWorld : public ProductWorld {
protected:
  static constexpr const char *kCopies = "SOFTWARE\\ZAV\\KXL\\InstalledCopies\\";

  void TearDown() override {
    if (!trace_.empty()) {
      setProcessVariable("KXLTRACE", nullptr);
      kxlprod::resetTrace();
      std::remove(trace_.c_str());
    }
    ProductWorld::TearDown();
  }

  // Trace lines written from now on go to a file of the case's own.
  void startTrace() {
    trace_ = ::testing::TempDir() + "kxl_install_world_trace.txt";
    std::remove(trace_.c_str());
    setProcessVariable("KXLTRACE", trace_.c_str());
    kxlprod::resetTrace();
  }
  std::string traceText() const {
    std::ifstream in(trace_, std::ios::binary);
    std::stringstream text;
    text << in.rdbuf();
    return text.str();
  }

  static void createKey(HKEY root, const std::string &path) {
    HKEY key = nullptr;
    ASSERT_EQ(ERROR_SUCCESS,
              RegCreateKeyExA(root, path.c_str(), 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &key, nullptr));
    RegCloseKey(key);
  }

  static void setValue(HKEY root, const std::string &path, const char *name, const std::string &value) {
    HKEY key = nullptr;
    ASSERT_EQ(ERROR_SUCCESS,
              RegCreateKeyExA(root, path.c_str(), 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &key, nullptr));
    RegSetValueExA(key, name, 0, REG_SZ, reinterpret_cast<const BYTE *>(value.c_str()),
                   static_cast<DWORD>(value.size() + 1));
    RegCloseKey(key);
  }

  // CurrentVersion of a copy key ("" fix level: the value is left out).
  static void setVersion(const std::string &copyKey, const char *version, const char *release,
                         const char *modification, const char *fixLevel, const char *serviceLevel) {
    std::string key = copyKey + "\\CurrentVersion";
    setString(key, "Version", version);
    setString(key, "Release", release);
    setString(key, "Modification", modification);
    if (fixLevel[0] != '\0')
      setString(key, "Fix Level", fixLevel);
    setString(key, "Service Level", serviceLevel);
  }

  // A configuration image of `size` bytes with the node type word at 40 and,
  // past the word, a recognisable byte at the end.
  static std::vector<unsigned char> configImage(uint16_t nodeType, size_t size = 16384) {
    std::vector<unsigned char> image(size, 0);
    if (size >= 42) {
      image[40] = static_cast<unsigned char>(nodeType & 0xFF);
      image[41] = static_cast<unsigned char>(nodeType >> 8);
    }
    if (size > 42)
      image[size - 1] = 0x5A;
    return image;
  }

  // Windows Installer knows `code` as installed at `location`, from the keys
  // the real installer keeps.
  static void registerInstaller(const std::string &code, const std::string &location) {
    setString(kxlsim::installerProductKey(code), "ProductName", "product");
    setString(kxlsim::installerPropertiesKey(code), "InstallLocation", location);
    setDword(kxlsim::installerPropertiesKey(code), "WindowsInstaller", 1);
  }

  // Every element of a list, walked from its head.
  template <class T> static std::vector<T *> elements(ILIST<T> &list) {
    std::vector<T *> all;
    list.Rewind();
    for (T *element = list.Next(); element != nullptr; element = list.Next())
      all.push_back(element);
    return all;
  }

  template <class T> static std::vector<std::string> names(ILIST<T> &list) {
    std::vector<std::string> all;
    for (T *element : elements(list)) {
      char name[256] = {};
      element->GetName(name, sizeof name);
      all.push_back(name);
    }
    return all;
  }

  static std::vector<std::string> strings(ILIST<char> &list) {
    std::vector<std::string> all;
    for (char *text : elements(list))
      all.push_back(text);
    return all;
  }

private:
  std::string trace_;
};

} // namespace kxltest
