// A temporary machine for the installation registry and for the steps that
// work on it (services, environment, profile move): helpers that lay out
// copies, configuration files, services and installer registrations on this
// machine or another machine of the world, and read the trace.
#pragma once

#include "install/ilist.h"
#include "sim/common/installer.h"
#include "sim/product/diag.h"
#include "tests/dbmcfg/cfgimage.h"
#include "tests/support/product_world.h"

#include <cstdio>
#include <string>
#include <vector>

namespace kxltest {

using dbmtest::Bytes;
using dbmtest::Cfg;

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
    trace_ = world_.scratch("trace.txt"); // the case's own, also beside parallel cases
    std::remove(trace_.c_str());
    setProcessVariable("KXLTRACE", trace_.c_str());
    kxlprod::resetTrace();
  }
  bool traced(const std::string &line) const {
    return kxltestsupport::readHostFile(trace_).find(line) != std::string::npos;
  }

  // Creates a key under `root`, with a string value when `name` is given.
  static void setValue(HKEY root, const std::string &path, const char *name = nullptr,
                       const std::string &value = "") {
    HKEY key = nullptr;
    ASSERT_EQ(ERROR_SUCCESS,
              RegCreateKeyExA(root, path.c_str(), 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &key, nullptr));
    if (name != nullptr)
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

  // A configuration image of `size` bytes with its node type and, at its
  // end, a recognisable byte.
  static Bytes configImage(uint16_t nodeType, size_t size = dbmtest::kFull) {
    return Cfg(nodeType, 0, 0, size).byte(uint32_t(size - 1), 0x5A).sealed();
  }

  // Windows Installer knows `code` as installed at `location`, from the keys
  // the real installer keeps.
  static void registerInstaller(const std::string &code, const std::string &location) {
    setString(kxlsim::installerProductKey(code), "ProductName", "product");
    setString(kxlsim::installerPropertiesKey(code), "InstallLocation", location);
    setDword(kxlsim::installerPropertiesKey(code), "WindowsInstaller", 1);
  }

  // A path of `machine`'s HKEY_LOCAL_MACHINE ("" the local machine).
  static std::string at(const std::string &machine, const std::string &path) {
    return machine.empty() ? path : "SOFTWARE\\ZAV\\KXLSIM\\Machines\\" + machine + "\\" + path;
  }
  static std::string serviceKey(const std::string &name, const std::string &machine = "") {
    return at(machine, "SOFTWARE\\ZAV\\KXLSIM\\Services\\" + name);
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
