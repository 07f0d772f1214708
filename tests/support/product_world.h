// A machine of its own for every product library case, with the library's
// process state (fault plan, current instance, caches) forgotten before and
// after it, and the registry entries those cases set up most.
#pragma once

#include "platform/kxlsys.h"
#include "sim/product/state.h"
#include "tests/support/world_access.h"

#include <string>

namespace kxltest {

inline void setProcessVariable(const char *name, const char *value) {
  if (value != nullptr)
    setenv(name, value, 1);
  else
    unsetenv(name);
}

class ProductWorld : public WorldTest {
protected:
  using WorldTest::WorldTest;

  void SetUp() override {
    WorldTest::SetUp();
    resetProcess();
  }
  void TearDown() override {
    resetProcess();
    WorldTest::TearDown();
  }

  // The "State" of a service of this machine ("") or of another one.
  static void setServiceState(const std::string &machine, const std::string &name, DWORD state) {
    std::string prefix = machine.empty() ? "" : "SOFTWARE\\ZAV\\KXLSIM\\Machines\\" + machine + "\\";
    setDword(prefix + "SOFTWARE\\ZAV\\KXLSIM\\Services\\" + name, "State", state);
  }

  static constexpr const char *kIdentity = "SOFTWARE\\ZAV\\KXLSIM\\Identity";

  // A copy registered under InstalledCopies with its installation path.
  static void registerCopy(const std::string &copy, const std::string &path) {
    setString("SOFTWARE\\ZAV\\KXL\\InstalledCopies\\" + copy, "KXL Path Name", path);
  }

  // A copy registered at the running test program's folder, which makes it
  // the library's current installation.
  static void registerOwnCopy(const std::string &copy) {
    char module[MAX_PATH] = {};
    std::string path(module, GetModuleFileNameA(nullptr, module, sizeof module));
    registerCopy(copy, path.substr(0, path.find_last_of('\\')));
  }

  // A registered copy whose folder exists, made the library's current installation.
  static void useCopy(const std::string &copy, const std::string &path) {
    registerCopy(copy, path);
    makeDirectories(path);
    ASSERT_EQ(0, sqloSwitchToInstallationName(copy.c_str()));
  }

  // The version-8 installation in the single-copy layout.
  static void registerV8(const std::string &path) {
    setString("SOFTWARE\\ZAV\\KXL\\CurrentVersion", "Version", "8");
    setString("SOFTWARE\\ZAV\\KXL", "KXL Path Name", path);
  }

  // An instance in the instance registry ("" copy: the version-8 installation).
  static void registerInstance(const std::string &name, const std::string &directory,
                               const std::string &copy) {
    std::string key = "SOFTWARE\\ZAV\\KXLSIM\\Instances\\" + name;
    setString(key, "Directory", directory);
    setString(key, "Copy", copy);
  }

private:
  static void resetProcess() {
    failCalls(nullptr);
    unsetenv("KXLINSTANCE");
    kxlprod::resetLibraryState();
  }
};

} // namespace kxltest
