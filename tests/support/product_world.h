// A machine of its own for every product library test: a fresh temporary world
// on non-Windows hosts. On Windows the world is the machine itself, so the cases
// run only where that machine is disposable (KXL_TEST_DISPOSABLE_MACHINE=1,
// e.g. a throw-away Wine prefix) and remove SOFTWARE\ZAV afterwards.
#pragma once

#include "platform/kxlsys.h"
#include "platform/win32.h"
#include "sim/common/simfail.h"
#include "sim/product/state.h"
#include "tests/support/world_access.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <string>

#include "tests/support/temp_world.h"

namespace kxltest {

inline void setProcessVariable(const char *name, const char *value) {
#ifdef _WIN32
  _putenv_s(name, value != nullptr ? value : "");
#else
  if (value != nullptr)
    setenv(name, value, 1);
  else
    unsetenv(name);
#endif
}

class ProductWorld : public ::testing::Test, public WorldAccess {
protected:
  void SetUp() override {
#ifdef _WIN32
    const char *disposable = std::getenv("KXL_TEST_DISPOSABLE_MACHINE");
    if (disposable == nullptr || std::string(disposable) != "1")
      GTEST_SKIP() << "the product library cases change HKLM; set KXL_TEST_DISPOSABLE_MACHINE=1";
#else
    ASSERT_FALSE(world_.root().empty()) << "cannot create a temporary world";
    world_.enter();
#endif
    started_ = true;
    resetProcess();
  }

  void TearDown() override {
    if (!started_)
      return;
    resetProcess();
#ifdef _WIN32
    SHDeleteKeyA(HKEY_LOCAL_MACHINE, "SOFTWARE\\ZAV");
#else
    world_.leave();
#endif
  }

  // KXLSIM_FAIL for the rest of the case ("name:n,...").
  static void failCalls(const char *faults) {
    setProcessVariable("KXLSIM_FAIL", faults);
    kxlsim::resetFaults();
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

#ifndef _WIN32
  // Host directory of the world.
  const std::string &worldRoot() const {
    return world_.root();
  }
#endif

private:
  static void resetProcess() {
    setProcessVariable("KXLSIM_FAIL", nullptr);
    setProcessVariable("KXLINSTANCE", nullptr);
    kxlsim::resetFaults();
    kxlprod::resetLibraryState();
  }

#ifndef _WIN32
  kxltestsupport::TempWorld world_{"kxlprod"};
#endif
  bool started_ = false;
};

} // namespace kxltest
